// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

// The daemon's own signpost. The daemon passes it after a trace has begun and before it ends. If a trace does
// not contain both, it is incomplete and is refused.
inline constexpr char kCheckSignpost[] = "com.orvane.tonewerk.check";
inline constexpr std::size_t kCheckSignpostsPerTrace = 2;

}  // namespace tonewerk
