// SPDX-License-Identifier: Apache-2.0
#include "platform/PreferenceSchema.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>

#include "values/ClosestName.h"

namespace tonewerk {
namespace {

using enum PreferenceType;
using enum PreferenceEffect;

constexpr double kMaxInt32 = std::numeric_limits<std::int32_t>::max();

constexpr std::string_view kMetricon = "com.orvane.metricon";
constexpr std::string_view kLinkReport = "com.orvane.linkreport";
constexpr std::string_view kStore = "com.orvane.tonewerk.store";
constexpr std::string_view kService = "com.orvane.tonewerk.service";
constexpr std::string_view kDiagnostics = "com.orvane.tonewerk.diagnostics";
constexpr std::string_view kTwreporting = "com.orvane.tonewerk.twreporting";
constexpr std::string_view kCaptures = "com.orvane.tonewerk.captures";
constexpr std::string_view kTonewerk = "com.orvane.tonewerk";
constexpr std::string_view kHomedeck = "com.orvane.homedeck";

std::vector<Preference> allPreferences() {
  const Value everything = ValueArray{ValueMap{{"name", "local"}, {"events", ValueArray{"com.orvane.*"}}}};
  const Value memoryTools = ValueArray{"tw-memory-usage", "slabtop --once"};
  return {
      {kMetricon, "consumers", kTables, everything, "Who asks for which analytics events"},
      {kLinkReport, "backends", kTexts, ValueArray{"local"}, "Where messages go: local, or addresses",
       kNextSession},
      {kLinkReport, "device_id", kText, {}, "The device's name for receivers; unnamed without"},
      {kLinkReport, "event_name_attribute", kBoolean, false, "Event names as an attribute, too",
       kNextSession},
      {kStore, "max_megabytes", kNumber, 256, "MiB that the store takes, its log included", kAtOnce, "MiB",
       1.0},
      {kStore, "max_days", kNumber, 30, "Age of the oldest report in days", kAtOnce, "days", 1.0},
      {kStore, "journal_megabytes", kNumber, 64, "MiB of requests kept to outlive a crash", kAtOnce, "MiB",
       0.0},
      {kStore, "journal_sync_seconds", kNumber, 5, "Seconds until a request is on the disk", kAtOnce,
       "seconds", 0.0, 3600.0},
      {kStore, "journal_days", kNumber, 0, "Days that requests are kept for replay", kAtOnce, "days", 0.0},
      {kService, "trusted_users", kUsers, ValueArray{}, "Who reaches all users' sessions, beside root",
       kReload},
      {kService, "unfinished_megabytes", kNumber, 128, "MiB of requests under way, of all users", kReload,
       "MiB", 1.0},
      {kService, "kept_megabytes", kNumber, 512, "MiB that sessions keep, of all users", kReload, "MiB", 1.0},
      {kService, "snapshot_megabytes", kNumber, 64, "MiB of driver statistics, of all users", kReload, "MiB",
       1.0},
      {kDiagnostics, "max_megabytes", kNumber, 256, "MiB of captures, drafts and stall traces", kAtOnce,
       "MiB", 1.0},
      {kDiagnostics, "max_items", kNumber, 500, "How many of them are kept", kAtOnce, {}, 1.0},
      {kTwreporting,
       "VidroInvalidXyBackOffSeconds",
       kNumber,
       {},
       "Seconds between two drafts; off without",
       kNextSession,
       "seconds",
       0.0},
      {kTwreporting, "enable_whirlcap", kBoolean, false, "Whether overloads have stall traces made",
       kNextSession},
      {kTwreporting, "io_buffer_size", kInteger, 512, "Smallest buffer that counts, in frames; 0 is 512",
       kNextSession, "frames", 0.0, kMaxInt32},
      {kTwreporting,
       "io_cycle",
       kInteger,
       0,
       "First cycle whose overload counts",
       kNextSession,
       {},
       0.0,
       kMaxInt32},
      {kTwreporting, "wait_time", kNumber, 0, "Microseconds from an overload to its trace", kNextSession,
       "microseconds", 0.0, 10'000'000.0},
      {.domain = kTwreporting,
       .key = "memory_tools",
       .type = kTexts,
       .fallback = memoryTools,
       .meaning = "The memory log's two commands",
       .count = 2},
      {kTwreporting, "summary_megabytes", kNumber, 256, "MiB that JSON summary files take", kAtOnce, "MiB",
       1.0},
      {kTwreporting, "summary_days", kNumber, 30, "Age of the oldest JSON summary file in days", kAtOnce,
       "days", 1.0},
      {kTwreporting, "VidroComponentIdentifier", kInteger, 0, "The drafts' component in the bug tracker"},
      {.domain = kTwreporting,
       .key = "VidroInvalidXyIDRlastRun",
       .type = kNumber,
       .fallback = {},
       .meaning = "When the last draft was made, in seconds since 1970",
       .unit = "seconds",
       .keeper = PreferenceKeeper::kDaemon},
      {.domain = kCaptures,
       .key = "accepted",
       .type = kTable,
       .fallback = {},
       .meaning = "How many captures which day has seen",
       .keeper = PreferenceKeeper::kDaemon},
      {kTonewerk, "device_name", kText, {}, "The device's name in reports", kWhenTold},
      {kTonewerk, "disable_reporting", kBoolean, false, "Read, and changes nothing", kNever},
      {kHomedeck, "spatial-audio-accessory-feature", kAny, {}, "Told to every session", kWhenTold},
  };
}

std::vector<Preference> allDeviceFacts() {
  return {
      {kDeviceFacts, "InternalBuild", kBoolean, false, "An internal build, which has more diagnostics",
       kNextStart},
      {kDeviceFacts, "HapticLeakCapture", kBoolean, false,
       "Captures of leaking haptics; internal builds only", kReload},
  };
}

bool isNumber(const Value& value) {
  return value.asInteger() != nullptr || value.asUnsigned() != nullptr || value.asDouble() != nullptr;
}

bool isWithin(const Preference& preference, double number) {
  return !std::isnan(number) && (!preference.minimum || number >= *preference.minimum) &&
         (!preference.maximum || number <= *preference.maximum);
}

// Returns whether `value` is an array with the required number of entries, for all of which `suits` is true.
template <typename Suits>
bool isArray(const Preference& preference, const Value& value, Suits suits) {
  const ValueArray* array = value.asArray();
  return array != nullptr && (preference.count == 0 || array->size() == preference.count) &&
         std::all_of(array->begin(), array->end(), suits);
}

bool suits(const Preference& preference, const Value& value) {
  switch (preference.type) {
    case kBoolean:
      return value.asBoolean() != nullptr;
    case kInteger:
      return (value.asInteger() != nullptr || value.asUnsigned() != nullptr) &&
             isWithin(preference, value.number());
    case kNumber:
      return isNumber(value) && isWithin(preference, value.number());
    case kText:
      return value.asString() != nullptr;
    case kTexts:
      return isArray(preference, value, [](const Value& entry) { return entry.asString() != nullptr; });
    case kUsers:
      return isArray(preference, value, [](const Value& entry) {
        return entry.asString() != nullptr || entry.asInteger() != nullptr;
      });
    case kTables:
      return isArray(preference, value, [](const Value& entry) { return entry.asMap() != nullptr; });
    case kTable:
      return value.asMap() != nullptr;
    case kAny:
      return true;
  }
  return false;
}

// Returns the number without a point: all limits are whole numbers.
std::string numberText(double number) { return std::to_string(static_cast<std::int64_t>(number)); }

std::string rangeText(const Preference& preference) {
  std::string text;
  if (preference.minimum) text += " from " + numberText(*preference.minimum);
  if (preference.maximum) text += " to " + numberText(*preference.maximum);
  return text;
}

// Returns the value as a person would write it in a preference file.
std::string textInQuotes(const Value& value) {
  if (const bool* boolean = value.asBoolean()) return *boolean ? "true" : "false";
  return value.asString() == nullptr ? value.text() : '"' + value.text() + '"';
}

const std::vector<Preference>& schemaWith(std::string_view domain) {
  return domain == kDeviceFacts ? deviceFactSchema() : preferenceSchema();
}

}  // namespace

const std::vector<Preference>& preferenceSchema() {
  static const std::vector<Preference> schema = allPreferences();
  return schema;
}

const std::vector<Preference>& deviceFactSchema() {
  static const std::vector<Preference> schema = allDeviceFacts();
  return schema;
}

const Preference* findPreference(std::string_view domain, std::string_view key) {
  const std::vector<Preference>& schema = schemaWith(domain);
  const auto found = std::find_if(schema.begin(), schema.end(), [&](const Preference& preference) {
    return preference.domain == domain && preference.key == key;
  });
  return found == schema.end() ? nullptr : &*found;
}

std::vector<std::string> knownKeys(std::string_view domain) {
  std::vector<std::string> keys;
  for (const Preference& preference : schemaWith(domain)) {
    if (preference.domain == domain) keys.emplace_back(preference.key);
  }
  return keys;
}

std::vector<std::string> unknownKeys(std::string_view domain, const ValueMap& set) {
  const std::vector<std::string> keys = knownKeys(domain);
  std::vector<std::string> lines;
  if (keys.empty()) return lines;
  for (const ValueMap::Entry& entry : set) {
    const std::string key = entry.key.string();
    if (std::find(keys.begin(), keys.end(), key) != keys.end()) continue;
    const std::optional<std::string> meant = closestTo(key, keys);
    lines.push_back("the daemon does not read " + key + " of " + std::string(domain) +
                    (meant ? "; did you mean '" + *meant + "'?" : ""));
  }
  return lines;
}

std::string typeText(const Preference& preference) {
  switch (preference.type) {
    case kBoolean:
      return "boolean";
    case kInteger:
      return "integer" + rangeText(preference);
    case kNumber:
      return "number" + rangeText(preference);
    case kText:
      return "text";
    case kTexts:
      return preference.count == 2 ? "array of two texts" : "array of texts";
    case kUsers:
      return "array of users' names or numbers";
    case kTables:
      return "array of tables";
    case kTable:
      return "table";
    case kAny:
      return "any value";
  }
  return "";
}

std::optional<std::string> problemWith(const Preference& preference, const Value& value) {
  if (suits(preference, value)) return std::nullopt;
  const std::string type = typeText(preference);
  const bool beginsWithVowel = std::string_view("aeiou").find(type.front()) != std::string_view::npos;
  const std::string wanted =
      preference.type == kBoolean ? "true or false" : (beginsWithVowel ? "an " : "a ") + type;
  return std::string(preference.key) + " must be " + wanted + ", not " + textInQuotes(value);
}

std::string_view effectText(PreferenceEffect effect) {
  switch (effect) {
    case kAtOnce:
      return "at once";
    case kWhenTold:
      return "when its notification is posted";
    case kReload:
      return "after a reload";
    case kNextSession:
      return "next session";
    case kNextStart:
      return "next start";
    case kNever:
      return "never";
  }
  return "";
}

}  // namespace tonewerk
