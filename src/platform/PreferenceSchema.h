// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

enum class PreferenceType { kBoolean, kInteger, kNumber, kText, kTexts, kTables, kTable, kAny };

// Who sets a preference: people and packages, or the daemon, which keeps there what it must remember.
enum class PreferenceKeeper { kPeople, kDaemon };

// What a preference may be, and what it is when nobody has set it.
struct Preference {
  std::string_view domain;
  std::string_view key;
  PreferenceType type;
  std::optional<Value> fallback;     // none when nothing counts then
  std::string_view meaning;          // one short line
  std::optional<double> least = {};  // of a number
  std::optional<double> most = {};
  std::size_t count = 0;  // of a list's entries; 0 for any
  PreferenceKeeper keeper = PreferenceKeeper::kPeople;
};

// All preferences that the daemon knows, domain by domain.
const std::vector<Preference>& preferenceSchema();

// Null when the daemon knows no such preference.
const Preference* findPreference(std::string_view domain, std::string_view key);

// "number from 1", "array of two texts".
std::string typeText(const Preference& preference);

// Why the preference cannot be `value`, in words that name it, or none.
[[nodiscard]] std::optional<std::string> problemWith(const Preference& preference, const Value& value);

}  // namespace tonewerk
