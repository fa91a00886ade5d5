// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>
#include <string>

#include "bridges/pipewire/EventLoop.h"
#include "bridges/pipewire/glitches/GlitchFacts.h"
#include "bridges/pipewire/kernel/KernelSampler.h"
#include "platform/Clock.h"

namespace tonewerk {

// Samples the kernel while audio runs, and adds the samples around a glitch up. Without audio for
// kIdle it samples no more.
//
// Used on the loop's thread only.
class KernelFacts final : public GlitchFacts {
 public:
  static constexpr std::chrono::seconds kIdle{3};

  // All arguments outlive this object. `proc` is the directory of processes.
  KernelFacts(EventLoop& loop, const Clock& clock, KernelSampler& sampler, std::string proc = "/proc");

  void audioRuns(std::span<const std::int32_t> processes) override;
  [[nodiscard]] std::optional<ProcessFacts> process(std::int32_t process, std::chrono::nanoseconds from,
                                                    std::chrono::nanoseconds to) const override;
  MachineFacts machine(std::chrono::nanoseconds from, std::chrono::nanoseconds to) const override;
  std::string nameOf(std::int32_t process) const override;

 private:
  void sample();

  const Clock& clock_;
  KernelSampler& sampler_;
  const std::string proc_;
  std::chrono::nanoseconds ranAt_{0};        // when audio was last seen to run
  std::unique_ptr<EventLoop::Timer> timer_;  // last, because its callback uses the others
};

}  // namespace tonewerk
