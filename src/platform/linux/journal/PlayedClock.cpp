// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/PlayedClock.h"

#include <cassert>

namespace tonewerk {
namespace {

thread_local const PlayedClock::Time* played = nullptr;

// A century. Above it the monotonic time stands still: a wall clock that jumps ahead again and again must not
// bring it to its end, nor what is added to it.
constexpr std::chrono::nanoseconds kLongestPlay = std::chrono::hours(24 * 36'525);

}  // namespace

PlayedClock::Time::Time() {
  assert(played == nullptr);
  played = this;
}

PlayedClock::Time::~Time() { played = nullptr; }

void PlayedClock::Time::set(double at) {
  const std::chrono::duration<double> advanced(at - now_);
  if (now_ != 0.0 && advanced.count() > 0.0) {
    const std::chrono::nanoseconds most = kLongestPlay - monotonic_;
    monotonic_ += advanced < most ? std::chrono::duration_cast<std::chrono::nanoseconds>(advanced) : most;
  }
  now_ = at;
}

double PlayedClock::now() const { return played == nullptr ? clock_.now() : played->now_; }

std::chrono::nanoseconds PlayedClock::monotonic() const {
  return played == nullptr ? clock_.monotonic() : played->monotonic_;
}

double PlayedClock::coarseNow() const { return played == nullptr ? clock_.coarseNow() : played->now_; }

std::chrono::nanoseconds PlayedClock::coarseMonotonic() const {
  return played == nullptr ? clock_.coarseMonotonic() : played->monotonic_;
}

}  // namespace tonewerk
