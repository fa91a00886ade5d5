// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/preferences/TomlText.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <cstdio>
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
  return Date{static_cast<double>(seconds) + time.time.nanosecond / 1e9};
}

bool isTomlDate(Date date) {
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

// Writes values as TOML, with nested tables and arrays on the line of their key.
//
// The library's writer is not used, because it does not escape every key.
class TomlWriter {
 public:
  const std::string& text() const { return text_; }
  // Names a value that TOML cannot express; empty if there is none.
  const std::string& problem() const { return problem_; }

  void writeLines(const ValueMap& map) {
    for (const ValueMapEntry& entry : map) {
      writeEntry(entry);
      text_ += '\n';
    }
  }

 private:
  void writeEntry(const ValueMapEntry& entry) {
    writeKey(entry.key);
    text_ += " = ";
    writeValue(entry.value);
  }

  void writeKey(std::string_view key) {
    const bool isBare = !key.empty() && std::all_of(key.begin(), key.end(), [](char c) {
      return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' ||
             c == '-';
    });
    if (isBare) {
      text_ += key;
    } else {
      writeString(key);
    }
  }

  void writeValue(const Value& value) {
    switch (value.kind()) {
      case Value::Kind::kBoolean:
        text_ += value.boolean() ? "true" : "false";
        return;
      case Value::Kind::kInteger:
        text_ += value.text();
        return;
      case Value::Kind::kUnsigned:
        return writeUnsigned(*value.asUnsigned());
      case Value::Kind::kDouble:
        return writeDouble(*value.asDouble());
      case Value::Kind::kString:
        return writeString(*value.asString());
      case Value::Kind::kDate:
        return writeDate(*value.asDate());
      case Value::Kind::kArray:
        return writeArray(*value.asArray());
      case Value::Kind::kMap:
        return writeTable(*value.asMap());
    }
  }

  void writeUnsigned(std::uint64_t number) {
    if (number > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())) {
      problem_ = std::to_string(number) + " is more than TOML's greatest integer, 9223372036854775807";
    }
    text_ += std::to_string(number);
  }

  void writeDouble(double number) {
    const std::string digits = textOf(number);
    text_ += digits;
    // "2" would be read as an integer. "nan" and "inf" must stay as they are; both have an "n".
    if (digits.find_first_of(".en") == std::string::npos) text_ += ".0";
  }

  void writeDate(Date date) {
    if (!isTomlDate(date)) {
      problem_ = "TOML's dates are those of the years 0 to 9999";
      return;
    }
    const double whole = std::floor(date.seconds);
    const long long nanoseconds = std::min(std::llround((date.seconds - whole) * 1e9), 999'999'999LL);
    std::array<char, 24> fraction{};  // fits any long long, because the compiler does not know the bounds
    std::snprintf(fraction.data(), fraction.size(), ".%09lldZ", nanoseconds);
    text_ += textOf(Date{whole});
    if (nanoseconds == 0) return;
    text_.pop_back();  // the "Z"
    text_ += fraction.data();
  }

  void writeString(std::string_view text) {
    text_ += '"';
    for (const char c : text) {
      if (c == '"' || c == '\\') text_ += '\\';
      const auto code = static_cast<unsigned char>(c);
      if (code >= 0x20 && code != 0x7F) {
        text_ += c;
        continue;
      }
      std::array<char, 8> escape{};
      std::snprintf(escape.data(), escape.size(), "\\u%04X", static_cast<unsigned>(code));
      text_ += escape.data();
    }
    text_ += '"';
  }

  void writeArray(const ValueArray& array) {
    text_ += '[';
    for (const Value& element : array) {
      if (&element != array.begin()) text_ += ", ";
      writeValue(element);
    }
    text_ += ']';
  }

  void writeTable(const ValueMap& map) {
    text_ += '{';
    for (const ValueMapEntry& entry : map) {
      if (&entry != map.begin()) text_ += ", ";
      writeEntry(entry);
    }
    text_ += '}';
  }

  std::string text_;
  std::string problem_;
};

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
  TomlWriter writer;
  writer.writeLines(map);
  problem = writer.problem();
  if (!problem.empty()) return std::nullopt;
  // If a value could not be read again (a text that is not UTF-8, or values nested too deeply), all other
  // values in the file would be lost, too.
  std::string unreadable;
  const std::optional<ValueMap> readBack = parseToml(writer.text(), unreadable);
  if (readBack && *readBack == map) return writer.text();
  problem = readBack ? "TOML cannot express the value" : "TOML cannot express the value (" + unreadable + ")";
  return std::nullopt;
}

std::optional<Value> parseTomlValue(std::string_view text) {
  // After a line break, the text could contain a second key.
  if (text.find_first_of("\r\n") != std::string_view::npos) return std::nullopt;
  std::string problem;
  const std::optional<ValueMap> parsed = parseToml("value = " + std::string(text), problem);
  const Value* value = parsed ? parsed->find("value") : nullptr;
  return value == nullptr ? std::nullopt : std::optional(*value);
}

}  // namespace tonewerk
