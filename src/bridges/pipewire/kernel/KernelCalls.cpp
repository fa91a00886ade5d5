// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/KernelCalls.h"

#include <sched.h>
#include <time.h>

namespace tonewerk {
namespace {

std::chrono::nanoseconds timeOf(clockid_t clock) {
  timespec time{};
  ::clock_gettime(clock, &time);
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

}  // namespace

ClockTimes LinuxKernelCalls::clocks() const {
  return {timeOf(CLOCK_MONOTONIC), timeOf(CLOCK_BOOTTIME), timeOf(CLOCK_REALTIME)};
}

int LinuxKernelCalls::policyOf(std::int32_t tid) const {
  const int policy = ::sched_getscheduler(tid);
  return policy < 0 ? -1 : policy & ~SCHED_RESET_ON_FORK;
}

}  // namespace tonewerk
