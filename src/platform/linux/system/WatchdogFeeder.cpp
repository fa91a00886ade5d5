// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/WatchdogFeeder.h"

#include <algorithm>
#include <utility>

#include "platform/Clock.h"
#include "platform/linux/system/Heartbeats.h"

namespace tonewerk {

WatchdogFeeder::WatchdogFeeder(std::chrono::milliseconds interval, const Clock& clock,
                               std::function<void()> ping, Heartbeats* heartbeats)
    : interval_(interval),
      clock_(clock),
      ping_(std::move(ping)),
      heartbeats_(heartbeats),
      nextAt_(clock.monotonic()) {}

std::chrono::milliseconds WatchdogFeeder::timeToNext() const {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(nextAt_ - clock_.monotonic());
  return std::max(left, std::chrono::milliseconds::zero());
}

void WatchdogFeeder::pingIfDue() {
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (now < nextAt_) return;
  if (heartbeats_ != nullptr && !heartbeats_->areAlive(now, interval_)) {
    nextAt_ = now + std::chrono::nanoseconds(interval_) / kTriesPerInterval;
    return;
  }
  nextAt_ = now + interval_;
  ping_();
}

}  // namespace tonewerk
