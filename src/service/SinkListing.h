// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "values/Value.h"

namespace tonewerk {

class SinkList;

// Returns an array with a map for each sink: "name", "waiting", "dropped", and "hangs", the seconds for which
// it has made no progress. Any thread.
ValueArray sinkListing(const SinkList& sinks);

}  // namespace tonewerk
