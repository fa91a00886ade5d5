// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <random>

#include "values/GrowingDelay.h"

namespace tonewerk {

// Yields delays that grow, each changed at random by up to a quarter, so that clients that lost the same
// daemon do not all reconnect at once.
class Backoff {
 public:
  Backoff(std::chrono::milliseconds first, std::chrono::milliseconds max, std::uint32_t seed)
      : first_(first), max_(max), delay_(first, max), random_(seed) {}

  // The next delay: at least the first one, at most the longest.
  std::chrono::milliseconds next();
  // Makes the next delay the first one again. For after a good connection.
  void reset() { delay_.reset(); }

 private:
  std::chrono::milliseconds first_;
  std::chrono::milliseconds max_;
  GrowingDelay delay_;
  std::minstd_rand random_;
};

}  // namespace tonewerk
