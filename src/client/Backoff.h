// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <random>

namespace tonewerk {

// How long to wait before the next attempt: twice as long as before the last one, up to a bound, and up to a
// quarter more or less than that, so that clients that lost one daemon do not all come back at once.
class Backoff {
 public:
  Backoff(std::chrono::milliseconds first, std::chrono::milliseconds most, std::uint32_t seed)
      : first_(first), most_(most), next_(first), random_(seed) {}

  // At least the first delay, at most the longest.
  std::chrono::milliseconds next();
  // What was connected to was good: the next delay is the first again.
  void reset() { next_ = first_; }

 private:
  std::chrono::milliseconds first_;
  std::chrono::milliseconds most_;
  std::chrono::milliseconds next_;
  std::minstd_rand random_;
};

}  // namespace tonewerk
