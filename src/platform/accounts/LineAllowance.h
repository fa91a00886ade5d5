// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>

#include "values/Mutex.h"

namespace tonewerk {

class Clock;

// Limits how many log lines somebody may cause: a number at once, and then a number each second. Counts those
// that are held back; who writes the lines says so in the log (platform/linux/log/FairLog.h). Any thread.
class LineAllowance {
 public:
  struct Rate {
    std::uint32_t burst;
    std::uint32_t perSecond;
  };

  // Lines count against `all`, too, unless that is null, and so do those that are held back. `clock` and
  // `all` outlive the object.
  LineAllowance(const Clock& clock, Rate rate, LineAllowance* all = nullptr);

  // Asks to write one line. False, and the line is counted, when it is to be held back.
  [[nodiscard]] bool takeLine();

  // How many lines were held back in all.
  std::uint64_t heldBack() const;

 private:
  void refill() REQUIRES(mutex_);
  void countHeldBack();

  const Clock& clock_;
  const Rate rate_;
  LineAllowance* const all_;
  mutable Mutex mutex_;
  double left_ GUARDED_BY(mutex_);
  std::chrono::nanoseconds filledAt_ GUARDED_BY(mutex_);
  std::uint64_t heldBack_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
