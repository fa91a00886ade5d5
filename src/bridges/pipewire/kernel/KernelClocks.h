// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>

namespace tonewerk {

// The times of the kernel's clocks at one moment.
struct ClockTimes {
  std::chrono::nanoseconds monotonic{0};  // stands still while the system is suspended
  std::chrono::nanoseconds boot{0};       // does not
  std::chrono::nanoseconds wall{0};       // since 1970; can jump
};

// Reads the clocks from whose differences a suspended system and a set clock can be told.
class KernelClocks {
 public:
  virtual ~KernelClocks() = default;
  virtual ClockTimes now() const = 0;
};

class LinuxClocks final : public KernelClocks {
 public:
  ClockTimes now() const override;
};

}  // namespace tonewerk
