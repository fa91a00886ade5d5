// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/linux/diagnostics/collectors/DiagnosticCollector.h"

namespace tonewerk {

// Collects the system's load: /proc/loadavg, and /proc/pressure of processors, storage and memory.
class LoadCollector final : public DiagnosticCollector {
 public:
  explicit LoadCollector(std::string procDirectory = "/proc") : procDirectory_(std::move(procDirectory)) {}

  std::string_view fileName() const override { return "load.txt"; }
  [[nodiscard]] Result collect() override;

 private:
  const std::string procDirectory_;
};

}  // namespace tonewerk
