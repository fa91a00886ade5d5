// SPDX-License-Identifier: Apache-2.0
#include "platform/JournalPreferences.h"

#include <algorithm>
#include <optional>
#include <string_view>

#include "platform/PreferenceSchema.h"
#include "platform/PreferenceStore.h"

namespace tonewerk {
namespace {

constexpr std::string_view kDomain = "com.orvane.tonewerk.store";
constexpr std::string_view kMegabytesKey = "journal_megabytes";
constexpr std::string_view kSyncSecondsKey = "journal_sync_seconds";
constexpr std::string_view kDaysKey = "journal_days";

constexpr double kMegabyte = 1 << 20;
constexpr double kDaySeconds = 86'400.0;
// Larger values are cut to this (a petabyte, or 2.7 million years), which every type can hold that they are
// turned into.
constexpr double kUnbounded = 1e9;

double numberOf(const PreferenceStore& preferences, std::string_view key, std::string& problems) {
  const Preference& schema = *findPreference(kDomain, key);
  const std::optional<Value> value = preferences.read(kDomain, key);
  const std::optional<std::string> problem = value ? problemWith(schema, *value) : std::nullopt;
  if (problem) problems += (problems.empty() ? "" : "; ") + *problem;
  const bool isUsed = value && !problem;
  return std::min(isUsed ? value->number() : schema.fallback->number(), kUnbounded);
}

}  // namespace

JournalPreferences readJournalPreferences(const PreferenceStore& preferences, std::string& problems) {
  problems.clear();
  JournalPreferences read;
  read.bytes = static_cast<std::uint64_t>(numberOf(preferences, kMegabytesKey, problems) * kMegabyte);
  const std::chrono::duration<double> interval(numberOf(preferences, kSyncSecondsKey, problems));
  read.syncInterval = std::chrono::duration_cast<std::chrono::nanoseconds>(interval);
  const std::chrono::duration<double> days(numberOf(preferences, kDaysKey, problems) * kDaySeconds);
  read.keepsDropped = std::chrono::duration_cast<std::chrono::seconds>(days);
  return read;
}

}  // namespace tonewerk
