// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <random>

#include "values/GrowingDelay.h"

namespace tonewerk {

// A growing delay, and up to a quarter more or less than that, so that clients that lost one daemon do not
// all come back at once.
class Backoff {
 public:
  Backoff(std::chrono::milliseconds first, std::chrono::milliseconds most, std::uint32_t seed)
      : first_(first), most_(most), delay_(first, most), random_(seed) {}

  // At least the first delay, at most the longest.
  std::chrono::milliseconds next();
  // What was connected to was good: the next delay is the first again.
  void reset() { delay_.reset(); }

 private:
  std::chrono::milliseconds first_;
  std::chrono::milliseconds most_;
  GrowingDelay delay_;
  std::minstd_rand random_;
};

}  // namespace tonewerk
