// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Clock.h"

namespace tonewerk {

// The kernel's clocks and the device's time zone (TZ, /etc/localtime), changes of which show at once.
class SystemClock final : public Clock {
 public:
  double now() const override;
  std::chrono::nanoseconds monotonic() const override;
  // 0 for a time that no calendar reaches.
  std::chrono::minutes utcOffset(double at) const override;
  void sleep(std::chrono::nanoseconds duration) override;
};

}  // namespace tonewerk
