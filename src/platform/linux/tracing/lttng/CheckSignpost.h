// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

// The daemon's own signpost, which it passes when a trace has begun and before it ends: a trace without both
// is not one to draw conclusions from.
inline constexpr char kCheckSignpost[] = "com.orvane.tonewerk.check";
inline constexpr std::size_t kCheckSignpostsPerTrace = 2;

}  // namespace tonewerk
