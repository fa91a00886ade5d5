// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <thread>

#include "platform/TimerService.h"

namespace tonewerk {

// Runs timers on one thread, which sleeps until the next tick is due. It uses the monotonic clock, which does
// not advance while the device is suspended.
//
// repeat() may be called from any thread, also from inside a tick. Timers may outlive the service and then
// never tick. Do not destroy the service from a tick.
class TimerThread final : public TimerService {
 public:
  TimerThread();
  TimerThread(const TimerThread&) = delete;
  TimerThread& operator=(const TimerThread&) = delete;
  // Waits for a tick that is running.
  ~TimerThread() override;

  // `interval` is at least one millisecond.
  [[nodiscard]] std::unique_ptr<Timer> repeat(std::chrono::milliseconds interval,
                                              std::function<void()> tick) override;

 private:
  struct Schedule;
  class ScheduledTimer;

  std::shared_ptr<Schedule> schedule_;  // shared with the timers
  std::thread thread_;                  // last, because it uses the schedule
};

}  // namespace tonewerk
