// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>

#include "platform/ProcessInformation.h"
#include "values/Mutex.h"

namespace tonewerk {

// Gives the processes that the test sets. Any thread.
//
//   processes.setName(4242, "player");
//   processes.failFootprint("Permission denied");
class MemoryProcessInformation final : public ProcessInformation {
 public:
  static constexpr std::int32_t kOwnProcessIdentifier = 1000;

  MemoryProcessInformation() { setName(kOwnProcessIdentifier, "twreportingd"); }

  std::optional<std::string> processName(std::int32_t processIdentifier) const override {
    const MutexLock lock(mutex_);
    const auto found = names_.find(processIdentifier);
    return found == names_.end() ? std::nullopt : std::optional(found->second);
  }
  std::int32_t ownProcessIdentifier() const override { return kOwnProcessIdentifier; }
  [[nodiscard]] std::variant<std::uint64_t, std::string> physicalFootprint() const override {
    const MutexLock lock(mutex_);
    return footprint_;
  }
  std::int64_t processorTimeMicroseconds() const override {
    const MutexLock lock(mutex_);
    return processorTime_;
  }

  void setName(std::int32_t processIdentifier, std::string name) {
    const MutexLock lock(mutex_);
    names_[processIdentifier] = std::move(name);
  }
  // From now on there is no such process.
  void forget(std::int32_t processIdentifier) {
    const MutexLock lock(mutex_);
    names_.erase(processIdentifier);
  }
  void setFootprint(std::uint64_t bytes) {
    const MutexLock lock(mutex_);
    footprint_ = bytes;
  }
  // From now on physicalFootprint() fails with this text.
  void failFootprint(std::string problem) {
    const MutexLock lock(mutex_);
    footprint_ = std::move(problem);
  }
  void setProcessorTime(std::int64_t microseconds) {
    const MutexLock lock(mutex_);
    processorTime_ = microseconds;
  }

 private:
  mutable Mutex mutex_;
  std::map<std::int32_t, std::string> names_ GUARDED_BY(mutex_);
  std::variant<std::uint64_t, std::string> footprint_ GUARDED_BY(mutex_) = std::uint64_t{8} << 20;
  std::int64_t processorTime_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
