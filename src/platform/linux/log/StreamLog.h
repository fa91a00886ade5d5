// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/linux/log/LogThreshold.h"
#include "values/Mutex.h"

namespace tonewerk {

// The log as lines of text on an open file, such as standard error:
//
//   2026-11-20T10:18:00.123456Z info twrr        TWReportingSession:214   start called. reporterID=77
//
// A line is one write(), so that lines of several processes do not mix. A message with newlines is written as
// it is. Whoever may write to a pipe without a reader ignores SIGPIPE.
class StreamLog final : public Log {
 public:
  // Neither closes `fileDescriptor` nor changes it. `clock` outlives the log.
  StreamLog(int fileDescriptor, const Clock& clock, LogThreshold threshold = LogThreshold());

  bool isEnabled(std::string_view category, LogLevel level) const override {
    return threshold_.isEnabled(category, level);
  }
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

  // The line as it is written, newline included. `at` in seconds since 1970.
  static std::string format(double at, std::string_view category, LogLevel level, std::string_view message);

 private:
  const int fileDescriptor_;
  const Clock& clock_;
  const LogThreshold threshold_;
  Mutex mutex_;  // held while a line is written, so that one written in pieces stays whole
};

}  // namespace tonewerk
