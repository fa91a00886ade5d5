// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <chrono>
#include <utility>

namespace tonewerk {

// Computes how long to wait before the next attempt. The first delay is `first`; after each failure in a row
// it is `factor` times the one before, up to `limit`. A caller so reconnects soon to a peer that restarts,
// and spends little on one that stays away. It adds no randomness: a caller that needs some, so that many
// peers do not return at the same time, adds it to what next() returns.
class GrowingDelay {
 public:
  using Duration = std::chrono::nanoseconds;

  constexpr GrowingDelay(Duration first, Duration limit, double factor = 2.0)
      : first_(first), limit_(limit), factor_(factor) {}

  constexpr Duration next() { return std::exchange(next_, std::min(grown(), limit_)); }
  // Call after a successful attempt: the next delay is the first one again.
  constexpr void reset() { next_ = first_; }

 private:
  constexpr Duration grown() const { return std::chrono::duration_cast<Duration>(next_ * factor_); }

  Duration first_;
  Duration limit_;
  double factor_;
  Duration next_ = first_;
};

}  // namespace tonewerk
