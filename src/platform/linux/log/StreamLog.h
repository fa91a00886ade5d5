// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/Clock.h"
#include "platform/linux/log/LogOutput.h"
#include "platform/linux/log/LogThreshold.h"
#include "values/Mutex.h"

namespace tonewerk {

// Writes the log as lines of text to an open file, such as standard error:
//
//   2026-11-20T10:18:00.123456Z info twrr        TWReportingSession:214   start called. reporterID=77
//
// A line is one write() if the file takes it whole, so that lines of several processes do not mix. Newlines
// are written as they are; EscapingLog escapes those that the daemon did not put there. The process must
// ignore SIGPIPE if the file may be a pipe without a reader.
class StreamLog final : public LogOutput {
 public:
  // Does not close `fileDescriptor`. `clock` outlives the log.
  StreamLog(int fileDescriptor, const Clock& clock, LogThreshold threshold = LogThreshold());

  bool isEnabled(std::string_view category, LogLevel level) const override {
    return threshold_.isEnabled(category, level);
  }
  std::optional<LogLevel> fixedThreshold(std::string_view category) const override {
    return threshold_.of(category);
  }
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override {
    writeAt(clock_.now(), subsystem, category, level, message);
  }
  void writeAt(double at, std::string_view subsystem, std::string_view category, LogLevel level,
               std::string_view message) override;

  // The line as it is written, with its newline. `at` is in seconds since 1970.
  static std::string format(double at, std::string_view category, LogLevel level, std::string_view message);

 private:
  const int fileDescriptor_;
  const Clock& clock_;
  const LogThreshold threshold_;
  Mutex mutex_;  // held while a line is written, because it may take several write() calls
};

}  // namespace tonewerk
