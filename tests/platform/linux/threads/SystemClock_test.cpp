// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/SystemClock.h"

#include <gtest/gtest.h>
#include <limits>

#include "support/ScopedTimeZone.h"

namespace tonewerk {
namespace {

using std::chrono::minutes;

constexpr double kWinter = 1'768'478'400.0;  // 2026-01-15T12:00:00Z
constexpr double kSummer = 1'784'116'800.0;  // 2026-07-15T12:00:00Z

TEST(SystemClockTest, TellsTheTimeOfDay) {
  const SystemClock clock;
  const time_t before = time(nullptr);
  const double now = clock.now();
  EXPECT_GE(now, static_cast<double>(before) - 1.0);
  EXPECT_LE(now, static_cast<double>(time(nullptr)) + 1.0);
}

TEST(SystemClockTest, MonotonicTimeNeverGoesBack) {
  const SystemClock clock;
  auto before = clock.monotonic();
  for (int reading = 0; reading < 1000; ++reading) {
    const auto now = clock.monotonic();
    ASSERT_GE(now, before);
    before = now;
  }
}

// The kernel promises a hundredth of a second; a virtual machine may hold its timer up for longer.
TEST(SystemClockTest, TheCoarseTimesAreTheTimesOfALittleEarlier) {
  const SystemClock clock;
  const double now = clock.now();
  const auto monotonic = clock.monotonic();
  EXPECT_GT(clock.coarseNow(), now - 2.0);
  EXPECT_GT(clock.coarseMonotonic(), monotonic - std::chrono::seconds(2));
  const double coarse = clock.coarseNow();
  const auto coarseMonotonic = clock.coarseMonotonic();
  EXPECT_LE(coarse, clock.now());
  EXPECT_LE(coarseMonotonic, clock.monotonic());
}

TEST(SystemClockTest, TheOffsetFollowsSummerTime) {
  const SystemClock clock;
  const ScopedTimeZone zone("CET-1CEST,M3.5.0,M10.5.0/3");
  EXPECT_EQ(clock.utcOffset(kWinter), minutes(60));
  EXPECT_EQ(clock.utcOffset(kSummer), minutes(120));
}

TEST(SystemClockTest, TheOffsetFollowsTheTimeZone) {
  const SystemClock clock;
  {
    const ScopedTimeZone zone("XXX3:30");
    EXPECT_EQ(clock.utcOffset(kWinter), minutes(-210));
  }
  const ScopedTimeZone zone("UTC0");
  EXPECT_EQ(clock.utcOffset(kWinter), minutes(0));
}

TEST(SystemClockTest, ATimeOutsideTheCalendarHasNoOffset) {
  const SystemClock clock;
  const ScopedTimeZone zone("CET-1");
  EXPECT_EQ(clock.utcOffset(1e300), minutes(0));
  EXPECT_EQ(clock.utcOffset(std::numeric_limits<double>::quiet_NaN()), minutes(0));
  EXPECT_EQ(clock.utcOffset(-1e16), minutes(0));
}

TEST(SystemClockTest, ASleepLastsAtLeastItsDuration) {
  SystemClock clock;
  const auto before = clock.monotonic();
  clock.sleep(std::chrono::milliseconds(20));
  EXPECT_GE(clock.monotonic() - before, std::chrono::milliseconds(20));
  clock.sleep(std::chrono::nanoseconds(0));
  clock.sleep(std::chrono::hours(-1));
}

}  // namespace
}  // namespace tonewerk
