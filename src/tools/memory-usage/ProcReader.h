// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "tools/memory-usage/MemoryUsage.h"

namespace tonewerk {

// Reads /proc. The counters that the kernel keeps anyway, not the walk over all pages behind smaps: under
// memory pressure that would be the next problem.
class ProcReader {
 public:
  // `root` is "/proc", or what looks like it. `ticksPerSecond` of its processor times.
  ProcReader(std::string root, double ticksPerSecond)
      : root_(std::move(root)), ticksPerSecond_(ticksPerSecond) {}

  // Processes in order of their numbers. None, and why in `problem`, when there is no such directory or it
  // does not say how much memory there is. A process that ends meanwhile is left out.
  std::optional<UsageSnapshot> read(std::string& problem) const;

 private:
  enum class Outcome { kRead, kGone, kWithoutMemory, kUnreadable };
  Outcome readProcess(const std::string& number, ProcessUsage& process) const;
  bool readSystem(MemoryUsage& system) const;
  void readProcessorTime(MemoryUsage& system) const;

  const std::string root_;
  const double ticksPerSecond_;
};

}  // namespace tonewerk
