// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Log.h"
#include "values/Mutex.h"

namespace tonewerk {

// Records log lines for a test. Every line is enabled until a threshold is set. Any thread.
//
//   MemoryLog log;
//   EXPECT_THAT(log.textsOf("twrr"), ElementsAre("stop called. reporterID=77"));
//   EXPECT_THAT(log.linesOf("twrs", LogLevel::kError), IsEmpty());
class MemoryLog final : public Log {
 public:
  struct Line {
    std::string subsystem;
    std::string category;
    LogLevel level = LogLevel::kDefault;
    std::string message;  // prefix included

    std::string text() const { return withoutPrefix(message); }
    friend bool operator==(const Line&, const Line&) = default;
  };

  // Returns `message` without its "%25s:%-5d " of source file and line; unchanged when it has no such prefix.
  static std::string withoutPrefix(std::string_view message);

  bool isEnabled(std::string_view category, LogLevel level) const override;
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

  // From now on only lines of at least this level are enabled, in all categories or in one.
  void setThreshold(LogLevel level);
  void setThreshold(std::string_view category, LogLevel level);

  std::vector<Line> lines() const;
  std::vector<Line> linesOf(std::string_view category) const;
  std::vector<Line> linesOf(std::string_view category, LogLevel level) const;
  // Return the messages without their prefixes.
  std::vector<std::string> textsOf(std::string_view category) const;
  std::vector<std::string> textsOf(std::string_view category, LogLevel level) const;
  // Returns the messages of all categories.
  std::vector<std::string> textsAt(LogLevel level) const;
  // Removes the lines, but keeps the thresholds.
  void clear();

 private:
  mutable Mutex mutex_;
  LogLevel threshold_ GUARDED_BY(mutex_) = LogLevel::kDebug;
  std::map<std::string, LogLevel, std::less<>> thresholds_ GUARDED_BY(mutex_);
  std::vector<Line> lines_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
