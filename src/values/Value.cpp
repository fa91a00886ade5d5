// SPDX-License-Identifier: Apache-2.0
#include "values/Value.h"

#include <charconv>
#include <cmath>
#include <limits>
#include <optional>
#include <type_traits>

#include "values/CompactJson.h"
#include "values/Conversions.h"
#include "values/Decimal.h"

namespace tonewerk {
namespace {

constexpr double kTwoTo63 = 9223372036854775808.0;
constexpr double kTwoTo64 = 18446744073709551616.0;

bool sameNumber(std::int64_t a, std::uint64_t b) { return a >= 0 && static_cast<std::uint64_t>(a) == b; }
bool sameNumber(std::int64_t a, double b) {
  return b >= -kTwoTo63 && b < kTwoTo63 && std::trunc(b) == b && static_cast<std::int64_t>(b) == a;
}
bool sameNumber(std::uint64_t a, double b) {
  return b >= 0.0 && b < kTwoTo64 && std::trunc(b) == b && static_cast<std::uint64_t>(b) == a;
}
bool sameDouble(double a, double b) { return a == b || (std::isnan(a) && std::isnan(b)); }

// A boolean counts as the integer 0 or 1.
std::optional<std::int64_t> signedOf(const Value& value) {
  if (const bool* boolean = value.asBoolean()) return *boolean ? 1 : 0;
  if (const std::int64_t* integer = value.asInteger()) return *integer;
  return std::nullopt;
}

bool equalNumbers(const Value& a, const Value& b) {
  const std::optional<std::int64_t> signedA = signedOf(a);
  const std::optional<std::int64_t> signedB = signedOf(b);
  if (signedA && signedB) return *signedA == *signedB;
  const std::uint64_t* unsignedA = a.asUnsigned();
  const std::uint64_t* unsignedB = b.asUnsigned();
  if (unsignedA != nullptr && unsignedB != nullptr) return *unsignedA == *unsignedB;
  if (signedA && unsignedB != nullptr) return sameNumber(*signedA, *unsignedB);
  if (unsignedA != nullptr && signedB) return sameNumber(*signedB, *unsignedA);
  const double* doubleA = a.asDouble();
  const double* doubleB = b.asDouble();
  if (doubleA != nullptr && doubleB != nullptr) return sameDouble(*doubleA, *doubleB);
  if (doubleA != nullptr) return signedB ? sameNumber(*signedB, *doubleA) : sameNumber(*unsignedB, *doubleA);
  return signedA ? sameNumber(*signedA, *doubleB) : sameNumber(*unsignedA, *doubleB);
}

bool isNumber(Value::Kind kind) { return kind <= Value::Kind::kDouble; }

template <typename T>
std::string decimal(T number) {
  char digits[24];
  const auto end = std::to_chars(digits, digits + sizeof(digits), number).ptr;
  return {digits, end};
}

}  // namespace

bool Value::boolean() const {
  switch (kind()) {
    case Kind::kBoolean:
      return *asBoolean();
    case Kind::kInteger:
      return *asInteger() != 0;
    case Kind::kUnsigned:
      return *asUnsigned() != 0;
    case Kind::kDouble:
      return *asDouble() != 0.0;
    case Kind::kString:
      return booleanOfText(*asString());
    case Kind::kDate:
      return asDate()->seconds != 0.0;
    case Kind::kArray:
    case Kind::kMap:
      return false;
  }
  return false;
}

std::int64_t Value::integer() const {
  switch (kind()) {
    case Kind::kBoolean:
      return *asBoolean() ? 1 : 0;
    case Kind::kInteger:
      return *asInteger();
    case Kind::kUnsigned: {
      constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();
      return *asUnsigned() > static_cast<std::uint64_t>(kMax) ? kMax
                                                              : static_cast<std::int64_t>(*asUnsigned());
    }
    case Kind::kDouble:
      return saturatedInteger(*asDouble());
    case Kind::kString:
      return integerOfText(*asString());
    case Kind::kDate:
      return saturatedInteger(asDate()->seconds);
    case Kind::kArray:
    case Kind::kMap:
      return 0;
  }
  return 0;
}

std::int32_t Value::integer32() const {
  const std::uint64_t* number = asUnsigned();
  return static_cast<std::int32_t>(number == nullptr ? static_cast<std::uint64_t>(integer()) : *number);
}

double Value::number() const {
  switch (kind()) {
    case Kind::kBoolean:
      return *asBoolean() ? 1.0 : 0.0;
    case Kind::kInteger:
      return static_cast<double>(*asInteger());
    case Kind::kUnsigned:
      return static_cast<double>(*asUnsigned());
    case Kind::kDouble:
      return *asDouble();
    case Kind::kString:
      return numberOfText(*asString());
    case Kind::kDate:
      return asDate()->seconds;
    case Kind::kArray:
    case Kind::kMap:
      return 0.0;
  }
  return 0.0;
}

std::string Value::text() const {
  switch (kind()) {
    case Kind::kBoolean:
      return *asBoolean() ? "1" : "0";
    case Kind::kInteger:
      return decimal(*asInteger());
    case Kind::kUnsigned:
      return decimal(*asUnsigned());
    case Kind::kDouble:
      return textOf(*asDouble());
    case Kind::kString:
      return asString()->string();
    case Kind::kDate:
      return textOf(*asDate());
    case Kind::kArray:
    case Kind::kMap: {
      std::string out;
      appendCompactJson(out, *this);
      return out;
    }
  }
  return {};
}

std::size_t Value::bytes() const {
  switch (kind()) {
    case Kind::kString:
      return asString()->size();
    case Kind::kArray:
      return asArray()->bytes();
    case Kind::kMap:
      return asMap()->bytes();
    default:
      return 0;
  }
}

bool operator==(const Value& a, const Value& b) {
  if (isNumber(a.kind()) && isNumber(b.kind())) return equalNumbers(a, b);
  if (a.kind() != b.kind()) return false;
  switch (a.kind()) {
    case Value::Kind::kString:
      return *a.asString() == *b.asString();
    case Value::Kind::kDate:
      return *a.asDate() == *b.asDate();
    case Value::Kind::kArray:
      return *a.asArray() == *b.asArray();
    case Value::Kind::kMap:
      return *a.asMap() == *b.asMap();
    default:
      return false;
  }
}

std::string textOf(double value) {
  if (std::isnan(value)) return "nan";
  if (std::isinf(value)) return value < 0 ? "-inf" : "inf";
  char digits[kMaxDigits];
  return {digits, digitsOf(value, digits)};
}

std::string textOf(const Value* value) { return value == nullptr ? "(null)" : value->text(); }

}  // namespace tonewerk
