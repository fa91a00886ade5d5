// SPDX-License-Identifier: Apache-2.0
#include <chrono>
#include <gtest/gtest.h>
#include <memory>
#include <thread>
#include <vector>

#include "platform/linux/threads/TimerThread.h"
#include "support/manual/ManualTimers.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

// Time passes by itself.
struct RealTime {
  static constexpr bool kIsMovedByTheTest = false;
  TimerThread timers;
};

// Time passes only when the test waits.
struct ManualTime {
  static constexpr bool kIsMovedByTheTest = true;
  ManualClock clock;
  ManualTimers timers{clock};
};

// Tests that every timer service must pass.
template <typename Time>
class TimerServiceContract : public testing::Test {
 protected:
  TimerService& timers() { return time_.timers; }

  // Called from ticks. Runs `change` with the mutex held, then wakes the test.
  template <typename Change>
  void change(Change change) {
    {
      const MutexLock lock(mutex_);
      change();
    }
    changed_.notifyAll();
  }

  // Waits until `isTrue` returns true. Calls it with the mutex held.
  template <typename Predicate>
  void waitUntil(Predicate isTrue) {
    MutexLock lock(mutex_);
    while (!isTrue()) {
      if constexpr (Time::kIsMovedByTheTest) {
        lock.unlock();
        time_.clock.advance(milliseconds(1));
        lock.lock();
      } else {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
        static_cast<void>(changed_.waitUntil(lock, deadline));  // the loop checks the condition
      }
    }
  }

  Mutex mutex_;
  Condition changed_;
  Time time_;  // last, because its ticks use the members above
};

using Times = testing::Types<RealTime, ManualTime>;
TYPED_TEST_SUITE(TimerServiceContract, Times);

TYPED_TEST(TimerServiceContract, RepeatsATick) {
  int ticks = 0;
  const auto timer = this->timers().repeat(milliseconds(1), [&] { this->change([&] { ++ticks; }); });
  this->waitUntil([&] { return ticks >= 3; });
  EXPECT_GE(ticks, 3);
}

TYPED_TEST(TimerServiceContract, TheShorterIntervalTicksMoreOften) {
  int fast = 0;
  int slow = 0;
  int fastAtFirstSlow = 0;
  const auto slowTimer = this->timers().repeat(milliseconds(40), [&] {
    this->change([&] {
      if (slow++ == 0) fastAtFirstSlow = fast;
    });
  });
  const auto fastTimer = this->timers().repeat(milliseconds(2), [&] { this->change([&] { ++fast; }); });
  this->waitUntil([&] { return slow >= 1; });
  EXPECT_GE(fastAtFirstSlow, 1);
}

TYPED_TEST(TimerServiceContract, ATimerMayBeDestroyedInsideItsOwnTick) {
  int ticks = 0;
  int others = 0;
  std::unique_ptr<Timer> timer;
  const auto witness = this->timers().repeat(milliseconds(1), [&] { this->change([&] { ++others; }); });
  this->change([&] {
    timer = this->timers().repeat(milliseconds(1), [&] {
      this->change([&] {
        ++ticks;
        timer.reset();
      });
    });
  });
  this->waitUntil([&] { return ticks >= 1; });
  const int before = others;
  this->waitUntil([&] { return others >= before + 5; });
  EXPECT_EQ(ticks, 1);
}

TYPED_TEST(TimerServiceContract, NoTickBeginsAfterATimerWasDestroyed) {
  int ticks = 0;
  int others = 0;
  auto timer = this->timers().repeat(milliseconds(1), [&] { this->change([&] { ++ticks; }); });
  const auto witness = this->timers().repeat(milliseconds(1), [&] { this->change([&] { ++others; }); });
  this->waitUntil([&] { return ticks >= 1; });
  timer.reset();
  const int before = others;
  this->waitUntil([&] { return others >= before + 1; });  // a tick that was running has ended
  const int ended = ticks;
  this->waitUntil([&] { return others >= before + 6; });
  EXPECT_EQ(ticks, ended);
}

TYPED_TEST(TimerServiceContract, ATickMayMakeAnotherTimer) {
  int ticks = 0;
  std::unique_ptr<Timer> second;
  const auto first = this->timers().repeat(milliseconds(1), [&] {
    if (second != nullptr) return;
    second = this->timers().repeat(milliseconds(1), [&] { this->change([&] { ++ticks; }); });
  });
  this->waitUntil([&] { return ticks >= 2; });
  EXPECT_GE(ticks, 2);
}

TYPED_TEST(TimerServiceContract, AllTicksRunOnOneThread) {
  std::vector<std::thread::id> threads;
  const auto tick = [&] { this->change([&] { threads.push_back(std::this_thread::get_id()); }); };
  const auto first = this->timers().repeat(milliseconds(1), tick);
  const auto second = this->timers().repeat(milliseconds(1), tick);
  this->waitUntil([&] { return threads.size() >= 6; });
  const MutexLock lock(this->mutex_);
  for (const std::thread::id thread : threads) EXPECT_EQ(thread, threads.front());
}

TEST(TimerThreadTest, ATimerThatOutlivesItsServiceDoesNotTick) {
  auto service = std::make_unique<TimerThread>();
  const auto timer = service->repeat(std::chrono::hours(1), [] { FAIL(); });
  service.reset();
}

TEST(ManualTimersTest, TicksRunInTheOrderOfTheirTimes) {
  ManualClock clock;
  ManualTimers timers(clock);
  std::vector<std::pair<char, int>> ticks;
  const auto record = [&](char which) {
    return [&, which] { ticks.emplace_back(which, static_cast<int>(clock.monotonic() / milliseconds(1))); };
  };
  const auto a = timers.repeat(milliseconds(20), record('a'));
  const auto b = timers.repeat(milliseconds(30), record('b'));
  clock.advance(0.06);
  const std::vector<std::pair<char, int>> expected = {{'a', 20}, {'b', 30}, {'a', 40}, {'a', 60}, {'b', 60}};
  EXPECT_EQ(ticks, expected);
  EXPECT_EQ(timers.count(), 2U);
}

TEST(ManualTimersTest, MissedTicksAreDropped) {
  ManualClock clock;
  ManualTimers timers(clock);
  int ticks = 0;
  const auto timer = timers.repeat(milliseconds(10), [&] {
    if (++ticks == 1) clock.advance(milliseconds(25));  // a long tick
  });
  clock.advance(milliseconds(40));  // at 10, late at 35, at 40
  EXPECT_EQ(ticks, 3);
}

}  // namespace
}  // namespace tonewerk
