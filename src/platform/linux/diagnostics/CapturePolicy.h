// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "platform/FaultsignReporter.h"

namespace tonewerk {

class Clock;

// Decides which captures the service makes. A capture needs a complete signature, and there are limits to the
// captures per day and to the rate of captures with the same signature. One thread at a time.
class CapturePolicy {
 public:
  // The number of captures accepted in one day of UTC, including those that were cancelled later.
  static constexpr std::int64_t kMaxPerDay = 20;
  // Between the acceptances of two captures with the same signature. Cancelled captures do not count.
  static constexpr std::chrono::seconds kMinimumInterval{60};
  // The longest duration of a session in seconds.
  static constexpr double kLongestDuration = 86'400.0;

  // The count that is kept when the process ends.
  struct Count {
    std::int64_t day = 0;  // since 1970, in UTC
    std::int64_t accepted = 0;
    friend bool operator==(const Count&, const Count&) = default;
  };

  // The present day by the wall clock, counted from 1970 in UTC.
  static std::int64_t dayOf(const Clock& clock);

  // `clock` must outlive this object; `count` is the one that an earlier process kept.
  CapturePolicy(const Clock& clock, Count count) : clock_(clock), count_(count) {}

  // kFaultsignErrorNone if the capture may be made, otherwise the reason:
  //   InvalidParameters    the duration is negative, too long or NaN; domain, type or subtype is empty
  //   DailyLimitExceeded   by the wall clock: every other day starts at 0, even if the clock went back to it
  //   RequestThrottled     by the monotonic clock
  [[nodiscard]] FaultsignError judge(const FaultsignSignature& signature, double duration);

  // The time of an acceptance by the monotonic clock.
  using Acceptance = std::chrono::nanoseconds;

  // Counts a capture for which judge() has returned kFaultsignErrorNone.
  Acceptance accept(const FaultsignSignature& signature);
  // Withdraws the acceptance of a capture that will not be made. The next one with its signature does not
  // have to wait. The count of the day stays.
  void withdraw(const FaultsignSignature& signature, Acceptance acceptance);

  const Count& count() const { return count_; }

 private:
  static bool isValid(const FaultsignSignature& signature, double duration);
  static std::string keyOf(const FaultsignSignature& signature);
  void beginDay();
  void forgetOld();

  const Clock& clock_;
  Count count_;
  std::map<std::string, Acceptance> accepted_;  // by signature, in the last kMinimumInterval only
};

}  // namespace tonewerk
