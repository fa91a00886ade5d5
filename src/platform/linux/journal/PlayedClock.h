// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Clock.h"

namespace tonewerk {

// A clock that a thread can set: while the journal is played, the playing thread has the time at which each
// request came. All other threads have the system's time.
class PlayedClock final : public Clock {
 public:
  // `clock` outlives the object.
  explicit PlayedClock(Clock& clock) : clock_(clock) {}

  // Sets the calling thread's time as long as the object lives.
  class Time {
   public:
    Time();
    Time(const Time&) = delete;
    Time& operator=(const Time&) = delete;
    ~Time();

    // In seconds since 1970. The monotonic time advances by what the time advances, by a century in all, and
    // never goes back.
    void set(double at);

   private:
    friend class PlayedClock;
    double now_ = 0.0;
    std::chrono::nanoseconds monotonic_{0};
  };

  double now() const override;
  std::chrono::nanoseconds monotonic() const override;
  double coarseNow() const override;
  std::chrono::nanoseconds coarseMonotonic() const override;
  std::chrono::minutes utcOffset(double at) const override { return clock_.utcOffset(at); }
  void sleep(std::chrono::nanoseconds duration) override { clock_.sleep(duration); }

 private:
  Clock& clock_;
};

}  // namespace tonewerk
