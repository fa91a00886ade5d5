// SPDX-License-Identifier: Apache-2.0
#include "platform/Heartbeat.h"

#include <gtest/gtest.h>
#include <thread>

namespace tonewerk {
namespace {

using namespace std::chrono_literals;

TEST(HeartbeatTest, RestsAtFirst) {
  const Heartbeat heartbeat;
  EXPECT_FALSE(heartbeat.read().isWorking);
  EXPECT_EQ(heartbeat.read().allowance, 0ms);
}

TEST(HeartbeatTest, EachBeatCountsAndSaysThatTheThreadWorks) {
  Heartbeat heartbeat;
  heartbeat.beat();
  EXPECT_TRUE(heartbeat.read().isWorking);
  EXPECT_EQ(heartbeat.read().beats, 1U);
  heartbeat.beat();
  heartbeat.beat();
  EXPECT_EQ(heartbeat.read().beats, 3U);
  EXPECT_TRUE(heartbeat.read().isWorking);
}

TEST(HeartbeatTest, RestingIsABeatToo) {
  Heartbeat heartbeat;
  heartbeat.beat();
  heartbeat.rest();
  EXPECT_FALSE(heartbeat.read().isWorking);
  EXPECT_EQ(heartbeat.read().beats, 2U);
}

TEST(HeartbeatTest, BelongsToAThreadAsLongAsTheScopeLives) {
  EXPECT_EQ(Heartbeat::ofThisThread(), nullptr);
  Heartbeat::beatHere();  // beats for nobody
  const auto heartbeat = std::make_shared<Heartbeat>();
  {
    const Heartbeat::OnThisThread scope(heartbeat);
    EXPECT_EQ(Heartbeat::ofThisThread(), heartbeat);
    Heartbeat::beatHere();
    EXPECT_TRUE(heartbeat->read().isWorking);
    std::thread([] { EXPECT_EQ(Heartbeat::ofThisThread(), nullptr); }).join();
  }
  EXPECT_EQ(Heartbeat::ofThisThread(), nullptr);
  EXPECT_FALSE(heartbeat->read().isWorking);
}

TEST(HeartbeatTest, RestsInTheScopeOfARestAndWorksAfterIt) {
  const auto heartbeat = std::make_shared<Heartbeat>();
  const Heartbeat::OnThisThread scope(heartbeat);
  heartbeat->beat();
  {
    const Heartbeat::Rest rest;
    EXPECT_FALSE(heartbeat->read().isWorking);
  }
  EXPECT_TRUE(heartbeat->read().isWorking);
}

TEST(HeartbeatTest, TheLargestBoundOfNestedLongWorkCounts) {
  const auto heartbeat = std::make_shared<Heartbeat>();
  const Heartbeat::OnThisThread scope(heartbeat);
  {
    const Heartbeat::LongWork outer(15s);
    EXPECT_EQ(heartbeat->read().allowance, 15s);
    {
      const Heartbeat::LongWork shorter(10s);
      EXPECT_EQ(heartbeat->read().allowance, 15s);
    }
    {
      const Heartbeat::LongWork longer(180s);
      EXPECT_EQ(heartbeat->read().allowance, 180s);
    }
    EXPECT_EQ(heartbeat->read().allowance, 15s);
  }
  EXPECT_EQ(heartbeat->read().allowance, 0ms);
}

TEST(HeartbeatTest, LongWorkBeatsAtItsBeginAndItsEnd) {
  const auto heartbeat = std::make_shared<Heartbeat>();
  const Heartbeat::OnThisThread scope(heartbeat);
  const std::uint64_t before = heartbeat->read().beats;
  {
    const Heartbeat::LongWork work(1s);
    EXPECT_EQ(heartbeat->read().beats, before + 1);
  }
  EXPECT_EQ(heartbeat->read().beats, before + 2);
}

TEST(HeartbeatTest, TheScopesDoNothingOnAThreadWithoutAHeartbeat) {
  const Heartbeat::LongWork work(1s);
  const Heartbeat::Rest rest;
  EXPECT_EQ(Heartbeat::ofThisThread(), nullptr);
}

}  // namespace
}  // namespace tonewerk
