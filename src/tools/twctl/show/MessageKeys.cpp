// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/MessageKeys.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMost = 8;
constexpr std::array<std::string_view, 14> kFirst{"issue_type",
                                                  "node",
                                                  "any_channel_silence_seconds",
                                                  "play_seconds",
                                                  "QMSessionVolume",
                                                  "active_devices",
                                                  "inputrunning_seconds",
                                                  "session_output_running",
                                                  "vocoders",
                                                  "overload_count",
                                                  "session_input_running",
                                                  "total_active_time",
                                                  "num_messages",
                                                  "session_duration"};
constexpr std::array<std::string_view, 6> kHidden{
    "twreporting_timestamp", "audiotag", "HostApplicationDisplayID", "invalid_timestamp", "msgidx", "msgcnt"};
constexpr std::array<std::string_view, 3> kNothing{"unknown", "Unknown", "nil"};

bool contains(const auto& list, std::string_view word) { return std::ranges::find(list, word) != list.end(); }

// The place among those that come first, or behind them.
std::size_t rankOf(std::string_view key) {
  return static_cast<std::size_t>(std::ranges::find(kFirst, key) - kFirst.begin());
}

std::string shortNumber(double number) {
  constexpr double kPerUnit = 1000.0;
  constexpr double kLarge = 1e12;  // where decimals mean nothing
  if (!(std::fabs(number) < kLarge)) return textOf(number);
  const double value = std::round(number * kPerUnit) / kPerUnit;
  const auto whole = static_cast<std::int64_t>(value);
  return static_cast<double>(whole) == value ? std::to_string(whole) : textOf(value);
}

std::string valueText(const Value& value) {
  if (const double* number = value.asDouble()) return shortNumber(*number);
  std::string text = value.text();
  return text.empty() || text.find(' ') != std::string::npos ? '"' + text + '"' : text;
}

}  // namespace

std::string keysThatMatter(const ValueMap& payload) {
  std::vector<const ValueMap::Entry*> entries;
  for (const ValueMap::Entry& entry : payload) {
    const bool isHidden = contains(kHidden, entry.key.view()) || entry.key.view().ends_with("Bucketed");
    if (!isHidden && !contains(kNothing, entry.value.text())) entries.push_back(&entry);
  }
  std::ranges::stable_sort(entries, {},
                           [](const ValueMap::Entry* entry) { return rankOf(entry->key.view()); });
  std::string line;
  for (std::size_t at = 0; at < std::min(entries.size(), kMost); ++at) {
    line.append(line.empty() ? "" : " ").append(entries[at]->key.view()).append("=");
    line += valueText(entries[at]->value);
  }
  return entries.size() > kMost ? line + " \u2026" : line;
}

}  // namespace tonewerk
