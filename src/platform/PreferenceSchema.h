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

// Since when a change counts.
enum class PreferenceEffect {
  kAtOnce,       // at the next use
  kWhenTold,     // when its notification is posted, which `twctl defaults` does, or after a reload
  kReload,       // after a reload
  kNextSession,  // for sessions that start afterwards
  kNextStart,    // at the daemon's next start
  kNever,        // it changes nothing
};

// Describes a preference or a device fact: its type, its limits and its default.
struct Preference {
  std::string_view domain;  // kDeviceFacts for a fact
  std::string_view key;
  PreferenceType type;
  std::optional<Value> fallback;  // the default; none when there is no default
  std::string_view meaning;       // one short line
  PreferenceEffect effect = PreferenceEffect::kAtOnce;
  std::string_view unit = {};          // of a number, such as "MiB"; empty for none
  std::optional<double> minimum = {};  // of a number
  std::optional<double> maximum = {};
  std::size_t count = 0;  // of a list's entries; 0 for any
  PreferenceKeeper keeper = PreferenceKeeper::kPeople;
};

// Stands for the domain of the facts, which are not preferences: they are in a file of their own.
inline constexpr std::string_view kDeviceFacts = "device-facts";

// Returns all preferences that the daemon knows, grouped by domain.
const std::vector<Preference>& preferenceSchema();

// Returns all facts that the daemon knows.
const std::vector<Preference>& deviceFactSchema();

// Returns null when the daemon knows no such preference, or no such fact.
const Preference* findPreference(std::string_view domain, std::string_view key);

// Returns the keys of a domain, or of the facts, in the order of the schema; none when the daemon does not
// know the domain.
std::vector<std::string> knownKeys(std::string_view domain);

// Returns a line for each key of `set` that the daemon does not know in this domain, with the known key that
// is close to it. Empty when the daemon does not know the domain.
[[nodiscard]] std::vector<std::string> unknownKeys(std::string_view domain, const ValueMap& set);

// Returns for example "number from 1" or "array of two texts".
std::string typeText(const Preference& preference);

// Returns why the preference cannot have `value`, in words that name it; none when it can.
[[nodiscard]] std::optional<std::string> problemWith(const Preference& preference, const Value& value);

// Returns for example "next session".
std::string_view effectText(PreferenceEffect effect);

}  // namespace tonewerk
