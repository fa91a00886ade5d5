// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include "platform/linux/log/LogLayer.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;

// Passes lines on to another log, but of those that a thread writes while it works for a user
// (platform/accounts/WorkingFor.h) only as many as the allowance there gives. The others are held back, and
// counted by user:
//
//   too many log lines of user 1000: holding back       when it begins
//   log lines of user 1000 held back: 4711              once a second while it lasts, when any line comes
//                                                       afterwards, and at the end
//
// So no client can fill the log or drive out the lines of others. Text that the daemon has collected itself
// (platform/LogLines.h) counts as no line: whoever collects it limits it.
class FairLog final : public LogLayer {
 public:
  static constexpr std::chrono::seconds kCountPeriod{1};

  // `clock` outlives the log.
  FairLog(std::unique_ptr<Log> log, const Clock& clock);
  FairLog(const FairLog&) = delete;
  FairLog& operator=(const FairLog&) = delete;
  ~FairLog() override;

  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

 private:
  // What was held back of one user.
  struct Held {
    std::uint64_t unsaid = 0;
    std::chrono::nanoseconds since{};   // when the first unsaid line was held back
    std::chrono::nanoseconds lastAt{};  // when the last line was held back
  };

  void holdBack(std::uint32_t user);
  // Writes the counts of users whose last count is a period ago.
  void sayDueCounts();
  void sayCount(std::uint32_t user, Held& held) REQUIRES(mutex_);
  void say(const std::string& message) REQUIRES(mutex_);

  const Clock& clock_;
  std::atomic<bool> hasUnsaid_ = false;  // so that other lines take no lock
  Mutex mutex_;                          // held while counts are written, never while other lines are
  // There are as many users as accounts (Accounts::kMaxAccounts).
  std::map<std::uint32_t, Held> held_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
