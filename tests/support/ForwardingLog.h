// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

#include "platform/Log.h"

namespace tonewerk {

// Lets a log that owns another one write to a log that outlives it.
class ForwardingLog final : public Log {
 public:
  explicit ForwardingLog(Log& log) : log_(log) {}

  bool isEnabled(std::string_view category, LogLevel level) const override {
    return log_.isEnabled(category, level);
  }
  std::optional<LogLevel> fixedThreshold(std::string_view category) const override {
    return log_.fixedThreshold(category);
  }
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override {
    log_.write(subsystem, category, level, message);
  }

 private:
  Log& log_;
};

}  // namespace tonewerk
