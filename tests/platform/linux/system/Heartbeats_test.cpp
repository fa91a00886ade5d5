// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/Heartbeats.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <optional>

#include "platform/Log.h"
#include "platform/linux/system/WatchdogFeeder.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class HeartbeatsTest : public testing::Test {
 protected:
  HeartbeatsTest() {
    heartbeats.watch("the store", store);
    heartbeats.watch("the work queue", queue);
  }

  bool areAlive() { return heartbeats.areAlive(clock.monotonic(), 30s); }
  bool areAliveAfter(std::chrono::nanoseconds time) {
    clock.advance(time);
    return areAlive();
  }
  auto errors() const { return log.textsOf("twrs", LogLevel::kError); }

  ManualClock clock;
  MemoryLog log;
  const LogCategory category{log, "com.example", "twrs"};
  Heartbeats heartbeats{category};
  const std::shared_ptr<Heartbeat> store = std::make_shared<Heartbeat>();
  const std::shared_ptr<Heartbeat> queue = std::make_shared<Heartbeat>();
};

TEST_F(HeartbeatsTest, ThreadsThatRestAreAliveForEver) {
  EXPECT_TRUE(areAlive());
  EXPECT_TRUE(areAliveAfter(24h));
  EXPECT_TRUE(areAliveAfter(24h));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(HeartbeatsTest, AThreadThatBeatsIsAliveHoweverLongItWorks) {
  for (int minute = 0; minute < 60; ++minute) {
    queue->beat();
    EXPECT_TRUE(areAliveAfter(1min));
  }
}

TEST_F(HeartbeatsTest, AThreadThatWorksAndStandsStillForTheLimitIsNotAlive) {
  queue->beat();
  EXPECT_TRUE(areAlive());
  EXPECT_TRUE(areAliveAfter(29'999ms));
  EXPECT_FALSE(areAliveAfter(1ms));
  EXPECT_FALSE(areAliveAfter(30s));
}

TEST_F(HeartbeatsTest, OneThreadThatStandsStillIsEnoughWhicheverItIs) {
  for (const auto& heartbeat : {store, queue}) {
    heartbeat->beat();
    EXPECT_TRUE(areAlive());
    EXPECT_FALSE(areAliveAfter(30s));
    heartbeat->rest();
    EXPECT_TRUE(areAlive());
  }
}

TEST_F(HeartbeatsTest, TheThreadIsNamedOnceUntilItMovesAgain) {
  queue->beat();
  EXPECT_TRUE(areAlive());
  EXPECT_FALSE(areAliveAfter(31s));
  EXPECT_THAT(errors(), IsEmpty());  // the process itself may have been stopped
  EXPECT_FALSE(areAliveAfter(4s));
  EXPECT_FALSE(areAliveAfter(4s));
  EXPECT_THAT(errors(), ElementsAre("the work queue has made no progress for 35 s; the watchdog is told "
                                    "nothing until it does"));
  queue->beat();
  EXPECT_TRUE(areAlive());
  EXPECT_EQ(errors().back(), "the work queue makes progress again");
  EXPECT_EQ(errors().size(), 2U);
}

TEST_F(HeartbeatsTest, AThreadThatMovesAtTheSecondLookIsNotLogged) {
  queue->beat();
  EXPECT_TRUE(areAlive());
  EXPECT_FALSE(areAliveAfter(1h));
  queue->beat();
  EXPECT_TRUE(areAliveAfter(4s));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(HeartbeatsTest, LongWorkMayTakeItsBoundBesidesTheLimit) {
  const Heartbeat::OnThisThread scope(queue);
  {
    const Heartbeat::LongWork trace(180s);
    EXPECT_TRUE(areAlive());
    EXPECT_TRUE(areAliveAfter(209'999ms));
    EXPECT_FALSE(areAliveAfter(1ms));
  }
  EXPECT_TRUE(areAlive());
  EXPECT_FALSE(areAliveAfter(30s));
}

TEST_F(HeartbeatsTest, APingThatWasNotSentIsSentAsSoonAsTheThreadMovesAgain) {
  int pings = 0;
  WatchdogFeeder feeder(
      30s, clock, [&] { ++pings; }, &heartbeats);
  feeder.pingIfDue();
  queue->beat();
  clock.advance(30s);
  feeder.pingIfDue();  // sees the beat
  EXPECT_EQ(pings, 2);
  for (int tries = 0; tries < WatchdogFeeder::kTriesPerInterval; ++tries) {
    clock.advance(feeder.timeToNext());
    feeder.pingIfDue();
  }
  EXPECT_EQ(pings, 2);
  queue->rest();
  clock.advance(feeder.timeToNext());
  feeder.pingIfDue();
  EXPECT_EQ(pings, 3);
  EXPECT_EQ(feeder.timeToNext(), 30s);
}

// The manager ends a process after two intervals without a ping.
TEST_F(HeartbeatsTest, AThreadThatStandsStillForHalfTheManagersTimeIsForgivenWhenItMovesBeforeTheEnd) {
  std::optional<std::chrono::nanoseconds> lastPing;
  WatchdogFeeder feeder(
      30s, clock, [&] { lastPing = clock.monotonic(); }, &heartbeats);
  feeder.pingIfDue();
  queue->beat();
  clock.advance(30s);
  feeder.pingIfDue();
  const std::chrono::nanoseconds last = lastPing.value_or(0s);
  clock.advance(55s);
  feeder.pingIfDue();
  EXPECT_EQ(lastPing, last);
  queue->beat();
  clock.advance(feeder.timeToNext());
  feeder.pingIfDue();
  EXPECT_LT(lastPing.value_or(0s) - last, 60s);
  EXPECT_GT(lastPing, last);
}

}  // namespace
}  // namespace tonewerk
