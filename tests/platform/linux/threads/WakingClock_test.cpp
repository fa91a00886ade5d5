// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/WakingClock.h"

#include <gtest/gtest.h>
#include <time.h>

namespace tonewerk {
namespace {

std::chrono::nanoseconds timeSinceBoot() {
  timespec time{};
  clock_gettime(CLOCK_BOOTTIME, &time);
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

TEST(WakingClockTest, ItsMonotonicTimeIsTheTimeSinceTheBootWithSleep) {
  const WakingClock clock;
  const std::chrono::nanoseconds before = timeSinceBoot();
  const std::chrono::nanoseconds now = clock.monotonic();
  EXPECT_GE(now, before);
  EXPECT_LE(now, timeSinceBoot());
}

TEST(WakingClockTest, TellsTheTimeOfDay) {
  const WakingClock clock;
  EXPECT_NEAR(clock.now(), SystemClock().now(), 10.0);
}

}  // namespace
}  // namespace tonewerk
