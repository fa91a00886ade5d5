// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/XrunWatch.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

constexpr std::uint32_t kDriver = 36;
constexpr std::uint32_t kStream = 42;

class XrunWatchTest : public ::testing::Test {
 protected:
  // Reports the driver's next cycle.
  CycleXruns next(std::vector<ProfiledFollower> followers, std::uint32_t driverXruns = 0) {
    position += 1024;
    return again(std::move(followers), driverXruns);
  }
  // Reports the same cycle again.
  CycleXruns again(std::vector<ProfiledFollower> followers, std::uint32_t driverXruns = 0) {
    ProfiledCycle cycle;
    cycle.driver = kDriver;
    cycle.position = position;
    cycle.xruns = driverXruns;
    cycle.followers = std::move(followers);
    return watch.update(cycle);
  }

  static ProfiledFollower finished(std::uint32_t node = kStream) { return {node, true, std::nullopt}; }
  static ProfiledFollower unfinished(std::uint32_t node = kStream) { return {node, false, std::nullopt}; }
  static ProfiledFollower counting(std::uint32_t xruns, bool hasFinished = true) {
    return {kStream, hasFinished, xruns};
  }

  XrunWatch watch;
  std::uint64_t position = 0;
};

TEST_F(XrunWatchTest, CountsACycleThatAFollowerLeftUnfinished) {
  EXPECT_THAT(next({finished()}).followers, IsEmpty());
  EXPECT_THAT(next({unfinished()}).followers, ElementsAre(Pair(kStream, 1)));
  EXPECT_THAT(next({unfinished()}).followers, ElementsAre(Pair(kStream, 1)));
  EXPECT_THAT(next({finished()}).followers, IsEmpty());
}

TEST_F(XrunWatchTest, CountsACycleThatIsReportedTwiceOnce) {
  next({finished()});
  EXPECT_FALSE(next({unfinished()}).isRepeat);
  const CycleXruns repeated = again({unfinished()});
  EXPECT_TRUE(repeated.isRepeat);
  EXPECT_THAT(repeated.followers, IsEmpty());
}

// The clocks of some drivers do not advance.
TEST_F(XrunWatchTest, FindsNoRepeatAfterAFinishedCycle) {
  next({finished()});
  EXPECT_FALSE(again({finished()}).isRepeat);
}

TEST_F(XrunWatchTest, DoesNotCountAFollowerThatIsBeingStarted) {
  EXPECT_THAT(next({unfinished()}).followers, IsEmpty());
  EXPECT_THAT(next({unfinished()}).followers, IsEmpty());
  next({finished()});
  EXPECT_THAT(next({unfinished()}).followers, ElementsAre(Pair(kStream, 1)));
}

TEST_F(XrunWatchTest, ForgetsAFollowerThatLeft) {
  next({finished()});
  next({});
  EXPECT_THAT(next({unfinished()}).followers, IsEmpty());
}

TEST_F(XrunWatchTest, UsesTheCountOfAFollowerThatHasOne) {
  EXPECT_THAT(next({counting(7)}).followers, IsEmpty());
  EXPECT_THAT(next({counting(7, false)}).followers, IsEmpty());
  EXPECT_THAT(next({counting(9)}).followers, ElementsAre(Pair(kStream, 2)));
  // The count went back: the node was made again.
  EXPECT_THAT(next({counting(1)}).followers, ElementsAre(Pair(kStream, 1)));
}

TEST_F(XrunWatchTest, CountsTheIncreaseOfTheDriversOwnCount) {
  EXPECT_EQ(next({}, 5).driver, 0U);
  EXPECT_EQ(next({}, 5).driver, 0U);
  EXPECT_EQ(next({}, 8).driver, 3U);
  EXPECT_EQ(next({}, 2).driver, 2U);
}

TEST_F(XrunWatchTest, StartsAgainForADriverThatReplacesAnother) {
  next({finished()}, 1);
  watch.retain({});
  EXPECT_EQ(next({unfinished()}, 9).driver, 0U);
  watch.retain({kDriver});
  EXPECT_EQ(next({}, 10).driver, 1U);
}

TEST_F(XrunWatchTest, KeepsAtMostTheMaximumOfDrivers) {
  next({}, 1);
  ProfiledCycle other;
  for (std::uint32_t i = 1; i < XrunWatch::kMaxDrivers; ++i) {
    other.driver = 1000 + i;
    watch.update(other);
  }
  EXPECT_EQ(next({}, 2).driver, 1U);
  other.driver = 999;
  watch.update(other);
  // All drivers were forgotten, so the first count of each is not an increase.
  EXPECT_EQ(next({}, 3).driver, 0U);
  EXPECT_EQ(next({}, 4).driver, 1U);
}

}  // namespace
}  // namespace tonewerk
