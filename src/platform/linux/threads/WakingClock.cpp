// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/WakingClock.h"

#include <ctime>

namespace tonewerk {

std::chrono::nanoseconds WakingClock::monotonic() const {
  timespec time{};
  clock_gettime(CLOCK_BOOTTIME, &time);
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

}  // namespace tonewerk
