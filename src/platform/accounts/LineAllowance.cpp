// SPDX-License-Identifier: Apache-2.0
#include "platform/accounts/LineAllowance.h"

#include <algorithm>
#include <utility>

#include "platform/Clock.h"

namespace tonewerk {

LineAllowance::LineAllowance(const Clock& clock, Rate rate, LineAllowance* all)
    : clock_(clock), rate_(rate), all_(all), left_(rate.burst), filledAt_(clock.coarseMonotonic()) {}

void LineAllowance::refill() {
  const std::chrono::nanoseconds now = clock_.coarseMonotonic();
  if (now <= filledAt_) return;
  const double seconds = std::chrono::duration<double>(now - std::exchange(filledAt_, now)).count();
  left_ = std::min<double>(rate_.burst, left_ + seconds * rate_.perSecond);
}

bool LineAllowance::takeLine() {
  const MutexLock lock(mutex_);
  refill();
  if (left_ >= 1 && (all_ == nullptr || all_->takeLine())) {
    left_ -= 1;
    return true;
  }
  if (left_ < 1 && all_ != nullptr) all_->countHeldBack();
  ++heldBack_;
  return false;
}

void LineAllowance::countHeldBack() {
  const MutexLock lock(mutex_);
  ++heldBack_;
}

std::uint64_t LineAllowance::heldBack() const {
  const MutexLock lock(mutex_);
  return heldBack_;
}

}  // namespace tonewerk
