// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/Log.h"

namespace tonewerk {

// Decides which lines are written: a lowest level for all categories, and other levels for single categories.
// Any thread may read it.
class LogThreshold {
 public:
  LogThreshold() = default;
  explicit LogThreshold(LogLevel level) : level_(level) {}

  // Parses a text such as "info" or "twrr=debug,twrs=error,default". Of several levels for the same category
  // the last one counts. None for any other text, also an empty one; `problem` then says what is wrong.
  [[nodiscard]] static std::optional<LogThreshold> parse(std::string_view text, std::string& problem);

  // Compares the category with each that has its own level. Allocates nothing.
  bool isEnabled(std::string_view category, LogLevel level) const { return level >= of(category); }
  // The lowest level that is written.
  LogLevel of(std::string_view category) const;

 private:
  void set(std::string_view category, LogLevel level);

  LogLevel level_ = LogLevel::kDefault;
  std::vector<std::pair<std::string, LogLevel>> categories_;
};

}  // namespace tonewerk
