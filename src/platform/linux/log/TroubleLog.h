// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <list>
#include <memory>
#include <string_view>
#include <vector>

#include "platform/DaemonStatus.h"
#include "platform/linux/log/LogLayer.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;

// Keeps the newest different error lines, for people who ask how the daemon stands. Any thread.
class RecentTroubles {
 public:
  static constexpr std::size_t kMaxLines = 20;
  static constexpr std::size_t kMaxTextBytes = 500;  // longer texts are cut

  void add(LoggedTrouble line);

  // Newest first.
  std::vector<LoggedTrouble> all() const;

 private:
  mutable Mutex mutex_;
  std::list<LoggedTrouble> lines_ GUARDED_BY(mutex_);  // newest first
};

// Passes lines on to another log, and keeps those at error level in `troubles`. A line belongs to the user
// for whom its thread works (platform/accounts/WorkingFor.h).
class TroubleLog final : public LogLayer {
 public:
  // `clock` outlives the log.
  TroubleLog(std::unique_ptr<Log> log, std::shared_ptr<RecentTroubles> troubles, const Clock& clock);
  ~TroubleLog() override;

  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

 private:
  const std::shared_ptr<RecentTroubles> troubles_;
  const Clock& clock_;
};

}  // namespace tonewerk
