// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>

#include "platform/Clock.h"
#include "values/Mutex.h"

namespace tonewerk {

// Limits captures of memory logs to one every five seconds for all sessions together. The process has one.
// Any thread may use it.
class MemoryLogLimiter {
 public:
  static constexpr std::chrono::seconds kInterval{5};

  // True at the first call, and then whenever more than the interval has passed since it last returned true.
  // It measures with the monotonic clock.
  [[nodiscard]] bool claim(const Clock& clock) {
    const MutexLock lock(mutex_);
    const std::chrono::nanoseconds now = clock.monotonic();
    if (lastCapture_ && now - *lastCapture_ <= kInterval) return false;
    lastCapture_ = now;
    return true;
  }

 private:
  Mutex mutex_;
  std::optional<std::chrono::nanoseconds> lastCapture_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
