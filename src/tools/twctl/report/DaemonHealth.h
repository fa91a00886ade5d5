// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <stop_token>

#include "values/ValueMap.h"

namespace tonewerk {

struct Tool;

// Asks the daemon for its sinks, and for what it refused its users. Prints nothing. Without an answer the map
// has `answers` false and the `reason`. Otherwise it has `answers` true, and `refused` and `sinks` as arrays
// of maps. Waits at most 3 s for the answer, and no longer when `stop` is requested.
[[nodiscard]] ValueMap daemonHealth(const Tool& tool, const std::stop_token& stop);

}  // namespace tonewerk
