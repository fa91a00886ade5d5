// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>

#include "platform/Log.h"

namespace tonewerk {

// Passes lines on to another log, with control characters and other unprintable ones escaped
// (values/PrintableText.h). So a name or a value from a client can neither begin another line nor control a
// terminal that shows the log. Line feeds stay inside a scope of platform/LogLines.h.
class EscapingLog final : public Log {
 public:
  explicit EscapingLog(std::unique_ptr<Log> log);
  ~EscapingLog() override;

  bool isEnabled(std::string_view category, LogLevel level) const override {
    return log_->isEnabled(category, level);
  }
  std::optional<LogLevel> fixedThreshold(std::string_view category) const override {
    return log_->fixedThreshold(category);
  }
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

 private:
  const std::unique_ptr<Log> log_;
};

}  // namespace tonewerk
