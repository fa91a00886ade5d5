// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/ProcessInformation.h"

namespace tonewerk {

// Processes as /proc shows them.
class LinuxProcessInformation final : public ProcessInformation {
 public:
  // `procDirectory` is where to look, for tests.
  explicit LinuxProcessInformation(std::string procDirectory = "/proc")
      : procDirectory_(std::move(procDirectory)) {}

  // PID/comm, which the kernel cuts to 15 bytes. What it leaves of a character reads as U+FFFD.
  [[nodiscard]] std::optional<std::string> processName(std::int32_t processIdentifier) const override;
  std::int32_t ownProcessIdentifier() const override;
  // RssAnon and VmSwap of self/status: counters that the kernel keeps anyway, unlike the precise walk over
  // all pages behind self/smaps_rollup.
  [[nodiscard]] std::variant<std::uint64_t, std::string> physicalFootprint() const override;
  std::int64_t processorTimeMicroseconds() const override;

 private:
  const std::string procDirectory_;
};

}  // namespace tonewerk
