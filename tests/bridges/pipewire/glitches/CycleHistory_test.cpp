// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/glitches/CycleHistory.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace tonewerk {
namespace {

using std::chrono::microseconds;
using std::chrono::milliseconds;
using std::chrono::nanoseconds;
using std::chrono::seconds;

class CycleHistoryTest : public ::testing::Test {
 protected:
  static constexpr nanoseconds kPeriod = milliseconds(20);

  ProfiledCycle cycle(std::uint64_t number, std::size_t nodes = 2) const {
    ProfiledCycle cycle;
    cycle.driver = 36;
    cycle.number = number;
    cycle.position = number * 960;
    cycle.frames = 960;
    cycle.period = kPeriod;
    cycle.begin = seconds(10) + kPeriod * number;
    for (std::size_t i = 0; i < nodes; ++i) {
      const nanoseconds signal = *cycle.begin + microseconds(10);
      cycle.followers.push_back(
          {static_cast<std::uint32_t>(40 + i),
           true,
           std::nullopt,
           {NodeTimes::kFinished, signal, signal + microseconds(20), signal + microseconds(30)}});
    }
    return cycle;
  }

  CycleHistory history;
};

TEST_F(CycleHistoryTest, KeepsTimesSinceTheBeginOfTheirCycle) {
  EXPECT_EQ(history.add(cycle(1)), CycleHistory::Added::kNew);
  ASSERT_EQ(history.size(), 1U);
  EXPECT_EQ(history.cycle(0).begin, seconds(10) + kPeriod);
  const std::optional<KeptNode> node = history.find(0, 41);
  ASSERT_TRUE(node);
  EXPECT_EQ(node->signal, 10'000);
  EXPECT_EQ(node->awake, 30'000);
  EXPECT_EQ(node->finish, 40'000);
  EXPECT_FALSE(history.find(0, 42));
}

// As PipeWire 0.3.65 does: the first report has the begin of the cycle before, and its own as the finish.
TEST_F(CycleHistoryTest, KeepsACycleThatIsReportedTwiceOnceWithItsOwnBegin) {
  history.add(cycle(1));
  ProfiledCycle first = cycle(2);
  first.begin = cycle(1).begin;
  first.processing = kPeriod;
  first.followers[0].hasFinished = false;
  first.followers[0].times = {NodeTimes::kSignalled, *cycle(2).begin + microseconds(1), {}, {}};
  EXPECT_EQ(history.add(first), CycleHistory::Added::kNew);
  EXPECT_EQ(history.cycle(1).begin, *cycle(2).begin);
  EXPECT_EQ(history.find(1, 40)->signal, 1'000);

  ProfiledCycle second = first;
  second.begin = *cycle(2).begin + microseconds(3);
  EXPECT_EQ(history.add(second), CycleHistory::Added::kAgain);
  EXPECT_EQ(history.size(), 2U);
  EXPECT_TRUE(history.cycle(1).isUnfinished);
  EXPECT_EQ(history.find(1, 40)->signal, -2'000);
}

// The cycle after an unfinished one has the position of its reports.
TEST_F(CycleHistoryTest, KeepsTheCycleAfterAnUnfinishedOneOfTheSamePosition) {
  ProfiledCycle late = cycle(1);
  late.followers[0].hasFinished = false;
  ProfiledCycle next = cycle(2);
  late.position = next.position;
  history.add(late);
  history.add(late);
  EXPECT_EQ(history.add(next), CycleHistory::Added::kNew);
  EXPECT_EQ(history.size(), 2U);
}

TEST_F(CycleHistoryTest, ForgetsTheOldestCyclesFirst) {
  for (std::uint64_t i = 0; i < 2 * CycleHistory::kMaxCycles; ++i) history.add(cycle(i));
  ASSERT_EQ(history.size(), CycleHistory::kMaxCycles);
  for (std::size_t i = 0; i < history.size(); ++i) {
    EXPECT_EQ(history.cycle(i).number, CycleHistory::kMaxCycles + i);
  }
}

TEST_F(CycleHistoryTest, ForgetsMoreCyclesWhenTheyHaveManyNodes) {
  std::uint64_t number = 0;
  for (const std::size_t nodes : {100U, 7U, 0U, 300U, 255U, 33U, 0U, 1U}) {
    for (int i = 0; i < 200; ++i) {
      history.add(cycle(number++, nodes));
      ASSERT_EQ(history.cycle(history.size() - 1).number, number - 1);
      std::size_t parts = 0;
      for (std::size_t j = 0; j < history.size(); ++j) {
        parts += history.nodes(j).size();
        ASSERT_EQ(history.cycle(j).number, number - history.size() + j);
        for (const KeptNode& node : history.nodes(j)) ASSERT_EQ(node.signal, 10'000);
      }
      ASSERT_LE(parts, CycleHistory::kMaxParts);
    }
  }
}

TEST_F(CycleHistoryTest, IgnoresACycleWithoutATimeOrFromThePast) {
  ProfiledCycle none = cycle(1);
  none.begin.reset();
  EXPECT_EQ(history.add(none), CycleHistory::Added::kNothing);
  history.add(cycle(2));
  EXPECT_EQ(history.add(cycle(1)), CycleHistory::Added::kNothing);
  EXPECT_EQ(history.size(), 1U);
}

TEST_F(CycleHistoryTest, LeavesOutTimesFarFromTheCycle) {
  ProfiledCycle odd = cycle(1);
  odd.followers[0].times.signal = nanoseconds(1);
  odd.followers[0].times.finish = nanoseconds(INT64_MAX);
  history.add(odd);
  EXPECT_EQ(history.find(0, 40)->signal, KeptNode::kNever);
  EXPECT_EQ(history.find(0, 40)->finish, KeptNode::kNever);
}

}  // namespace
}  // namespace tonewerk
