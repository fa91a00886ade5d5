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

constexpr std::size_t kSpare = AllocatorReclaimer::kMaxIdleBytes;

class AllocatorReclaimerTest : public ::testing::Test {
 protected:
  // Moves the clock in steps of a second. Returns the seconds in which there was a check.
  std::vector<int> checksWithin(int seconds) {
    std::vector<int> found;
    for (int second = 1; second <= seconds; ++second) {
      const int before = checks;
      clock.advance(1.0);
      if (checks > before) found.push_back(second);
    }
    return found;
  }

  ManualClock clock;
  ManualTimers timers{clock};
  std::size_t idle = 0;
  int checks = 0;
  int returns = 0;
  AllocatorReclaimer reclaimer{timers,
                               {[this] {
                                  ++checks;
                                  return idle;
                                },
                                [this] {
                                  ++returns;
                                  idle = 0;
                                }}};
};

TEST_F(AllocatorReclaimerTest, ReturnsIdleMemoryASecondLater) {
  idle = kSpare + 1;
  reclaimer.scheduleChecks();
  EXPECT_EQ(returns, 0);
  clock.advance(1.0);
  EXPECT_EQ(returns, 1);
}

TEST_F(AllocatorReclaimerTest, LeavesALittleIdleMemoryToTheAllocator) {
  idle = kSpare;
  reclaimer.scheduleChecks();
  clock.advance(100.0);
  EXPECT_GT(checks, 0);
  EXPECT_EQ(returns, 0);
}

TEST_F(AllocatorReclaimerTest, ChecksSeveralTimesAndThenStops) {
  reclaimer.scheduleChecks();
  EXPECT_THAT(checksWithin(100), ElementsAre(1, 2, 4, 8, 16, 32));
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(AllocatorReclaimerTest, ReturnsAtALaterCheckWhatWasInUseAtTheFirst) {
  reclaimer.scheduleChecks();
  clock.advance(5.0);
  EXPECT_EQ(returns, 0);
  idle = 10 * kSpare;
  clock.advance(5.0);
  EXPECT_EQ(returns, 1);
}

TEST_F(AllocatorReclaimerTest, ARequestDuringChecksRepeatsTheWholeSeries) {
  reclaimer.scheduleChecks();
  EXPECT_THAT(checksWithin(31), ElementsAre(1, 2, 4, 8, 16));
  reclaimer.scheduleChecks();
  reclaimer.scheduleChecks();
  EXPECT_EQ(timers.count(), 1U);
  EXPECT_THAT(checksWithin(100), ElementsAre(1, 2, 3, 5, 9, 17, 33));
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(AllocatorReclaimerTest, ChecksStartAgainForALaterRequest) {
  reclaimer.scheduleChecks();
  clock.advance(1000.0);
  EXPECT_EQ(timers.count(), 0U);
  reclaimer.scheduleChecks();
  EXPECT_THAT(checksWithin(3), ElementsAre(1, 2));
}

TEST_F(AllocatorReclaimerTest, ChecksOnceAllClientsTogetherHaveSentEnough) {
  reclaimer.clientSent(AllocatorReclaimer::kSentBytesThreshold - 1);
  reclaimer.clientEnded();
  EXPECT_EQ(timers.count(), 0U);
  reclaimer.clientSent(1);
  EXPECT_EQ(timers.count(), 1U);
}

// Another client's session may hold most of what they sent, and a request of a few bytes may end it.
TEST_F(AllocatorReclaimerTest, ChecksAfterEveryMessageAndEndOnceEnoughWasSent) {
  reclaimer.clientSent(AllocatorReclaimer::kSentBytesThreshold);
  clock.advance(1000.0);
  reclaimer.clientSent(1);
  EXPECT_THAT(checksWithin(100), ElementsAre(1, 2, 4, 8, 16, 32));
  reclaimer.clientEnded();
  EXPECT_THAT(checksWithin(100), ElementsAre(1, 2, 4, 8, 16, 32));
}

}  // namespace
}  // namespace tonewerk
