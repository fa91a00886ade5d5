// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>

#include "platform/linux/diagnostics/collectors/DiagnosticCollector.h"

namespace tonewerk {

// Collects the processes with their processor time and memory, sorted by processor time, the largest first.
// Command lines are left out, because they may hold private data.
class ProcessTableCollector final : public DiagnosticCollector {
 public:
  static constexpr std::size_t kMaxRows = 4096;

  explicit ProcessTableCollector(std::string procDirectory = "/proc", std::size_t maxRows = kMaxRows)
      : procDirectory_(std::move(procDirectory)), maxRows_(maxRows) {}

  std::string_view fileName() const override { return "processes.txt"; }
  [[nodiscard]] Result collect() override;

 private:
  const std::string procDirectory_;
  const std::size_t maxRows_;
};

}  // namespace tonewerk
