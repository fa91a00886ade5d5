// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <system_error>
#include <utility>

#include "platform/linux/system/ProcessFiles.h"
#include "tools/memory-usage/MemoryUsage.h"

namespace tonewerk {

// Reads /proc. The counters that the kernel keeps anyway, not the walk over all pages behind smaps: under
// memory pressure that would be the next problem.
class ProcReader {
 public:
  // `root` is "/proc", or what looks like it. `ticksPerSecond` of its processor times.
  ProcReader(std::string root, double ticksPerSecond)
      : root_(std::move(root)), files_(root_), ticksPerSecond_(ticksPerSecond) {}

  // Processes in order of their numbers. None, and why in `problem`, when there is no such directory or it
  // does not say how much memory there is. A process that ends meanwhile is left out.
  [[nodiscard]] std::optional<UsageSnapshot> read(std::string& problem) const;

 private:
  enum class Outcome { kRead, kGone, kWithoutMemory, kUnreadable };
  static Outcome outcomeOf(const std::error_code& error);
  [[nodiscard]] Outcome readProcess(std::int32_t identifier, ProcessUsage& process) const;
  [[nodiscard]] bool readSystem(MemoryUsage& system) const;
  void readProcessorTime(MemoryUsage& system) const;

  const std::string root_;
  const ProcessFiles files_;
  const double ticksPerSecond_;
};

}  // namespace tonewerk
