// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>

#include "tools/tracereader/SignpostPairs.h"

namespace tonewerk {

// Calls `take` with every signpost event of the trace in `directory`, in the order of time, until it returns
// false. Returns an empty text if the whole trace was read, otherwise the problem. A trace with lost events
// is refused, because ends could be matched with wrong begins.
//
// A damaged trace can make the library loop for ever or end the process. So call this only in a process that
// may be killed.
[[nodiscard]] std::string readCtfTrace(const std::string& directory,
                                       const std::function<bool(const SignpostEvent&)>& take);

}  // namespace tonewerk
