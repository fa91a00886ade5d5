// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <string>
#include <vector>

#include "bridges/pipewire/glitches/GlitchFacts.h"

namespace tonewerk {

// Tells what a test wants the kernel to have said.
class MemoryGlitchFacts final : public GlitchFacts {
 public:
  std::vector<std::int32_t> audio;  // the processes of the last call of audioRuns()
  std::map<std::int32_t, ProcessFacts> processes;
  std::map<std::int32_t, std::string> names;
  MachineFacts machineFacts;

  void audioRuns(std::span<const std::int32_t> running) override { audio = {running.begin(), running.end()}; }
  [[nodiscard]] std::optional<ProcessFacts> process(std::int32_t process, std::chrono::nanoseconds,
                                                    std::chrono::nanoseconds) const override {
    const auto found = processes.find(process);
    return found == processes.end() ? std::nullopt : std::optional(found->second);
  }
  MachineFacts machine(std::chrono::nanoseconds, std::chrono::nanoseconds) const override {
    return machineFacts;
  }
  std::string nameOf(std::int32_t process) const override {
    const auto found = names.find(process);
    return found == names.end() ? std::string() : found->second;
  }
};

}  // namespace tonewerk
