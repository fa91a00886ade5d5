// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>

#include "platform/linux/diagnostics/collectors/DiagnosticCollector.h"

namespace tonewerk {

// Collects the kernel's status of sound devices: the files below /proc/asound, one after the other, each
// after a line with its path.
class SoundStatusCollector final : public DiagnosticCollector {
 public:
  struct Limits {
    std::size_t files = 512;
    std::size_t fileBytes = std::size_t{64} << 10;
    std::size_t bytes = std::size_t{1} << 20;
    int depth = 6;
  };

  explicit SoundStatusCollector(std::string directory = "/proc/asound")
      : SoundStatusCollector(std::move(directory), {}) {}
  SoundStatusCollector(std::string directory, const Limits& limits)
      : directory_(std::move(directory)), limits_(limits) {}

  std::string_view fileName() const override { return "sound.txt"; }
  [[nodiscard]] Result collect() override;

 private:
  const std::string directory_;
  const Limits limits_;
};

}  // namespace tonewerk
