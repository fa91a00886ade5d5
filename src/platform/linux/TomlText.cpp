// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/TomlText.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <limits>
#include <sstream>
#include <toml++/toml.h>

namespace tonewerk {
namespace {

Date dateOf(const toml::date_time& time) {
  using std::chrono::sys_days;
  const sys_days day = std::chrono::year(time.date.year) / static_cast<int>(time.date.month) / time.date.day;
  const auto whole = day.time_since_epoch() + std::chrono::hours(time.time.hour) +
                     std::chrono::minutes(time.time.minute) + std::chrono::seconds(time.time.second) -
                     std::chrono::minutes(time.offset->minutes);
  const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(whole).count();
  return Date{static_cast<double>(seconds) + time.time.nanosecond * 1e-9};
}

// Only for dates that TOML can say.
toml::date_time timeOf(Date date) {
  const double floored = std::floor(date.seconds);
  const std::chrono::nanoseconds fraction(
      std::min(std::llround((date.seconds - floored) * 1e9), 999'999'999LL));
  const std::chrono::sys_seconds time{std::chrono::seconds(static_cast<std::int64_t>(floored))};
  const auto day = std::chrono::floor<std::chrono::days>(time);
  const std::chrono::year_month_day calendar(day);
  const std::chrono::hh_mm_ss clock(time - day);
  return {
      toml::date{static_cast<int>(calendar.year()), static_cast<unsigned>(calendar.month()),
                 static_cast<unsigned>(calendar.day())},
      toml::time{static_cast<unsigned>(clock.hours().count()), static_cast<unsigned>(clock.minutes().count()),
                 static_cast<unsigned>(clock.seconds().count()), static_cast<unsigned>(fraction.count())},
      toml::time_offset{}};
}

bool canBeSaid(Date date) {
  constexpr double kFirst = -62167219200.0;  // 0000-01-01T00:00:00Z
  constexpr double kEnd = 253402300800.0;    // 10000-01-01T00:00:00Z
  return date.seconds >= kFirst && date.seconds < kEnd;
}

template <typename T>
std::string streamed(const T& value) {
  std::ostringstream out;
  out << value;
  return out.str();
}

ValueMap valuesOf(const toml::table& table);

Value valueOf(const toml::node& node) {
  if (const auto* text = node.as_string()) return Value(text->get());
  if (const auto* integer = node.as_integer()) return Value(integer->get());
  if (const auto* number = node.as_floating_point()) return Value(number->get());
  if (const auto* boolean = node.as_boolean()) return Value(boolean->get());
  if (const auto* date = node.as_date()) return Value(streamed(date->get()));
  if (const auto* time = node.as_time()) return Value(streamed(time->get()));
  if (const auto* table = node.as_table()) return Value(valuesOf(*table));
  if (const auto* time = node.as_date_time()) {
    return time->get().is_local() ? Value(streamed(time->get())) : Value(dateOf(time->get()));
  }
  ValueArray array;
  for (const toml::node& element : *node.as_array()) array.append(valueOf(element));
  return Value(std::move(array));
}

ValueMap valuesOf(const toml::table& table) {
  ValueMap map;
  for (const auto& [key, node] : table) map.set(key.str(), valueOf(node));
  return map;
}

// Where a converted value goes: to the end of an array or under a key of a table.
class Place {
 public:
  explicit Place(toml::array& array) : array_(&array) {}
  Place(toml::table& table, std::string_view key) : table_(&table), key_(key) {}

  template <typename T>
  void put(T&& converted) {
    if (array_ != nullptr) {
      array_->push_back(std::forward<T>(converted));
    } else {
      table_->insert_or_assign(key_, std::forward<T>(converted));
    }
  }

 private:
  toml::array* array_ = nullptr;
  toml::table* table_ = nullptr;
  std::string_view key_;
};

toml::table tableOf(const ValueMap& map, std::string& problem);
toml::array arrayOf(const ValueArray& values, std::string& problem);

// Puts `value` in its place, or says in `problem` why that cannot be.
void convert(const Value& value, Place place, std::string& problem) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return place.put(*value.asBoolean());
    case Value::Kind::kInteger:
      return place.put(*value.asInteger());
    case Value::Kind::kDouble:
      return place.put(*value.asDouble());
    case Value::Kind::kString:
      return place.put(value.asString()->string());
    case Value::Kind::kMap:
      return place.put(tableOf(*value.asMap(), problem));
    case Value::Kind::kArray:
      return place.put(arrayOf(*value.asArray(), problem));
    case Value::Kind::kUnsigned:
      if (*value.asUnsigned() <= static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())) {
        return place.put(static_cast<std::int64_t>(*value.asUnsigned()));
      }
      problem = value.text() + " is more than the greatest integer that TOML has, 9223372036854775807";
      return;
    case Value::Kind::kDate:
      if (canBeSaid(*value.asDate())) return place.put(timeOf(*value.asDate()));
      problem = "TOML's dates are those of the years 0 to 9999";
      return;
  }
}

toml::array arrayOf(const ValueArray& values, std::string& problem) {
  toml::array array;
  for (const Value& value : values) convert(value, Place(array), problem);
  return array;
}

toml::table tableOf(const ValueMap& map, std::string& problem) {
  toml::table table;
  for (const ValueMap::Entry& entry : map) convert(entry.value, Place(table, entry.key.view()), problem);
  return table;
}

}  // namespace

std::optional<ValueMap> parseToml(std::string_view text, std::string& problem) {
  try {
    return valuesOf(toml::parse(text));
  } catch (const toml::parse_error& error) {
    const toml::source_position at = error.source().begin;
    problem =
        std::to_string(at.line) + ":" + std::to_string(at.column) + ": " + std::string(error.description());
  } catch (const std::exception& error) {
    problem = std::string("1:1: ") + error.what();
  }
  return std::nullopt;
}

std::optional<std::string> tomlText(const ValueMap& map, std::string& problem) {
  problem.clear();
  std::string text;
  try {
    const toml::table table = tableOf(map, problem);
    if (!problem.empty()) return std::nullopt;
    std::ostringstream out;
    if (!table.empty()) out << table << '\n';
    text = out.str();
  } catch (const std::exception& error) {
    problem = error.what();
    return std::nullopt;
  }
  // What cannot be read again (texts that are no UTF-8, values nested too deeply) would lose everything else
  // in the file, too.
  std::string unreadable;
  const std::optional<ValueMap> readBack = parseToml(text, unreadable);
  if (readBack && *readBack == map) return text;
  problem = readBack ? "TOML cannot express the value" : "TOML cannot express the value (" + unreadable + ")";
  return std::nullopt;
}

std::optional<Value> parseTomlValue(std::string_view text) {
  // A line break would let the text say more than one value.
  if (text.find_first_of("\r\n") != std::string_view::npos) return std::nullopt;
  std::string problem;
  const std::optional<ValueMap> parsed = parseToml("value = " + std::string(text), problem);
  const Value* value = parsed ? parsed->find("value") : nullptr;
  return value == nullptr ? std::nullopt : std::optional(*value);
}

}  // namespace tonewerk
