// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <concepts>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <variant>

#include "values/Date.h"
#include "values/SharedString.h"
#include "values/ValueArray.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Holds one property-list value: a boolean, a signed or unsigned 64-bit integer, a double, a text (UTF-8), a
// date, an array or a map. It has 16 bytes; a copy costs at most a reference count.
//
// Equality follows property lists: numbers compare exactly by value, whatever their form; a boolean counts as
// the number 0 or 1; a date never equals a number; NaN equals NaN, so that a value always equals its copy.
class Value {
 public:
  enum class Kind { kBoolean, kInteger, kUnsigned, kDouble, kString, kDate, kArray, kMap };

  // Makes false. A value is never absent: a null pointer or an empty optional stands for absence.
  Value() : value_(false) {}
  // A template, so that a pointer does not convert to a boolean.
  template <std::same_as<bool> T>
  Value(T value) : value_(value) {}
  Value(double value) : value_(value) {}
  Value(SharedString text) : value_(std::move(text)) {}
  Value(std::string_view text) : value_(SharedString(text)) {}
  Value(const std::string& text) : value_(SharedString(text)) {}
  Value(const char* text) : value_(SharedString(text)) {}
  Value(Date date) : value_(date) {}
  Value(ValueArray array) : value_(std::move(array)) {}
  Value(ValueMap map) : value_(std::move(map)) {}
  template <std::signed_integral T>
  Value(T value) : value_(static_cast<std::int64_t>(value)) {}
  template <std::unsigned_integral T>
  requires(!std::same_as<T, bool>) Value(T value) : value_(static_cast<std::uint64_t>(value)) {}

  Kind kind() const { return static_cast<Kind>(value_.index()); }

  // Return a pointer to the held value, or null when it is of another kind.
  const bool* asBoolean() const { return std::get_if<bool>(&value_); }
  const std::int64_t* asInteger() const { return std::get_if<std::int64_t>(&value_); }
  const std::uint64_t* asUnsigned() const { return std::get_if<std::uint64_t>(&value_); }
  const double* asDouble() const { return std::get_if<double>(&value_); }
  const SharedString* asString() const { return std::get_if<SharedString>(&value_); }
  const Date* asDate() const { return std::get_if<Date>(&value_); }
  const ValueArray* asArray() const { return std::get_if<ValueArray>(&value_); }
  const ValueMap* asMap() const { return std::get_if<ValueMap>(&value_); }

  // Convert the value; no conversion fails.
  //
  // A number is true when it is not zero; NaN is true. A text is true when it begins with Y, y, T or t, or
  // when its leading number is not zero. Arrays and maps are false.
  bool boolean() const;
  // A double is truncated and saturates; NaN is 0. An unsigned integer saturates. A text becomes its leading
  // number (spaces, sign, digits, fraction, exponent), or 0 when it has none. A date becomes its seconds.
  // Arrays and maps become 0.
  std::int64_t integer() const;
  // Returns the low 32 bits: those of the integer itself, signed or unsigned, else those of integer().
  std::int32_t integer32() const;
  double number() const;

  // Returns what "%@" prints: integers in decimal, booleans as "1" and "0", doubles as textOf() below, texts
  // unchanged, dates as RFC 3339, arrays and maps as compact JSON.
  std::string text() const;

  // Returns about how many bytes the value holds on the heap, without its own 16 bytes. O(1).
  std::size_t bytes() const;

  friend bool operator==(const Value& a, const Value& b);

 private:
  std::variant<bool, std::int64_t, std::uint64_t, double, SharedString, Date, ValueArray, ValueMap> value_;
};

struct ValueMapEntry {
  SharedString key;
  Value value;
};

// Returns the shortest digits that read back as the same double. The notation is fixed from 1e-4 to below
// 1e16 and scientific ("1e+22") otherwise, without a trailing ".0" (2.0 is "2"). The special values are
// "nan", "inf", "-inf" and "-0".
std::string textOf(double value);

// Returns what "%@" prints for a value that may be absent: "(null)" for null.
std::string textOf(const Value* value);

inline bool booleanOf(const Value* value) { return value != nullptr && value->boolean(); }
inline std::int64_t integerOf(const Value* value) { return value == nullptr ? 0 : value->integer(); }
inline std::int32_t integer32Of(const Value* value) { return value == nullptr ? 0 : value->integer32(); }
inline double numberOf(const Value* value) { return value == nullptr ? 0.0 : value->number(); }

}  // namespace tonewerk
