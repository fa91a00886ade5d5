// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

#include "platform/Clock.h"
#include "platform/ProcessInformation.h"
#include "values/Mutex.h"

namespace tonewerk {

// Reads data of processes from /proc.
class LinuxProcessInformation final : public ProcessInformation {
 public:
  // The maximum age of the footprint with a clock. Many sessions often stop at the same time, and the kernel
  // takes longer to write the file than a session takes to live. So sessions that stop together report the
  // same footprint, even if one of them has just freed much.
  static constexpr std::chrono::milliseconds kMaxFootprintAge{10};

  // Reads the footprint each time. Tests pass another directory instead of "/proc".
  explicit LinuxProcessInformation(std::string procDirectory = "/proc")
      : procDirectory_(std::move(procDirectory)), statusPath_(procDirectory_ + "/self/status") {}
  // `clock` must outlive this object.
  explicit LinuxProcessInformation(const Clock& clock, std::string procDirectory = "/proc")
      : LinuxProcessInformation(std::move(procDirectory)) {
    clock_ = &clock;
  }

  // Reads PID/comm. The kernel cuts the name to 15 bytes; an incomplete character becomes U+FFFD.
  [[nodiscard]] std::optional<std::string> processName(std::int32_t processIdentifier) const override;
  std::int32_t ownProcessIdentifier() const override;
  // The sum of RssAnon and VmSwap of self/status. The kernel keeps these counters anyway, whereas
  // self/smaps_rollup is more precise but walks over all pages.
  [[nodiscard]] std::variant<std::uint64_t, std::string> physicalFootprint() const override;
  std::int64_t processorTimeMicroseconds() const override;

 private:
  struct Footprint {
    std::chrono::nanoseconds at{0};
    std::uint64_t bytes = 0;
  };
  std::variant<std::uint64_t, std::string> readFootprint() const;

  const std::string procDirectory_;
  const std::string statusPath_;
  const Clock* clock_ = nullptr;  // null reads the footprint each time
  mutable Mutex mutex_;
  mutable std::optional<Footprint> footprint_ GUARDED_BY(mutex_);  // the last one that could be read
};

}  // namespace tonewerk
