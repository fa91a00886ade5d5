// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/LogThreshold.h"

namespace tonewerk {
namespace {

std::optional<LogLevel> levelOf(std::string_view text) {
  for (const LogLevel level : {LogLevel::kDebug, LogLevel::kInfo, LogLevel::kDefault, LogLevel::kError}) {
    if (textOf(level) == text) return level;
  }
  return std::nullopt;
}

std::string_view trimmed(std::string_view text) {
  while (!text.empty() && text.front() == ' ') text.remove_prefix(1);
  while (!text.empty() && text.back() == ' ') text.remove_suffix(1);
  return text;
}

}  // namespace

std::optional<LogThreshold> LogThreshold::parse(std::string_view text, std::string& problem) {
  LogThreshold threshold;
  for (bool isLast = false; !isLast;) {
    const std::size_t comma = text.find(',');
    isLast = comma == std::string_view::npos;
    const std::string_view item = trimmed(text.substr(0, comma));
    if (!isLast) text.remove_prefix(comma + 1);

    const std::size_t equals = item.find('=');
    const bool hasCategory = equals != std::string_view::npos;
    const std::string_view category = hasCategory ? trimmed(item.substr(0, equals)) : std::string_view();
    const std::optional<LogLevel> level = levelOf(hasCategory ? trimmed(item.substr(equals + 1)) : item);
    if (!level || (hasCategory && category.empty())) {
      problem =
          "\"" + std::string(item) + "\" is neither a level (debug, info, default, error) nor category=level";
      return std::nullopt;
    }
    if (hasCategory) {
      threshold.set(category, *level);
    } else {
      threshold.level_ = *level;
    }
  }
  return threshold;
}

LogLevel LogThreshold::of(std::string_view category) const {
  for (const auto& [name, own] : categories_) {
    if (name == category) return own;
  }
  return level_;
}

void LogThreshold::set(std::string_view category, LogLevel level) {
  for (auto& [name, own] : categories_) {
    if (name != category) continue;
    own = level;
    return;
  }
  categories_.emplace_back(category, level);
}

}  // namespace tonewerk
