// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tonewerk {

enum class GlitchCause {
  kLate,          // a node computed longer than it had
  kNotScheduled,  // a node was to run, but got no processor in time
  kStuck,         // a node did not answer for whole cycles
  kWaiting,       // a node waited for another; said of a stream, never of a glitch
  kDevice,        // the driver's clock or hardware
  kGraphChanged,
  kSystemSlept,
  kUnknown
};

std::string_view textOf(GlitchCause cause);

// Whose glitch it was, and why.
struct Verdict {
  GlitchCause cause = GlitchCause::kUnknown;  // of the first in the chain
  double confidence = 0.0;                    // 0 to 1
  std::uint32_t culprit = 0;                  // node that was first in the chain; 0 for none
  std::int32_t holder = 0;        // process that held the processor, when that can be known; else 0
  std::string holderName{};       // its name
  double overMilliseconds = 0.0;  // how much longer the culprit took than it had; stuck: how long it took
  std::string reason{};           // a sentence in English with the figures behind the verdict
};

}  // namespace tonewerk
