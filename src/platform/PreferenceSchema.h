// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

enum class PreferenceType { kBoolean, kInteger, kNumber, kText, kTexts, kUsers, kTables, kTable, kAny };

// Who sets a preference: people and packages, or the daemon, which stores there what it must remember.
enum class PreferenceKeeper { kPeople, kDaemon };

// Describes a preference: its type, its limits and its default.
struct Preference {
  std::string_view domain;
  std::string_view key;
  PreferenceType type;
  std::optional<Value> fallback;       // the default; none when there is no default
  std::string_view meaning;            // one short line
  std::optional<double> minimum = {};  // of a number
  std::optional<double> maximum = {};
  std::size_t count = 0;  // of a list's entries; 0 for any
  PreferenceKeeper keeper = PreferenceKeeper::kPeople;
};

// Returns all preferences that the daemon knows, grouped by domain.
const std::vector<Preference>& preferenceSchema();

// Returns null when the daemon knows no such preference.
const Preference* findPreference(std::string_view domain, std::string_view key);

// Returns for example "number from 1" or "array of two texts".
std::string typeText(const Preference& preference);

// Returns why the preference cannot have `value`, in words that name it; none when it can.
[[nodiscard]] std::optional<std::string> problemWith(const Preference& preference, const Value& value);

}  // namespace tonewerk
