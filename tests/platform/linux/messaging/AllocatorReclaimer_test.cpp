// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messaging/AllocatorReclaimer.h"

#include <cstddef>
#include <gmock/gmock.h>
#include <vector>

#include "support/manual/ManualClock.h"
#include "support/manual/ManualTimers.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;

constexpr std::size_t kSpare = AllocatorReclaimer::kSpareBytes;

class AllocatorReclaimerTest : public ::testing::Test {
 protected:
  // Moves the clock in steps of a second, and gives the seconds in which there was a look.
  std::vector<int> looksWithin(int seconds) {
    std::vector<int> found;
    for (int second = 1; second <= seconds; ++second) {
      const int before = looks;
      clock.advance(1.0);
      if (looks > before) found.push_back(second);
    }
    return found;
  }

  ManualClock clock;
  ManualTimers timers{clock};
  std::size_t idle = 0;
  int looks = 0;
  int given = 0;
  AllocatorReclaimer reclaimer{timers,
                               {[this] {
                                  ++looks;
                                  return idle;
                                },
                                [this] {
                                  ++given;
                                  idle = 0;
                                }}};
};

TEST_F(AllocatorReclaimerTest, GivesBackASecondLaterWhatTheAllocatorKeeps) {
  idle = kSpare + 1;
  reclaimer.scheduleChecks();
  EXPECT_EQ(given, 0);
  clock.advance(1.0);
  EXPECT_EQ(given, 1);
}

TEST_F(AllocatorReclaimerTest, LeavesTheAllocatorWhatIsNotWorthIt) {
  idle = kSpare;
  reclaimer.scheduleChecks();
  clock.advance(100.0);
  EXPECT_GT(looks, 0);
  EXPECT_EQ(given, 0);
}

TEST_F(AllocatorReclaimerTest, LooksAgainForWhatIsStillBeingWrittenAndThenNoMore) {
  reclaimer.scheduleChecks();
  EXPECT_THAT(looksWithin(100), ElementsAre(1, 2, 4, 8, 16, 32));
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(AllocatorReclaimerTest, GivesBackAtALaterLookWhatOthersHeldAtTheFirst) {
  reclaimer.scheduleChecks();
  clock.advance(5.0);
  EXPECT_EQ(given, 0);
  idle = 10 * kSpare;
  clock.advance(5.0);
  EXPECT_EQ(given, 1);
}

TEST_F(AllocatorReclaimerTest, WhoAsksDuringTheLooksGetsAllOfThemOnceMore) {
  reclaimer.scheduleChecks();
  EXPECT_THAT(looksWithin(31), ElementsAre(1, 2, 4, 8, 16));
  reclaimer.scheduleChecks();
  reclaimer.scheduleChecks();
  EXPECT_EQ(timers.count(), 1U);
  EXPECT_THAT(looksWithin(100), ElementsAre(1, 2, 3, 5, 9, 17, 33));
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(AllocatorReclaimerTest, LooksBeginAnewForWhoAsksLater) {
  reclaimer.scheduleChecks();
  clock.advance(1000.0);
  EXPECT_EQ(timers.count(), 0U);
  reclaimer.scheduleChecks();
  EXPECT_THAT(looksWithin(3), ElementsAre(1, 2));
}

TEST_F(AllocatorReclaimerTest, LooksForWhatClientsBringOnceItIsMuchForAllTogether) {
  reclaimer.clientSent(AllocatorReclaimer::kSentBytesThreshold - 1);
  reclaimer.clientEnded();
  EXPECT_EQ(timers.count(), 0U);
  reclaimer.clientSent(1);
  EXPECT_EQ(timers.count(), 1U);
}

// Of what they brought, another's session may hold the most, and end by a request of a few bytes.
TEST_F(AllocatorReclaimerTest, LooksAgainForWhateverClientsDoAfterTheyHaveBroughtMuch) {
  reclaimer.clientSent(AllocatorReclaimer::kSentBytesThreshold);
  clock.advance(1000.0);
  reclaimer.clientSent(1);
  EXPECT_THAT(looksWithin(100), ElementsAre(1, 2, 4, 8, 16, 32));
  reclaimer.clientEnded();
  EXPECT_THAT(looksWithin(100), ElementsAre(1, 2, 4, 8, 16, 32));
}

}  // namespace
}  // namespace tonewerk
