// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>

#include "platform/linux/log/LogLayer.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;

// Passes lines on to another log, but only the first kMaxEqualLines of equal lines in a row. How many more
// there were is said in a line of its own, "equal lines left out: 4711": once a second while they come,
// before the next other line, and at the end in order. So messages that arrive by the hundred thousand cannot
// fill the log with one line, which would also be most of their cost.
class CondensingLog final : public LogLayer {
 public:
  static constexpr std::uint64_t kMaxEqualLines = 10;
  static constexpr std::chrono::seconds kCountPeriod{1};

  // `clock` outlives the log.
  CondensingLog(std::unique_ptr<Log> log, const Clock& clock);
  CondensingLog(const CondensingLog&) = delete;
  CondensingLog& operator=(const CondensingLog&) = delete;
  ~CondensingLog() override;

  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

 private:
  // The last line that was written, and how many equal ones came after it.
  struct Line {
    std::string subsystem;
    std::string category;
    LogLevel level = LogLevel::kDebug;
    std::string message;
  };

  // Counts a line that equals the last one. Returns true when it must not be written.
  bool isCounted(std::string_view category, LogLevel level, std::string_view message) REQUIRES(mutex_);
  void writeCount() REQUIRES(mutex_);

  const Clock& clock_;
  Mutex mutex_;  // held while a line is written, so that a count follows its line
  Line last_ GUARDED_BY(mutex_);
  std::uint64_t equalLines_ GUARDED_BY(mutex_) = 0;  // in a row, the first one included
  std::uint64_t unsaid_ GUARDED_BY(mutex_) = 0;      // of these, neither written nor said yet
  std::chrono::nanoseconds saidAt_ GUARDED_BY(mutex_){};
};

}  // namespace tonewerk
