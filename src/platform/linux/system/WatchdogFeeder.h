// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>

namespace tonewerk {

class Clock;

// Sends pings at an interval from a loop that also waits for other events:
//
//   for (;;) {
//     wait(feeder.timeToNext());
//     feeder.pingIfDue();
//   }
//
// So no pings are sent when the loop hangs. Only the loop's thread may use it.
class WatchdogFeeder {
 public:
  // The first ping is due at once. `clock` must outlive the feeder.
  WatchdogFeeder(std::chrono::milliseconds interval, const Clock& clock, std::function<void()> ping);

  // The time until the next ping is due; 0 if it is due now. Rounded up, so that the ping is due after a wait
  // of this length.
  std::chrono::milliseconds timeToNext() const;

  // Sends one ping if any is due, even if several were missed. The next one is due an interval from now.
  void pingIfDue();

 private:
  const std::chrono::milliseconds interval_;
  const Clock& clock_;
  const std::function<void()> ping_;
  std::chrono::nanoseconds nextAt_;
};

}  // namespace tonewerk
