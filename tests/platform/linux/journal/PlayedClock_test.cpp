// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/PlayedClock.h"

#include <gtest/gtest.h>
#include <thread>

#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;

TEST(PlayedClockTest, AThreadThatPlaysHasTheTimeThatItSets) {
  ManualClock real;
  PlayedClock clock(real);
  EXPECT_EQ(clock.now(), real.now());
  {
    PlayedClock::Time time;
    time.set(1000.0);
    EXPECT_EQ(clock.now(), 1000.0);
    EXPECT_EQ(clock.coarseNow(), 1000.0);
    std::thread([&] { EXPECT_EQ(clock.now(), real.now()); }).join();
  }
  EXPECT_EQ(clock.now(), real.now());
}

TEST(PlayedClockTest, ItsMonotonicTimeAdvancesWithItAndNeverGoesBack) {
  ManualClock real;
  PlayedClock clock(real);
  PlayedClock::Time time;
  time.set(1000.0);
  const auto begin = clock.monotonic();
  time.set(1002.0);
  EXPECT_EQ(clock.monotonic() - begin, 2s);
  time.set(900.0);
  EXPECT_EQ(clock.monotonic() - begin, 2s);
  time.set(901.0);
  EXPECT_EQ(clock.coarseMonotonic() - begin, 3s);
}

// A device without a battery for its clock jumps by decades at each start.
TEST(PlayedClockTest, ItsMonotonicTimeComesToNoEndHoweverOftenTheWallClockJumpsAhead) {
  ManualClock real;
  PlayedClock clock(real);
  PlayedClock::Time time;
  auto last = clock.monotonic();
  for (int jump = 0; jump < 20; ++jump) {
    time.set(1.0);
    time.set(1.8e9);
    EXPECT_GE(clock.monotonic(), last);
    last = clock.monotonic();
  }
  time.set(1e11);
  EXPECT_GE(clock.monotonic(), last);
  EXPECT_GT(clock.monotonic() + 24h, clock.monotonic());
}

}  // namespace
}  // namespace tonewerk
