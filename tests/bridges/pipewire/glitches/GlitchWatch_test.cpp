// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/glitches/GlitchWatch.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <set>

namespace tonewerk {
namespace {

using std::chrono::microseconds;
using std::chrono::milliseconds;
using std::chrono::nanoseconds;
using std::chrono::seconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class GlitchWatchTest : public ::testing::Test {
 protected:
  static constexpr std::uint32_t kFirst = 41;
  static constexpr std::uint32_t kSecond = 42;

  // A cycle in which these nodes are late.
  void run(const std::set<std::uint32_t>& late = {}) {
    ProfiledCycle cycle;
    cycle.driver = 36;
    cycle.number = number_++;
    cycle.position = cycle.number * 960;
    cycle.frames = 960;
    cycle.period = milliseconds(20);
    cycle.begin = seconds(10) + milliseconds(20) * cycle.number;
    cycle.xruns = deviceXruns;
    cycle.processing = processing;
    for (const std::uint32_t node : nodes) {
      const nanoseconds signal = *cycle.begin + microseconds(10);
      ProfiledFollower follower{
          node, !late.contains(node), std::nullopt, {NodeTimes::kSignalled, signal, {}, {}}};
      if (follower.hasFinished) {
        follower.times = {NodeTimes::kFinished, signal, signal + delay + microseconds(20),
                          signal + delay + microseconds(50)};
      }
      cycle.followers.push_back(follower);
    }
    watch.add(cycle);
  }

  std::vector<GlitchSpan> found;
  GlitchWatch watch{[this](const GlitchSpan& span) { found.push_back(span); }};
  std::vector<std::uint32_t> nodes{kFirst, kSecond};
  std::uint32_t deviceXruns = 0;
  std::optional<nanoseconds> processing;
  nanoseconds delay{0};  // until the nodes that finish wake

 private:
  std::uint64_t number_ = 0;
};

TEST_F(GlitchWatchTest, TellsOfOneGlitchForAllCyclesInARowThatANodeSpoiled) {
  run();
  run({kFirst});
  run({kFirst});
  run({kFirst});
  run();
  run();
  ASSERT_THAT(found, SizeIs(1));
  EXPECT_EQ(found[0].first, 1U);
  EXPECT_EQ(found[0].firstNew, 1U);
  EXPECT_EQ(found[0].last, 3U);
  EXPECT_EQ(found[0].number, 1U);
  EXPECT_TRUE(found[0].isOver);
}

TEST_F(GlitchWatchTest, TellsOfTwoGlitchesWhenAnotherNodeIsLateInTheNextCycle) {
  run();
  run({kFirst});
  run({kSecond});
  run();
  run();
  ASSERT_THAT(found, SizeIs(2));
  EXPECT_EQ(found[0].last, 1U);
  EXPECT_EQ(found[1].first, 2U);
}

TEST_F(GlitchWatchTest, TellsOfALongGlitchWhileItLasts) {
  run();
  for (int i = 0; i < 51; ++i) run({kFirst});
  ASSERT_THAT(found, SizeIs(1));
  EXPECT_FALSE(found[0].isOver);
  for (int i = 0; i < 5; ++i) run({kFirst});
  run();
  run();
  ASSERT_THAT(found, SizeIs(2));
  EXPECT_EQ(found[1].number, found[0].number);
  EXPECT_EQ(found[1].firstNew, found[0].last + 1);
  EXPECT_TRUE(found[1].isOver);
}

// The history no longer holds a cycle that it finished.
TEST_F(GlitchWatchTest, RemembersWhatIsUsualForANodeThatHangsForLong) {
  run();
  for (std::size_t i = 0; i < 2 * CycleHistory::kMaxCycles; ++i) run({kFirst});
  const std::optional<UsualTimes> usual = watch.usualOf(kFirst);
  ASSERT_TRUE(usual);
  EXPECT_EQ(usual->wait, 20'000);
  EXPECT_EQ(usual->compute, 30'000);
}

TEST_F(GlitchWatchTest, TellsOfXrunsOfTheDevice) {
  run();
  run();
  deviceXruns = 2;
  run();
  run();
  ASSERT_THAT(found, SizeIs(1));
  EXPECT_EQ(found[0].deviceXruns, 2U);
}

TEST_F(GlitchWatchTest, TellsOfTheXrunsOfTheCycleAfterWithTheGlitch) {
  run();
  run({kFirst});
  deviceXruns = 1;
  run();
  run();
  ASSERT_THAT(found, SizeIs(1));
  EXPECT_EQ(found[0].deviceXruns, 1U);
}

TEST_F(GlitchWatchTest, TellsOfAGlitchThatIsNotOverAtTheEnd) {
  run();
  run({kFirst});
  EXPECT_THAT(found, IsEmpty());
  watch.flush();
  ASSERT_THAT(found, SizeIs(1));
  EXPECT_FALSE(found[0].isOver);
  watch.flush();
  EXPECT_THAT(found, SizeIs(1));
}

// The first node answers late in the second cycle, too late for the second node.
TEST_F(GlitchWatchTest, TakesACycleForThePreviousGlitchWhenItsNodeTookMuchOfItToo) {
  run();
  run({kFirst});
  delay = milliseconds(15);
  run({kSecond});
  delay = {};
  run();
  ASSERT_THAT(found, SizeIs(1));
  EXPECT_EQ(found[0].last, 2U);
}

// A node that is late answers in the next cycle, and the driver, which then has all answers that it waits
// for, finishes. The nodes that still compute are not late.
TEST_F(GlitchWatchTest, TakesACycleThatWasCutShortForThePreviousGlitch) {
  run();
  run({kFirst});
  processing = milliseconds(3);
  run({kSecond});
  processing.reset();
  run();
  ASSERT_THAT(found, SizeIs(1));
  EXPECT_EQ(found[0].last, 2U);
  EXPECT_EQ(found[0].number, 1U);
}

TEST_F(GlitchWatchTest, TellsOfNoGlitchWhenTheDriverFinishedEarly) {
  run();
  processing = milliseconds(3);
  run({kSecond});
  run();
  EXPECT_THAT(found, IsEmpty());
}

// Such as one that no other node waits for.
TEST_F(GlitchWatchTest, GetsUsedToANodeThatNeverFinishes) {
  nodes.push_back(77);
  for (int i = 0; i < 100; ++i) run({77});
  found.clear();
  for (int i = 0; i < 100; ++i) run({77});
  EXPECT_THAT(found, IsEmpty());
}

// The graph reuses the numbers of nodes that have left.
TEST_F(GlitchWatchTest, KnowsNothingOfANewNodeWithTheNumberOfAnOldOne) {
  run();
  run();
  EXPECT_TRUE(watch.usualOf(kSecond));
  nodes = {kFirst};
  run();
  run();
  EXPECT_FALSE(watch.usualOf(kSecond));
}

}  // namespace
}  // namespace tonewerk
