// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>

namespace tonewerk {

// What time it is. Any thread.
class Clock {
 public:
  virtual ~Clock() = default;

  // Wall-clock time: seconds since 1970-01-01 00:00 UTC. Can jump, in both directions.
  virtual double now() const = 0;

  // Time since some fixed point; never goes back.
  virtual std::chrono::nanoseconds monotonic() const = 0;

  // What the device's time zone adds to UTC at the given wall-clock time.
  virtual std::chrono::minutes utcOffset(double at) const = 0;
};

}  // namespace tonewerk
