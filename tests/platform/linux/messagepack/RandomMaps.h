// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>
#include <limits>
#include <random>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Makes random maps, and writes them in forms that our own writer never uses but clients may: every width of
// a number, a header longer than necessary, keys in another order or twice, and values that are not allowed.
// The same seed makes the same maps.
//
// rapidcheck is not used, because it needs a hundred times longer for a map.
class RandomMaps {
 public:
  explicit RandomMaps(std::uint64_t seed) : random_(seed) {}

  std::size_t below(std::size_t limit) { return static_cast<std::size_t>(random_() % limit); }
  bool isOneIn(std::size_t count) { return below(count) == 0; }

  ValueMap map() {
    const std::size_t keys = isOneIn(400) ? below(601) : isOneIn(20) ? below(60) : below(14);
    return map(keys, 2);
  }

  // Returns the map with one entry changed, added or removed.
  ValueMap changed(ValueMap map) {
    if (map.empty() || isOneIn(4)) {
      map.set(key(), value(1));
    } else if (isOneIn(4)) {
      map.erase((map.begin() + below(map.size()))->key);
    } else {
      map.set((map.begin() + below(map.size()))->key, value(1));
    }
    return map;
  }

  std::string key() {
    static const std::vector<std::string> kUsual = {
        "twreporting_timestamp", "level", "active_devices", "a", "", "with space", "quote\"",
        "\xC3\xA9t\xC3\xA9"};
    if (!isOneIn(3)) return kUsual[below(kUsual.size())];
    return "key" + std::to_string(below(isOneIn(50) ? 100'000 : 40));
  }

  // Writes values, with doubled keys and forbidden values when asked to.
  struct Faults {
    bool doubledKeys = false;
    bool forbiddenValues = false;
    bool otherOrder = false;
    bool otherNumbers = false;  // integers as doubles and booleans, and back, where they stay equal
  };
  std::string bytesOf(const ValueMap& map, Faults faults) {
    std::string out;
    faults_ = faults;
    write(out, map);
    return out;
  }

 private:
  ValueMap map(std::size_t keys, int depth) {
    ValueMap made;
    for (std::size_t at = 0; at < keys; ++at)
      made.set(keys > 60 ? "key" + std::to_string(at) : key(), value(depth));
    return made;
  }

  Value value(int depth) {
    switch (below(depth > 0 ? 12 : 10)) {
      case 0:
        return isOneIn(2);
      case 1:
      case 2:
        return integer();
      case 3:
        return std::numeric_limits<std::uint64_t>::max() - below(isOneIn(2) ? 3 : 1U << 31U);
      case 4:
      case 5:
        return number();
      case 6:
        return Date{std::floor(number())};
      case 7:
        return Date{1.79e9 + static_cast<double>(below(1'000'000)) / 1e3};
      case 8:
      case 9:
        return text();
      case 10:
        return array(depth - 1);
      default:
        return map(isOneIn(30) ? below(30) : below(5), depth - 1);
    }
  }

  Value array(int depth) {
    std::vector<Value> values(isOneIn(50) ? below(70) : below(5));
    for (Value& element : values) element = value(depth);
    return ValueArray(std::move(values));
  }

  std::int64_t integer() {
    if (isOneIn(3)) return static_cast<std::int64_t>(below(6)) - 3;
    const auto power = static_cast<std::uint64_t>(1) << below(64);
    const std::uint64_t near = power + below(5) - 2;
    return static_cast<std::int64_t>(isOneIn(2) ? near : 0 - near);
  }

  double number() {
    static const double kEdges[] = {0.0,
                                    -0.0,
                                    0.1,
                                    2.0,
                                    1e-4,
                                    9.999999999999999e-5,
                                    1e16,
                                    9999999999999998.0,
                                    1e22,
                                    5e-324,
                                    9223372036854775808.0,
                                    -9223372036854775808.0,
                                    18446744073709551616.0,
                                    1790000000.25,
                                    1790000000.123456,
                                    std::numeric_limits<double>::max(),
                                    std::numeric_limits<double>::infinity(),
                                    -std::numeric_limits<double>::infinity(),
                                    std::numeric_limits<double>::quiet_NaN()};
    switch (below(4)) {
      case 0:
        return kEdges[below(std::size(kEdges))];
      case 1:
        return static_cast<double>(static_cast<float>(random_()));
      case 2:
        return 1.79e9 + static_cast<double>(random_() % (1U << 30U)) / 1e6;
      default:
        return std::bit_cast<double>(random_());
    }
  }

  std::string text() {
    static const std::string kPieces[] = {
        "Speaker",          "x",  " ",  "\"", "\\", "\n", "\x01", "\xC3\xA9",
        "\xF0\x9F\x8E\xB5", "12", "-3", ".5", "e2", "Y",  "t",    "48000 Hz, 2 ch, Float32"};
    std::string made;
    for (std::size_t left = isOneIn(200)  ? below(20'000)
                            : isOneIn(10) ? below(40)
                                          : below(4);
         left > 0; --left)
      made += kPieces[below(std::size(kPieces))];
    return made;
  }

  static void bigEndian(std::string& out, unsigned first, std::uint64_t number, std::size_t bytes) {
    out += static_cast<char>(first);
    for (std::size_t left = bytes; left > 0; --left)
      out += static_cast<char>(number >> (8 * (left - 1)) & 0xFFU);
  }

  // Writes a header with a size in one of the forms that hold it.
  void header(std::string& out, unsigned fixed, std::size_t fixedLimit, std::vector<unsigned> longer,
              std::vector<std::size_t> widths, std::size_t size) {
    if (size < fixedLimit && !isOneIn(5)) {
      out += static_cast<char>(fixed + size);
      return;
    }
    for (std::size_t form = 0; form < longer.size(); ++form) {
      const bool fits = widths[form] >= 8 || size >> (8 * widths[form]) == 0;
      if (fits && (form + 1 == longer.size() || !isOneIn(5)))
        return bigEndian(out, longer[form], size, widths[form]);
    }
  }

  void write(std::string& out, std::string_view text) {
    header(out, 0xA0, 32, {0xD9, 0xDA, 0xDB}, {1, 2, 4}, text.size());
    out += text;
  }

  void write(std::string& out, std::int64_t number) {
    const auto bits = static_cast<std::uint64_t>(number);
    if (number >= -32 && number < 128 && !isOneIn(5)) {
      out += static_cast<char>(number);
      return;
    }
    for (unsigned power = isOneIn(3) ? static_cast<unsigned>(below(4)) : 0; power < 4; ++power) {
      const unsigned width = 1U << power;
      const unsigned unused = 64 - 8 * width;
      const bool fitsSigned = static_cast<std::int64_t>(bits << unused) >> unused == number;
      const bool fitsUnsigned = number >= 0 && bits << unused >> unused == bits;
      if (fitsUnsigned && (!fitsSigned || isOneIn(2))) return bigEndian(out, 0xCC + power, bits, width);
      if (fitsSigned) return bigEndian(out, 0xD0 + power, bits, width);
    }
    bigEndian(out, 0xD3, bits, 8);
  }

  void write(std::string& out, double number) {
    const auto narrow = static_cast<float>(number);
    if (static_cast<double>(narrow) == number && isOneIn(2))
      return bigEndian(out, 0xCA, std::bit_cast<std::uint32_t>(narrow), 4);
    bigEndian(out, 0xCB, std::bit_cast<std::uint64_t>(number), 8);
  }

  void write(std::string& out, Date date) {
    const bool isNear = date.seconds >= -9e15 && date.seconds < 9e15;
    const double whole = isNear ? std::floor(date.seconds) : 0.0;
    const auto seconds = static_cast<std::uint64_t>(static_cast<std::int64_t>(whole));
    const std::uint64_t nanoseconds =
        isNear ? static_cast<std::uint64_t>((date.seconds - whole) * 1e9) % 1'000'000'000 : 0;
    if (nanoseconds == 0 && seconds >> 32U == 0 && !isOneIn(3)) {
      extension(out, 4);
      bigEndian(out, 0xFF, seconds, 4);
    } else if (seconds >> 34U == 0 && !isOneIn(3)) {
      extension(out, 8);
      bigEndian(out, 0xFF, nanoseconds << 34U | seconds, 8);
    } else {
      extension(out, 12);
      bigEndian(out, 0xFF, nanoseconds, 4);
      const std::uint64_t bits = seconds;
      std::string rest;
      bigEndian(rest, 0, bits, 8);
      out += rest.substr(1);
    }
  }

  // The header of an extension without its type.
  void extension(std::string& out, std::size_t size) {
    if (size != 12 && !isOneIn(5)) {
      out += static_cast<char>(size == 4 ? 0xD6 : 0xD7);
    } else {
      header(out, 0, 0, {0xC7, 0xC8, 0xC9}, {1, 2, 4}, size);
    }
  }

  void forbidden(std::string& out) {
    static const std::vector<std::string> kForbidden = {
        std::string("\xC0"),
        std::string("\xC4\x01x"),
        std::string("\xC5\x00\x01x", 4),
        std::string("\xD4\x05x"),
        std::string("\xD4\xFFx"),
        std::string("\xC7\x00\xFF", 3),
        std::string("\xD7\xFF\xFF\xFF\xFF\xFF\x00\x00\x00\x00", 10),
        std::string("\xA1\xFF"),
        std::string("\xA3\xEF\xBF\xBF"),
        std::string("\x91\xC0"),
        std::string("\x81\x01\x01"),
        std::string("\x81\xA1\xFF\x01"),
        std::string("\x81\xC0\x01"),
        std::string("\x81\xA1k\xC0"),
        std::string("\x81\x91\xC0\x01"),
        std::string("\x81\x90\x01"),
        std::string("\x81\xA3\xEF\xBF\xBF\x01"),
        std::string("\x82\xA1k\x01\xA1k\x02"),
        std::string("\x81\xCB\x00\x00\x00\x00\x00\x00\x00\x00\x01", 11),
        std::string("\xD8\xFF") + std::string(16, 'x')};
    out += kForbidden[below(kForbidden.size())];
  }

  void write(std::string& out, const Value& value) {
    if (faults_.forbiddenValues && isOneIn(20)) return forbidden(out);
    if (faults_.otherNumbers && value.kind() <= Value::Kind::kDouble && isOneIn(2)) {
      for (const Value& form : {Value(value.number()), Value(value.integer()), Value(value.boolean())}) {
        if (form == value && isOneIn(2)) return writeAsItIs(out, form);
      }
    }
    writeAsItIs(out, value);
  }

  void writeAsItIs(std::string& out, const Value& value) {
    switch (value.kind()) {
      case Value::Kind::kBoolean:
        out += *value.asBoolean() ? '\xC3' : '\xC2';
        return;
      case Value::Kind::kInteger:
        return write(out, *value.asInteger());
      case Value::Kind::kUnsigned:
        return bigEndian(out, 0xCF, *value.asUnsigned(), 8);
      case Value::Kind::kDouble:
        return write(out, *value.asDouble());
      case Value::Kind::kString:
        return write(out, value.asString()->view());
      case Value::Kind::kDate:
        return write(out, *value.asDate());
      case Value::Kind::kMap:
        return write(out, *value.asMap());
      case Value::Kind::kArray:
        break;
    }
    header(out, 0x90, 16, {0xDC, 0xDD}, {2, 4}, value.asArray()->size());
    for (const Value& element : *value.asArray()) write(out, element);
  }

  void write(std::string& out, const ValueMap& map) {
    std::vector<ValueMapEntry> entries(map.begin(), map.end());
    if (faults_.otherOrder) std::shuffle(entries.begin(), entries.end(), random_);
    if (faults_.doubledKeys && !entries.empty() && isOneIn(3)) {
      entries.push_back({entries[below(entries.size())].key, value(0)});
    }
    header(out, 0x80, 16, {0xDE, 0xDF}, {2, 4}, entries.size());
    for (const ValueMapEntry& entry : entries) {
      if (faults_.forbiddenValues && isOneIn(40)) {
        forbidden(out);
      } else {
        write(out, entry.key.view());
      }
      write(out, entry.value);
    }
  }

  std::mt19937_64 random_;
  Faults faults_;
};

}  // namespace tonewerk
