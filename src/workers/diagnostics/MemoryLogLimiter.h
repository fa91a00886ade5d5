// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>

#include "platform/Clock.h"
#include "values/Mutex.h"

namespace tonewerk {

// Lets one capture of memory logs through every five seconds, for all sessions together. One of the process's
// single objects. Any thread.
class MemoryLogLimiter {
 public:
  static constexpr std::chrono::seconds kInterval{5};

  // Whether more than the interval has passed since it was last true, as it is at first. On the monotonic
  // clock.
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
