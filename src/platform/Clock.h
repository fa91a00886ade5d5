// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>

namespace tonewerk {

// Tells the time, and waits. Any thread.
class Clock {
 public:
  virtual ~Clock() = default;

  // Returns the wall-clock time in seconds since 1970-01-01 00:00 UTC. It can jump, in both directions.
  virtual double now() const = 0;

  // Returns the time since some fixed point. It never goes back.
  virtual std::chrono::nanoseconds monotonic() const = 0;

  // The same, about 10 ms late at most, and several times cheaper. For checks that every message needs.
  virtual double coarseNow() const { return now(); }
  virtual std::chrono::nanoseconds coarseMonotonic() const { return monotonic(); }

  // Returns the offset of the device's time zone from UTC at the given wall-clock time.
  virtual std::chrono::minutes utcOffset(double at) const = 0;

  // Blocks the calling thread until that much monotonic time has passed. Returns at once for 0 or less.
  virtual void sleep(std::chrono::nanoseconds duration) = 0;
};

}  // namespace tonewerk
