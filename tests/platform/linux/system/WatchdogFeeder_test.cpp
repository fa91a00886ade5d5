// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/WatchdogFeeder.h"

#include <gtest/gtest.h>

#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;

class WatchdogFeederTest : public testing::Test {
 protected:
  void advanceAndPing(std::chrono::nanoseconds duration) {
    clock.advance(duration);
    feeder.pingIfDue();
  }

  ManualClock clock;
  int pings = 0;
  WatchdogFeeder feeder{10s, clock, [this] { ++pings; }};
};

TEST_F(WatchdogFeederTest, TheFirstPingIsDueAtOnce) {
  EXPECT_EQ(feeder.timeToNext(), 0ms);
  feeder.pingIfDue();
  EXPECT_EQ(pings, 1);
  EXPECT_EQ(feeder.timeToNext(), 10s);
}

TEST_F(WatchdogFeederTest, PingsOnceAnIntervalHoweverOftenItIsAsked) {
  feeder.pingIfDue();
  feeder.pingIfDue();
  advanceAndPing(9'999ms);
  EXPECT_EQ(pings, 1);
  EXPECT_EQ(feeder.timeToNext(), 1ms);
  advanceAndPing(1ms);
  EXPECT_EQ(pings, 2);
  advanceAndPing(10s);
  EXPECT_EQ(pings, 3);
}

TEST_F(WatchdogFeederTest, OnePingReplacesMissedOnes) {
  feeder.pingIfDue();
  advanceAndPing(35s);
  EXPECT_EQ(pings, 2);
  EXPECT_EQ(feeder.timeToNext(), 10s);
}

TEST_F(WatchdogFeederTest, WaitingForTheTimeThatIsLeftIsLongEnough) {
  feeder.pingIfDue();
  clock.advance(1ns);
  EXPECT_EQ(feeder.timeToNext(), 10s);
  advanceAndPing(feeder.timeToNext());
  EXPECT_EQ(pings, 2);
}

TEST_F(WatchdogFeederTest, AWallClockThatJumpsChangesNothing) {
  feeder.pingIfDue();
  clock.setNow(0.0);
  EXPECT_EQ(feeder.timeToNext(), 10s);
  clock.setNow(4'000'000'000.0);
  feeder.pingIfDue();
  EXPECT_EQ(pings, 1);
}

}  // namespace
}  // namespace tonewerk
