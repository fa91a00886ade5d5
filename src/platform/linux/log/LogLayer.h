// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string_view>
#include <utility>

#include "platform/Log.h"

namespace tonewerk {

// Passes lines on to another log, which decides what is logged. A derived class writes to below() what it
// does not hold back or change.
class LogLayer : public Log {
 public:
  bool isEnabled(std::string_view category, LogLevel level) const final {
    return below_->isEnabled(category, level);
  }
  std::optional<LogLevel> fixedThreshold(std::string_view category) const final {
    return below_->fixedThreshold(category);
  }

 protected:
  explicit LogLayer(std::unique_ptr<Log> below) : below_(std::move(below)) {}

  Log& below() const { return *below_; }

 private:
  const std::unique_ptr<Log> below_;
};

}  // namespace tonewerk
