// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <list>
#include <memory>
#include <optional>

#include "platform/Clock.h"
#include "platform/Semaphore.h"
#include "platform/TimerService.h"

namespace tonewerk {

// The clock of a recording: it stands still until the replay moves it. The time zone is UTC. Any thread may
// read it; one thread moves it.
class OfflineClock final : public Clock {
 public:
  // `startsAt`: the wall-clock time at the beginning, in seconds since 1970.
  explicit OfflineClock(double startsAt) : startsAt_(startsAt) {}

  double now() const override;
  std::chrono::nanoseconds monotonic() const override { return std::chrono::nanoseconds(monotonic_.load()); }
  std::chrono::minutes utcOffset(double /*at*/) const override { return std::chrono::minutes(0); }
  // Moves the clock, and runs the ticks that become due meanwhile.
  void sleep(std::chrono::nanoseconds duration) override;

  // Moves the clock to that time after the beginning; never back.
  void moveTo(std::chrono::nanoseconds time);

 private:
  friend class OfflineTimers;

  const double startsAt_;
  std::atomic<std::int64_t> monotonic_ = 0;
  class OfflineTimers* timers_ = nullptr;
};

// Timers that follow the clock of a recording. The ticks run on the thread that moves the clock, in the order
// of their times; those of one time in the order in which the timers were made. One thread.
class OfflineTimers final : public TimerService {
 public:
  // `clock` outlives the timers, and has no others.
  explicit OfflineTimers(OfflineClock& clock);
  OfflineTimers(const OfflineTimers&) = delete;
  OfflineTimers& operator=(const OfflineTimers&) = delete;
  ~OfflineTimers() override;

  [[nodiscard]] std::unique_ptr<Timer> repeat(std::chrono::milliseconds interval,
                                              std::function<void()> tick) override;

  // Moves the clock to the next tick that is due until `time`, and runs it. False when there is none; the
  // clock is then at `time`.
  [[nodiscard]] bool runNextUntil(std::chrono::nanoseconds time);

 private:
  struct Entry;
  class OfflineTimer;

  OfflineClock& clock_;
  std::list<std::weak_ptr<Entry>> entries_;  // in the order in which they were made; a timer owns its entry
};

// Semaphores of a replay. A wait runs the ticks that become due, which may signal, until the timeout.
class OfflineSemaphores final : public SemaphoreFactory {
 public:
  // Both outlive the semaphores.
  OfflineSemaphores(OfflineClock& clock, OfflineTimers& timers) : clock_(clock), timers_(timers) {}

  [[nodiscard]] std::unique_ptr<Semaphore> makeSemaphore() override;

 private:
  OfflineClock& clock_;
  OfflineTimers& timers_;
};

}  // namespace tonewerk
