// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>

namespace tonewerk {

// The times of the kernel's clocks at one moment.
struct ClockTimes {
  std::chrono::nanoseconds monotonic{0};  // stands still while the system is suspended
  std::chrono::nanoseconds boot{0};       // does not
  std::chrono::nanoseconds wall{0};       // since 1970; can jump
};

// What the sampler asks the kernel without a file.
class KernelCalls {
 public:
  virtual ~KernelCalls() = default;
  virtual ClockTimes clocks() const = 0;
  // SCHED_OTHER and so on; -1 for a thread that does not exist. Much cheaper than the thread's files.
  virtual int policyOf(std::int32_t tid) const = 0;
};

class LinuxKernelCalls final : public KernelCalls {
 public:
  ClockTimes clocks() const override;
  int policyOf(std::int32_t tid) const override;
};

}  // namespace tonewerk
