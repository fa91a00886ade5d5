// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/SystemClock.h"

#include <cmath>
#include <ctime>
#include <thread>

namespace tonewerk {
namespace {

double secondsOf(clockid_t clock) {
  timespec time{};
  clock_gettime(clock, &time);
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

std::chrono::nanoseconds nanosecondsOf(clockid_t clock) {
  timespec time{};
  clock_gettime(clock, &time);
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

}  // namespace

double SystemClock::now() const { return secondsOf(CLOCK_REALTIME); }

std::chrono::nanoseconds SystemClock::monotonic() const { return nanosecondsOf(CLOCK_MONOTONIC); }

// The kernel updates these at each tick of its timer, at least a hundred times a second.
double SystemClock::coarseNow() const { return secondsOf(CLOCK_REALTIME_COARSE); }

std::chrono::nanoseconds SystemClock::coarseMonotonic() const {
  return nanosecondsOf(CLOCK_MONOTONIC_COARSE);
}

std::chrono::minutes SystemClock::utcOffset(double at) const {
  constexpr double kMaxSeconds = 1e15;  // seconds, about thirty million years
  if (!(std::fabs(at) < kMaxSeconds)) return std::chrono::minutes(0);
  const auto seconds = static_cast<std::time_t>(std::floor(at));
  std::tm local{};
  tzset();  // because localtime_r() may not notice a changed time zone
  if (localtime_r(&seconds, &local) == nullptr) return std::chrono::minutes(0);
  return std::chrono::duration_cast<std::chrono::minutes>(std::chrono::seconds(local.tm_gmtoff));
}

void SystemClock::sleep(std::chrono::nanoseconds duration) {
  if (duration.count() > 0) std::this_thread::sleep_for(duration);
}

}  // namespace tonewerk
