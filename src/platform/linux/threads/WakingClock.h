// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/linux/threads/SystemClock.h"

namespace tonewerk {

// Like SystemClock, but its monotonic time goes on while the device sleeps.
class WakingClock final : public Clock {
 public:
  double now() const override { return clock_.now(); }
  std::chrono::nanoseconds monotonic() const override;
  std::chrono::minutes utcOffset(double at) const override { return clock_.utcOffset(at); }
  void sleep(std::chrono::nanoseconds duration) override { clock_.sleep(duration); }

 private:
  SystemClock clock_;
};

}  // namespace tonewerk
