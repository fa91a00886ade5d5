// SPDX-License-Identifier: Apache-2.0
#include "platform/accounts/LineAllowance.h"

#include <algorithm>
#include <utility>

#include "platform/Clock.h"

namespace tonewerk {

LineAllowance::LineAllowance(const Clock& clock, Rate rate, LineAllowance* all)
    : clock_(clock), rate_(rate), all_(all), left_(rate.burst), filledAt_(clock.monotonic()) {}

bool LineAllowance::hasLine() {
  if (left_ < 1) {
    const std::chrono::nanoseconds now = clock_.monotonic();
    const double seconds = std::chrono::duration<double>(now - std::exchange(filledAt_, now)).count();
    left_ = std::min<double>(rate_.burst, left_ + seconds * rate_.perSecond);
  }
  return left_ >= 1;
}

std::optional<std::uint64_t> LineAllowance::takeLine() {
  const MutexLock lock(mutex_);
  const bool isMine = hasLine();
  const std::optional<std::uint64_t> others = isMine && all_ != nullptr ? all_->takeLine() : std::nullopt;
  if (!isMine || (all_ != nullptr && !others)) {
    ++heldBack_;
    ++unsaid_;
    return std::nullopt;
  }
  left_ -= 1;
  return std::exchange(unsaid_, 0);
}

std::uint64_t LineAllowance::heldBack() const {
  const MutexLock lock(mutex_);
  return heldBack_;
}

}  // namespace tonewerk
