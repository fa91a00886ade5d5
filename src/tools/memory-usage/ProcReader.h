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

// Reads the memory usage from /proc. It uses only counters that the kernel keeps anyway. Reading smaps would
// walk over all pages, which would make things worse under memory pressure.
class ProcReader {
 public:
  // `root` is "/proc", or a copy of its layout in tests. `ticksPerSecond` is the unit of the processor times
  // in it.
  ProcReader(std::string root, double ticksPerSecond)
      : root_(std::move(root)), files_(root_), ticksPerSecond_(ticksPerSecond) {}

  // The processes are in the order of their identifiers. None if the directory or the system's memory usage
  // cannot be read; `problem` then says why. A process that ends meanwhile is left out.
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
