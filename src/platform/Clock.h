// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>

namespace tonewerk {

// What time it is, and letting it pass. Any thread.
class Clock {
 public:
  virtual ~Clock() = default;

  // Wall-clock time: seconds since 1970-01-01 00:00 UTC. Can jump, in both directions.
  virtual double now() const = 0;

  // Time since some fixed point; never goes back.
  virtual std::chrono::nanoseconds monotonic() const = 0;

  // What the device's time zone adds to UTC at the given wall-clock time.
  virtual std::chrono::minutes utcOffset(double at) const = 0;

  // Blocks the calling thread until so much monotonic time has passed; not at all for 0 or less.
  virtual void sleep(std::chrono::nanoseconds duration) = 0;
};

}  // namespace tonewerk
