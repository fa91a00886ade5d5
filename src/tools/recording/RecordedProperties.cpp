// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/RecordedProperties.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <span>

namespace tonewerk {
namespace {

// The highest number stands for no user.
constexpr std::int64_t kMaxUser = std::numeric_limits<std::uint32_t>::max() - 1LL;
constexpr double kMaxUptime = 1e9;

bool isInteger(const Value& value, std::int64_t most) {
  const std::int64_t* number = value.asInteger();
  return number != nullptr && *number >= 0 && *number <= most;
}

bool isNumber(const Value& value) {
  return (value.asInteger() != nullptr || value.asUnsigned() != nullptr || value.asDouble() != nullptr) &&
         std::isfinite(value.number());
}

bool isNumberUpTo(const Value& value, double most) {
  return isNumber(value) && value.number() >= 0.0 && value.number() <= most;
}

template <typename Check>
bool isMapOf(const Value& value, Check check) {
  const ValueMap* map = value.asMap();
  return map != nullptr &&
         std::all_of(map->begin(), map->end(), [&](const auto& entry) { return check(entry.value); });
}

bool isUser(const Value& value) { return isInteger(value, kMaxUser); }
bool isText(const Value& value) { return value.asString() != nullptr; }
bool isBoolean(const Value& value) { return value.asBoolean() != nullptr; }
bool isState(const Value& value) {
  return value.asUnsigned() != nullptr || isInteger(value, std::numeric_limits<std::int64_t>::max());
}
bool isMap(const Value& value) { return value.asMap() != nullptr; }

bool areLoads(const Value& value) {
  const ValueArray* loads = value.asArray();
  return loads != nullptr && loads->size() == 3 && std::all_of(loads->begin(), loads->end(), isNumber);
}

bool areDrivers(const Value& value) {
  const ValueArray* drivers = value.asArray();
  return drivers != nullptr && std::all_of(drivers->begin(), drivers->end(), isMap);
}

struct Property {
  std::string_view name;
  std::string_view form;
  bool (*hasForm)(const Value& value);
  bool isForFirstLine = false;
};

constexpr Property kClientProperties[] = {
    {recorded::kUser, "a user's number", isUser},
    {recorded::kProcess, "a text", isText},
};

constexpr Property kDeviceProperties[] = {
    {recorded::kStartsAt, "seconds since 1970",
     [](const Value& value) { return isNumberUpTo(value, kMaxRecordedTime); }, true},
    {recorded::kUptime, "a number of seconds",
     [](const Value& value) { return isNumberUpTo(value, kMaxUptime); }, true},
    {recorded::kUser, "a user's number", isUser, true},
    {recorded::kFacts, "an object of booleans", [](const Value& value) { return isMapOf(value, isBoolean); },
     true},
    {recorded::kThermalLevel, "0, 1, 2 or 3", [](const Value& value) { return isInteger(value, 3); }},
    {recorded::kLowPowerMode, "true or false", isBoolean},
    {recorded::kLoadAverages, "an array of three numbers", areLoads},
    {recorded::kPreferences, "an object of objects",
     [](const Value& value) { return isMapOf(value, isMap); }},
    {recorded::kNotifications, "an object of integers from 0",
     [](const Value& value) { return isMapOf(value, isState); }},
    {recorded::kChannels, "an array of objects", areDrivers},
};

std::string problemWith(const ValueMap& properties, std::string_view owner, std::span<const Property> known,
                        bool isFirstLine) {
  for (const ValueMap::Entry& entry : properties) {
    const auto property =
        std::find_if(known.begin(), known.end(), [&](const Property& one) { return entry.key == one.name; });
    const std::string name = "\"" + entry.key.string() + "\"";
    if (property == known.end()) return std::string(owner) + " has no " + name;
    if (!property->hasForm(entry.value)) return name + " must be " + std::string(property->form);
    if (property->isForFirstLine && !isFirstLine) return name + " is only possible in the first line";
  }
  return {};
}

}  // namespace

std::string problemWithClient(const ValueMap& properties) {
  return problemWith(properties, "a client", kClientProperties, true);
}

std::string problemWithDevice(const ValueMap& properties, bool isFirstLine) {
  return problemWith(properties, "a device", kDeviceProperties, isFirstLine);
}

}  // namespace tonewerk
