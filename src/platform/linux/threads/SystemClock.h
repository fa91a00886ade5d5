// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Clock.h"

namespace tonewerk {

// Reads the kernel's clocks and the device's time zone (TZ, /etc/localtime). A change of the time zone takes
// effect at once.
class SystemClock final : public Clock {
 public:
  double now() const override;
  std::chrono::nanoseconds monotonic() const override;
  double coarseNow() const override;
  std::chrono::nanoseconds coarseMonotonic() const override;
  // 0 for a time outside the range of the calendar functions.
  std::chrono::minutes utcOffset(double at) const override;
  void sleep(std::chrono::nanoseconds duration) override;
};

}  // namespace tonewerk
