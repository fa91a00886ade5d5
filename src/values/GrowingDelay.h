// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <chrono>
#include <utility>

namespace tonewerk {

// How long to wait before the next attempt: the first delay, then with each failure in a row `factor` times
// as long as before, up to the limit. So a peer that restarts is followed promptly, and one that stays away
// costs little. Who needs chance in it, so that many do not all come back at once, adds it to what next()
// gives.
class GrowingDelay {
 public:
  using Duration = std::chrono::nanoseconds;

  constexpr GrowingDelay(Duration first, Duration limit, double factor = 2.0)
      : first_(first), limit_(limit), factor_(factor) {}

  constexpr Duration next() { return std::exchange(next_, std::min(grown(), limit_)); }
  // An attempt was good: the next delay is the first again.
  constexpr void reset() { next_ = first_; }

 private:
  constexpr Duration grown() const { return std::chrono::duration_cast<Duration>(next_ * factor_); }

  Duration first_;
  Duration limit_;
  double factor_;
  Duration next_ = first_;
};

}  // namespace tonewerk
