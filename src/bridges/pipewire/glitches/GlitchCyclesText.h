// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>

#include "bridges/pipewire/glitches/GlitchEvidence.h"

namespace tonewerk {

inline constexpr std::size_t kMaxCyclesBytes = std::size_t{6} * 1024;

// The cycles around a glitch as JSON, oldest first, as many as kMaxCyclesBytes holds; the glitch's own is the
// last to be left out. Times are microseconds since the begin of the glitch's cycle.
//
//   [{"begin":-5333.3,"period":5333.3,"nodes":[{"name":"player","process":"mpv","signal":-5321.2,...}]}]
//
// "signal", "awake" and "finish" are left out for what a node did not come to in that cycle. `processOf`
// returns the name of a node's process, or an empty text.
std::string glitchCyclesText(const GlitchEvidence& evidence,
                             const std::function<std::string(std::uint32_t node)>& processOf);

}  // namespace tonewerk
