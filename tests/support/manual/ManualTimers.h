// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "platform/TimerService.h"
#include "support/manual/ManualClock.h"
#include "values/Mutex.h"

namespace tonewerk {

// Makes timers whose ticks run on the test's own thread, inside ManualClock::advance(), in the order of their
// times.
//
//   ManualClock clock;
//   ManualTimers timers(clock);
//   auto timer = timers.repeat(1s, [&] { ++ticks; });
//   clock.advance(3.0);                      // ticks == 3
//
// A tick may destroy its own timer or any other, and make new ones. Timers may outlive the service; they then
// never tick.
class ManualTimers final : public TimerService, private ManualClock::Alarm {
 public:
  // `clock` outlives the timers.
  explicit ManualTimers(ManualClock& clock) : clock_(clock) { clock_.addAlarm(*this); }
  ManualTimers(const ManualTimers&) = delete;
  ManualTimers& operator=(const ManualTimers&) = delete;
  ~ManualTimers() override { clock_.removeAlarm(*this); }

  [[nodiscard]] std::unique_ptr<Timer> repeat(std::chrono::milliseconds interval,
                                              std::function<void()> tick) override;

  // Returns how many timers exist.
  std::size_t count() const;

 private:
  struct Entry {
    std::chrono::nanoseconds interval;
    std::chrono::nanoseconds due;
    std::function<void()> tick;
  };
  class ManualTimer;

  std::optional<std::chrono::nanoseconds> nextDue() const override;
  void runNext() override;
  std::shared_ptr<Entry> earliest() const REQUIRES(mutex_);

  ManualClock& clock_;
  mutable Mutex mutex_;
  bool isTicking_ GUARDED_BY(mutex_) = false;                     // no tick runs inside another
  std::vector<std::weak_ptr<Entry>> entries_ GUARDED_BY(mutex_);  // a timer owns its entry
};

}  // namespace tonewerk
