// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "bridges/pipewire/glitches/GlitchEvidence.h"

namespace tonewerk {

// Tells what the kernel said around a glitch. Used on the loop's thread only.
class GlitchFacts {
 public:
  virtual ~GlitchFacts() = default;

  // Audio runs, in these processes: their facts will be asked for. Called about once a second while it does.
  virtual void audioRuns(std::span<const std::int32_t> processes) = 0;
  // None where the kernel said nothing about the process between these monotonic times.
  [[nodiscard]] virtual std::optional<ProcessFacts> process(std::int32_t process,
                                                            std::chrono::nanoseconds from,
                                                            std::chrono::nanoseconds to) const = 0;
  virtual MachineFacts machine(std::chrono::nanoseconds from, std::chrono::nanoseconds to) const = 0;
  // The name that the kernel has for a process now; empty when there is no such process.
  virtual std::string nameOf(std::int32_t process) const = 0;
};

}  // namespace tonewerk
