// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineClock.h"

#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::nanoseconds;
using testing::ElementsAre;

class OfflineClockTest : public testing::Test {
 protected:
  std::unique_ptr<Timer> every(milliseconds interval, const std::string& name) {
    return timers_.repeat(interval, [this, name] {
      ticks_.push_back(name + " " + std::to_string(clock_.monotonic() / milliseconds(1)));
    });
  }
  void runUntil(milliseconds time) {
    while (timers_.runNextUntil(time)) {
    }
  }

  OfflineClock clock_{1'763'633'880.25};
  OfflineTimers timers_{clock_};
  OfflineSemaphores semaphores_{clock_, timers_};
  std::vector<std::string> ticks_;
};

TEST_F(OfflineClockTest, StandsStillUntilItIsMoved) {
  EXPECT_EQ(clock_.now(), 1'763'633'880.25);
  clock_.moveTo(milliseconds(1500));
  EXPECT_EQ(clock_.now(), 1'763'633'881.75);
  EXPECT_EQ(clock_.monotonic(), milliseconds(1500));
  EXPECT_EQ(clock_.utcOffset(0.0), std::chrono::minutes(0));
}

TEST_F(OfflineClockTest, NeverGoesBack) {
  clock_.moveTo(milliseconds(2));
  clock_.moveTo(milliseconds(1));
  EXPECT_EQ(clock_.monotonic(), milliseconds(2));
  clock_.sleep(nanoseconds(-5));
  EXPECT_EQ(clock_.monotonic(), milliseconds(2));
}

// The time of a request as its daemon saw it is found again, to the bit.
TEST_F(OfflineClockTest, TellsTheTimesThatARecordingWasMadeOf) {
  for (const double time : {1'763'633'880.250001, 1'763'633'999.123457, 1'764'633'880.7}) {
    const std::chrono::duration<double> place(time - 1'763'633'880.25);
    clock_.moveTo(std::chrono::round<nanoseconds>(place));
    EXPECT_EQ(clock_.now(), time);
  }
}

TEST_F(OfflineClockTest, RunsTicksInTheOrderOfTheirTimes) {
  const auto slow = every(milliseconds(20), "slow");
  const auto fast = every(milliseconds(10), "fast");
  runUntil(milliseconds(25));
  EXPECT_THAT(ticks_, ElementsAre("fast 10", "slow 20", "fast 20"));
  EXPECT_EQ(clock_.monotonic(), milliseconds(25));
}

TEST_F(OfflineClockTest, RunsNoTickOfATimerThatIsGone) {
  auto timer = every(milliseconds(10), "gone");
  std::unique_ptr<Timer> itself;
  itself = timers_.repeat(milliseconds(5), [&] {
    itself.reset();
    timer.reset();
  });
  runUntil(milliseconds(50));
  EXPECT_THAT(ticks_, testing::IsEmpty());
}

TEST_F(OfflineClockTest, RunsTheTicksOfASleep) {
  const auto timer = every(milliseconds(10), "tick");
  clock_.sleep(milliseconds(25));
  EXPECT_THAT(ticks_, ElementsAre("tick 10", "tick 20"));
  EXPECT_EQ(clock_.monotonic(), milliseconds(25));
}

TEST_F(OfflineClockTest, WaitsForASignalUpToTheTimeout) {
  const auto semaphore = semaphores_.makeSemaphore();
  EXPECT_FALSE(semaphore->wait(milliseconds(30)));
  EXPECT_EQ(clock_.monotonic(), milliseconds(30));
  const auto timer = timers_.repeat(milliseconds(10), [&] { semaphore->signal(); });
  EXPECT_TRUE(semaphore->wait(milliseconds(100)));
  EXPECT_EQ(clock_.monotonic(), milliseconds(40));
  semaphore->signal();
  EXPECT_TRUE(semaphore->wait(milliseconds(0)));
}

}  // namespace
}  // namespace tonewerk
