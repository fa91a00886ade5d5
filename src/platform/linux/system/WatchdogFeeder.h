// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>

namespace tonewerk {

class Clock;

// Pings at an interval, from a loop that waits for other things, too:
//
//   for (;;) {
//     wait(feeder.timeToNext());
//     feeder.pingIfDue();
//   }
//
// so that a loop which hangs is one that pings no more. The loop's thread.
class WatchdogFeeder {
 public:
  // The first ping is due at once. `clock` outlives the feeder.
  WatchdogFeeder(std::chrono::milliseconds interval, const Clock& clock, std::function<void()> ping);

  // Rounded up, so that a loop which waited for so long finds a ping due. 0 when one is.
  std::chrono::milliseconds timeToNext() const;

  // However many were missed, it is one ping, and the next is due an interval from now.
  void pingIfDue();

 private:
  const std::chrono::milliseconds interval_;
  const Clock& clock_;
  const std::function<void()> ping_;
  std::chrono::nanoseconds nextAt_;
};

}  // namespace tonewerk
