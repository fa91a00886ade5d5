// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <limits>
#include <ostream>
#include <rapidcheck.h>
#include <string>
#include <utility>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Let rapidcheck print values in messages of failed tests.
inline void showValue(const Value& value, std::ostream& out) {
  out << value.text() << " (kind " << static_cast<int>(value.kind()) << ")";
}
inline void showValue(const ValueMap& map, std::ostream& out) { out << map.text(); }

// Generate arbitrary values for property-based tests, with many edge cases: 2^53 and 2^63, NaN and the
// infinities, empty texts and texts with control characters, dates far away, nested maps, and maps large
// enough for an index.
//
//   RC_GTEST_PROP(ValueTest, EqualsItself, ()) {
//     const Value value = *generate::value();
//     RC_ASSERT(value == value);
//   }
namespace generate {

inline std::string utf8Of(const std::vector<std::uint32_t>& codePoints) {
  std::string text;
  const auto add = [&](std::uint32_t byte) { text += static_cast<char>(static_cast<unsigned char>(byte)); };
  for (const std::uint32_t c : codePoints) {
    if (c < 0x80) {
      add(c);
    } else if (c < 0x800) {
      add(0xC0 | (c >> 6));
      add(0x80 | (c & 63));
    } else if (c < 0x10000) {
      add(0xE0 | (c >> 12));
      add(0x80 | ((c >> 6) & 63));
      add(0x80 | (c & 63));
    } else {
      add(0xF0 | (c >> 18));
      add(0x80 | ((c >> 12) & 63));
      add(0x80 | ((c >> 6) & 63));
      add(0x80 | (c & 63));
    }
  }
  return text;
}

inline rc::Gen<std::string> text() {
  const auto codePoint =
      rc::gen::oneOf(rc::gen::inRange<std::uint32_t>(0x20, 0x7F), rc::gen::inRange<std::uint32_t>(0, 0x80),
                     rc::gen::element<std::uint32_t>(0, '\n', '\r', '\t', '"', '\'', '\\', 0x7F, 0x80, 0x7FF,
                                                     0x800, 0xE000, 0xFFFC, 0xFFFD, 0x10000, 0x10FFFD));
  return rc::gen::map(rc::gen::container<std::vector<std::uint32_t>>(codePoint), utf8Of);
}

inline rc::Gen<std::int64_t> integer() {
  constexpr std::int64_t kTwoTo53 = std::int64_t{1} << 53;
  return rc::gen::oneOf(rc::gen::arbitrary<std::int64_t>(), rc::gen::inRange<std::int64_t>(-3, 4),
                        rc::gen::element<std::int64_t>(kTwoTo53 - 1, kTwoTo53, kTwoTo53 + 1, -kTwoTo53 - 1,
                                                       std::numeric_limits<std::int64_t>::max() - 1,
                                                       std::numeric_limits<std::int64_t>::max(),
                                                       std::numeric_limits<std::int64_t>::min()));
}

inline rc::Gen<std::uint64_t> unsignedInteger() {
  return rc::gen::oneOf(
      rc::gen::arbitrary<std::uint64_t>(), rc::gen::inRange<std::uint64_t>(0, 4),
      rc::gen::element<std::uint64_t>((std::uint64_t{1} << 53) + 1, (std::uint64_t{1} << 63) - 1,
                                      std::uint64_t{1} << 63, (std::uint64_t{1} << 63) + 1,
                                      std::numeric_limits<std::uint64_t>::max()));
}

inline rc::Gen<double> finiteNumber() {
  return rc::gen::oneOf(
      rc::gen::arbitrary<double>(), rc::gen::cast<double>(rc::gen::inRange(-3, 4)),
      rc::gen::element(0.0, -0.0, 0.1, 1e-4, 9.999999999999999e-5, 1e16, 9999999999999998.0, 1e22, 5e-324,
                       9007199254740992.0, 9007199254740993.0, 9223372036854775808.0, -9223372036854775808.0,
                       18446744073709551616.0, std::numeric_limits<double>::max(),
                       std::numeric_limits<double>::min()));
}

inline rc::Gen<double> number() {
  return rc::gen::weightedOneOf<double>(
      {{9, finiteNumber()},
       {1, rc::gen::element(std::numeric_limits<double>::infinity(), -std::numeric_limits<double>::infinity(),
                            std::numeric_limits<double>::quiet_NaN())}});
}

// Generates dates of the years 0 to 9999, to the microsecond.
inline rc::Gen<Date> date() {
  return rc::gen::apply(
      [](std::int64_t seconds, int micros) {
        return Date{static_cast<double>(seconds) + static_cast<double>(micros) / 1e6};
      },
      rc::gen::oneOf(rc::gen::inRange<std::int64_t>(1'600'000'000, 1'900'000'000),
                     rc::gen::inRange<std::int64_t>(-62'167'219'200, 253'402'300'799),
                     rc::gen::element<std::int64_t>(0, -1, -62'167'219'200, 253'402'300'799)),
      rc::gen::oneOf(rc::gen::just(0), rc::gen::inRange(0, 1'000'000)));
}

inline rc::Gen<Value> scalar() {
  const auto asValue = [](auto held) { return Value(std::move(held)); };
  return rc::gen::oneOf(rc::gen::map(rc::gen::arbitrary<bool>(), asValue), rc::gen::map(integer(), asValue),
                        rc::gen::map(unsignedInteger(), asValue), rc::gen::map(number(), asValue),
                        rc::gen::map(text(), asValue), rc::gen::map(date(), asValue));
}

// Generates arbitrary keys, and a few keys often, so that maps have keys in common.
inline rc::Gen<std::string> key() {
  return rc::gen::oneOf(
      rc::gen::element<std::string>("a", "b", "c", "", "level", "reporterID"),
      rc::gen::map(rc::gen::inRange(0, 40), [](int n) { return "key" + std::to_string(n); }), text());
}

inline rc::Gen<Value> value(int depth = 3);

inline rc::Gen<ValueMap> map(int depth = 3) {
  return rc::gen::map(rc::gen::scale(0.4, rc::gen::container<std::vector<std::pair<std::string, Value>>>(
                                              rc::gen::pair(key(), value(depth - 1)))),
                      [](const std::vector<std::pair<std::string, Value>>& entries) {
                        ValueMap made;
                        for (const auto& [name, held] : entries) made.set(name, held);
                        return made;
                      });
}

inline rc::Gen<Value> value(int depth) {
  if (depth <= 0) return scalar();
  const auto nested = rc::gen::lazy([depth] {
    return rc::gen::oneOf(
        rc::gen::map(map(depth), [](ValueMap held) { return Value(std::move(held)); }),
        rc::gen::map(rc::gen::scale(0.3, rc::gen::container<std::vector<Value>>(value(depth - 1))),
                     [](std::vector<Value> held) { return Value(ValueArray(std::move(held))); }));
  });
  return rc::gen::weightedOneOf<Value>({{4, scalar()}, {1, nested}});
}

}  // namespace generate
}  // namespace tonewerk
