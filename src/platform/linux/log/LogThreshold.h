// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/Log.h"

namespace tonewerk {

// From which level on lines are written: one level for all categories, others for some. Any thread reads it.
class LogThreshold {
 public:
  LogThreshold() = default;
  explicit LogThreshold(LogLevel level) : level_(level) {}

  // Out of a text such as "info" or "twrr=debug,twrs=error,default"; what comes later in a list wins. None
  // for anything else, an empty text included; `problem` then says what is wrong with it.
  [[nodiscard]] static std::optional<LogThreshold> parse(std::string_view text, std::string& problem);

  // A comparison, or a few for categories that have a level of their own. Allocates nothing.
  bool isEnabled(std::string_view category, LogLevel level) const;

 private:
  void set(std::string_view category, LogLevel level);

  LogLevel level_ = LogLevel::kDefault;
  std::vector<std::pair<std::string, LogLevel>> categories_;
};

}  // namespace tonewerk
