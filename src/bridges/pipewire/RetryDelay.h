// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <chrono>
#include <utility>

namespace tonewerk {

// How long to wait before trying again: doubles with each failure in a row, so that a peer that restarts is
// followed promptly and one that stays away costs little.
class RetryDelay {
 public:
  static constexpr std::chrono::milliseconds kFirst{250};
  static constexpr std::chrono::milliseconds kLongest{4000};

  std::chrono::milliseconds next() { return std::exchange(delay_, std::min(delay_ * 2, kLongest)); }
  void reset() { delay_ = kFirst; }

 private:
  std::chrono::milliseconds delay_ = kFirst;
};

}  // namespace tonewerk
