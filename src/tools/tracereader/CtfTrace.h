// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>

#include "tools/tracereader/SignpostPairs.h"

namespace tonewerk {

// Hands every signpost event of the trace below `directory` to `take`, in the order of time, until that
// answers false. Empty when the whole trace was read, else what was wrong with it; a trace that has lost
// events is refused, because its ends would find wrong begins.
//
// A damaged trace may keep the underlying library busy for ever or make it end the process: whoever calls
// this is ready for both.
[[nodiscard]] std::string readCtfTrace(const std::string& directory,
                                       const std::function<bool(const SignpostEvent&)>& take);

}  // namespace tonewerk
