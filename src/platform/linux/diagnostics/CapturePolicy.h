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

// Which captures the service makes: those that say what they are about, so many a day and not too often the
// same. One thread at a time.
class CapturePolicy {
 public:
  // Accepted in one day of UTC, captures that were cancelled later included.
  static constexpr std::int64_t kMaxADay = 20;
  // Between two of one signature, from acceptance to acceptance. One that was cancelled puts nothing off.
  static constexpr std::chrono::seconds kMinimumInterval{60};
  // Of a session, seconds.
  static constexpr double kLongestDuration = 86'400.0;

  // What is to outlive the process.
  struct Count {
    std::int64_t day = 0;  // since 1970, in UTC
    std::int64_t accepted = 0;
    friend bool operator==(const Count&, const Count&) = default;
  };

  // The day it is by the wall clock.
  static std::int64_t dayOf(const Clock& clock);

  // `clock` outlives this; `count` is an earlier process's.
  CapturePolicy(const Clock& clock, Count count) : clock_(clock), count_(count) {}

  // kFaultsignErrorNone for one that may be made; why not otherwise:
  //   InvalidParameters    the duration is negative, too long or NaN; domain, type or subtype is empty
  //   DailyLimitExceeded   by the wall clock: another day begins anew, also one that a clock went back to
  //   RequestThrottled     by the monotonic clock
  [[nodiscard]] FaultsignError judge(const FaultsignSignature& signature, double duration);

  // When it was, by the monotonic clock.
  using Acceptance = std::chrono::nanoseconds;

  // One that was judged so is being made.
  Acceptance accept(const FaultsignSignature& signature);
  // It is not made after all: the next of its signature does not have to wait for it. The day's number stays.
  void withdraw(const FaultsignSignature& signature, Acceptance acceptance);

  const Count& count() const { return count_; }

 private:
  static bool isValid(const FaultsignSignature& signature, double duration);
  static std::string keyOf(const FaultsignSignature& signature);
  void beginDay();
  void forgetOld();

  const Clock& clock_;
  Count count_;
  std::map<std::string, Acceptance> accepted_;  // within the last interval only
};

}  // namespace tonewerk
