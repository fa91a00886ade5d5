// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/ProcessInformation.h"

namespace tonewerk {

// Reads data of processes from /proc.
class LinuxProcessInformation final : public ProcessInformation {
 public:
  // Tests pass another directory instead of "/proc".
  explicit LinuxProcessInformation(std::string procDirectory = "/proc")
      : procDirectory_(std::move(procDirectory)), statusPath_(procDirectory_ + "/self/status") {}

  // Reads PID/comm. The kernel cuts the name to 15 bytes; an incomplete character becomes U+FFFD.
  [[nodiscard]] std::optional<std::string> processName(std::int32_t processIdentifier) const override;
  std::int32_t ownProcessIdentifier() const override;
  // The sum of RssAnon and VmSwap of self/status. The kernel keeps these counters anyway, whereas
  // self/smaps_rollup is more precise but walks over all pages.
  [[nodiscard]] std::variant<std::uint64_t, std::string> physicalFootprint() const override;
  std::int64_t processorTimeMicroseconds() const override;

 private:
  const std::string procDirectory_;
  const std::string statusPath_;
};

}  // namespace tonewerk
