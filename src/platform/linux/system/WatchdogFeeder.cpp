// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/WatchdogFeeder.h"

#include <algorithm>
#include <utility>

#include "platform/Clock.h"

namespace tonewerk {

WatchdogFeeder::WatchdogFeeder(std::chrono::milliseconds interval, const Clock& clock,
                               std::function<void()> ping)
    : interval_(interval), clock_(clock), ping_(std::move(ping)), nextAt_(clock.monotonic()) {}

std::chrono::milliseconds WatchdogFeeder::timeToNext() const {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(nextAt_ - clock_.monotonic());
  return std::max(left, std::chrono::milliseconds::zero());
}

void WatchdogFeeder::pingIfDue() {
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (now < nextAt_) return;
  nextAt_ = now + interval_;
  ping_();
}

}  // namespace tonewerk
