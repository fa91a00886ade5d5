// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <vector>

#include "platform/Clock.h"
#include "values/Mutex.h"

namespace tonewerk {

// A clock that stands still until a test moves it.
//
//   ManualClock clock;
//   clock.advance(2.5);                      // both times, running the timers that become due on the way
//   clock.setNow(1'000'000'000.0);           // the wall clock jumps, monotonic time does not
//
// Any thread may read it; one thread moves it.
class ManualClock final : public Clock {
 public:
  static constexpr double kStart = 1'763'633'880.0;  // 2025-11-20T10:18:00Z

  // Something that runs when monotonic time reaches a moment, such as ManualTimers.
  class Alarm {
   public:
    virtual ~Alarm() = default;
    // Returns none when nothing waits.
    virtual std::optional<std::chrono::nanoseconds> nextDue() const = 0;
    // Runs one thing that is due. Called while the clock is at nextDue().
    virtual void runNext() = 0;
  };

  explicit ManualClock(double now = kStart) : wallAtZero_(now) {}

  double now() const override;
  std::chrono::nanoseconds monotonic() const override;
  std::chrono::minutes utcOffset(double at) const override;
  // Moves both times forward like advance(): a caller that sleeps on this clock moves it.
  void sleep(std::chrono::nanoseconds duration) override;

  // Moves both times forward. Everything that becomes due runs in order, each at its own time.
  void advance(std::chrono::nanoseconds duration);
  void advance(double seconds);
  // Like advance(duration), but stops when `isDone` returns true. It asks `isDone` at the beginning and after
  // everything that ran. Returns true when `isDone` did.
  [[nodiscard]] bool advanceUntil(std::chrono::nanoseconds duration, const std::function<bool()>& isDone);
  void setNow(double seconds);
  void setUtcOffset(std::chrono::minutes offset);

  // Returns how often now() was called.
  std::uint64_t wallReads() const;

  // `alarm` must be removed before it is destroyed.
  void addAlarm(Alarm& alarm);
  void removeAlarm(Alarm& alarm);

 private:
  Alarm* earliestUntil(std::chrono::nanoseconds end) const;
  void moveTo(std::chrono::nanoseconds monotonic);

  mutable Mutex mutex_;
  mutable std::uint64_t wallReads_ GUARDED_BY(mutex_) = 0;
  double wallAtZero_ GUARDED_BY(mutex_);  // wall-clock time when monotonic time was 0
  std::chrono::nanoseconds monotonic_ GUARDED_BY(mutex_){0};
  std::chrono::minutes utcOffset_ GUARDED_BY(mutex_){0};
  std::vector<Alarm*> alarms_;
};

}  // namespace tonewerk
