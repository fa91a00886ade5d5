// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>

namespace tonewerk {

class Clock;
class Heartbeats;

// Sends pings at an interval from a loop that also waits for other events:
//
//   for (;;) {
//     wait(feeder.timeToNext());
//     feeder.pingIfDue();
//   }
//
// So no pings are sent when the loop hangs, nor while one of the heartbeats is not alive. Only the loop's
// thread may use it.
class WatchdogFeeder {
 public:
  // A ping that was not sent is due again after this part of the interval, so that threads which move again
  // in time still save the process.
  static constexpr int kTriesPerInterval = 8;

  // The first ping is due at once. `clock` and `heartbeats`, which may be null, must outlive the feeder. The
  // heartbeats' limit is the interval.
  WatchdogFeeder(std::chrono::milliseconds interval, const Clock& clock, std::function<void()> ping,
                 Heartbeats* heartbeats = nullptr);

  // The time until the next ping is due; 0 if it is due now. Rounded up, so that the ping is due after a wait
  // of this length.
  std::chrono::milliseconds timeToNext() const;

  // Sends one ping if any is due, even if several were missed. The next one is due an interval from now.
  void pingIfDue();

 private:
  const std::chrono::milliseconds interval_;
  const Clock& clock_;
  const std::function<void()> ping_;
  Heartbeats* const heartbeats_;
  std::chrono::nanoseconds nextAt_;
};

}  // namespace tonewerk
