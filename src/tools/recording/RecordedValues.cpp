// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/RecordedValues.h"

#include <cmath>
#include <limits>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {
namespace {

constexpr std::string_view kNow = "now";
constexpr std::string_view kDate = "date";
constexpr std::string_view kNumber = "number";
constexpr std::string_view kMap = "map";

std::optional<double> finiteNumber(const Value& value) {
  if (value.asInteger() == nullptr && value.asUnsigned() == nullptr && value.asDouble() == nullptr) {
    return std::nullopt;
  }
  return value.number();
}

std::optional<double> otherNumber(const Value& value) {
  if (value.asString() == nullptr) return std::nullopt;
  const std::string& text = value.asString()->string();
  if (text == "nan") return std::numeric_limits<double>::quiet_NaN();
  if (text == "inf") return std::numeric_limits<double>::infinity();
  if (text == "-inf") return -std::numeric_limits<double>::infinity();
  return std::nullopt;
}

// A finite number as it is, another one as its text.
Value numberOrText(double number) { return std::isfinite(number) ? Value(number) : Value(textOf(number)); }

ValueMap playedMap(const ValueMap& recorded, double now) {
  ValueMap played;
  played.reserve(recorded.size());
  for (const ValueMap::Entry& entry : recorded) played.set(entry.key, playedValue(entry.value, now));
  return played;
}

// What a map with one entry stands for; none for a map that stands for itself.
std::optional<Value> meaningOf(const ValueMap& map, double now) {
  if (map.size() != 1) return std::nullopt;
  const ValueMap::Entry& entry = *map.begin();
  if (entry.key == kNow) {
    if (const auto offset = finiteNumber(entry.value)) return now + *offset;
  } else if (entry.key == kDate) {
    if (const auto seconds = finiteNumber(entry.value)) return Date{*seconds};
    if (const auto seconds = otherNumber(entry.value)) return Date{*seconds};
  } else if (entry.key == kNumber) {
    if (const auto number = otherNumber(entry.value)) return *number;
  } else if (entry.key == kMap && entry.value.asMap() != nullptr) {
    return playedMap(*entry.value.asMap(), now);
  }
  return std::nullopt;
}

}  // namespace

Value playedValue(const Value& recorded, double now) {
  if (const ValueArray* array = recorded.asArray()) {
    ValueArray played;
    for (const Value& element : *array) played.append(playedValue(element, now));
    return played;
  }
  const ValueMap* map = recorded.asMap();
  if (map == nullptr) return recorded;
  if (const auto meaning = meaningOf(*map, now)) return *meaning;
  return playedMap(*map, now);
}

Value recordedValue(const Value& value) {
  if (const Date* date = value.asDate()) return ValueMap{{kDate, numberOrText(date->seconds)}};
  if (const double* number = value.asDouble(); number != nullptr && !std::isfinite(*number)) {
    return ValueMap{{kNumber, numberOrText(*number)}};
  }
  if (const ValueArray* array = value.asArray()) {
    ValueArray recorded;
    for (const Value& element : *array) recorded.append(recordedValue(element));
    return recorded;
  }
  const ValueMap* map = value.asMap();
  if (map == nullptr) return value;
  ValueMap recorded;
  recorded.reserve(map->size());
  for (const ValueMap::Entry& entry : *map) recorded.set(entry.key, recordedValue(entry.value));
  return meaningOf(recorded, 0.0) ? Value(ValueMap{{kMap, recorded}}) : Value(recorded);
}

}  // namespace tonewerk
