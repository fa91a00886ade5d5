// SPDX-License-Identifier: Apache-2.0
#include "values/Value.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>
#include <rapidcheck/gtest.h>

#include "support/ValueGenerators.h"

namespace tonewerk {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kTwoTo53 = std::int64_t{1} << 53;

// Returns a value of another form that may be equal to `value`: the same number, or another order of keys.
Value inAnotherForm(const Value& value) {
  if (value.asBoolean() != nullptr) return Value(value.integer());
  if (value.asInteger() != nullptr) return Value(value.number());
  if (value.asUnsigned() != nullptr) return Value(value.integer());
  if (value.asDouble() != nullptr) return Value(value.integer());
  if (const ValueArray* array = value.asArray()) {
    ValueArray other;
    for (const Value& element : *array) other.append(inAnotherForm(element));
    return Value(other);
  }
  if (const ValueMap* map = value.asMap()) {
    ValueMap other;
    for (auto entry = map->end(); entry != map->begin();) {
      --entry;
      other.set(entry->key, inAnotherForm(entry->value));
    }
    return Value(other);
  }
  return value;
}

RC_GTEST_PROP(ValueEqualityTest, AValueEqualsItselfAndItsCopy, ()) {
  const Value value = *generate::value();
  const Value copy = value;  // NOLINT(performance-unnecessary-copy-initialization)
  RC_ASSERT(value == value);
  RC_ASSERT(value == copy);
}

RC_GTEST_PROP(ValueEqualityTest, IsSymmetric, ()) {
  const Value a = *generate::value();
  const Value b = *rc::gen::oneOf(generate::value(), rc::gen::just(inAnotherForm(a)));
  RC_ASSERT((a == b) == (b == a));
}

RC_GTEST_PROP(ValueEqualityTest, IsTransitive, ()) {
  const Value a = *generate::value();
  const Value b = inAnotherForm(a);
  const Value c = *rc::gen::oneOf(rc::gen::just(inAnotherForm(b)), generate::value());
  if (a == b && b == c) RC_ASSERT(a == c);
}

RC_GTEST_PROP(ValueEqualityTest, AnIntegerEqualsADoubleOnlyWhenTheDoubleIsExactlyIt, ()) {
  const std::int64_t integer = *generate::integer();
  const auto rounded = static_cast<double>(integer);
  // A long double has 64 binary digits and so holds both numbers exactly.
  const bool exact = static_cast<long double>(rounded) == static_cast<long double>(integer);
  RC_ASSERT((Value(integer) == Value(rounded)) == exact);
}

RC_GTEST_PROP(ValueEqualityTest, AnUnsignedIntegerEqualsADoubleOnlyWhenTheDoubleIsExactlyIt, ()) {
  const std::uint64_t integer = *generate::unsignedInteger();
  const auto rounded = static_cast<double>(integer);
  const bool exact = static_cast<long double>(rounded) == static_cast<long double>(integer);
  RC_ASSERT((Value(integer) == Value(rounded)) == exact);
}

RC_GTEST_PROP(ValueEqualityTest, ADateNeverEqualsANumber, ()) {
  const Date date = *generate::date();
  RC_ASSERT_FALSE(Value(date) == Value(date.seconds));
  RC_ASSERT_FALSE(Value(static_cast<std::int64_t>(date.seconds)) == Value(date));
}

TEST(ValueEqualityTest, NumbersCompareByValueAcrossTheirForms) {
  EXPECT_EQ(Value(1), Value(1U));
  EXPECT_EQ(Value(1), Value(1.0));
  EXPECT_EQ(Value(true), Value(1));
  EXPECT_EQ(Value(false), Value(0.0));
  EXPECT_EQ(Value(0.0), Value(-0.0));
  EXPECT_EQ(Value(kNaN), Value(kNaN));
  EXPECT_FALSE(Value(1) == Value(1.5));
  EXPECT_FALSE(Value(true) == Value(2));
  EXPECT_FALSE(Value(kNaN) == Value(0));
}

TEST(ValueEqualityTest, IsExactWhereDoublesAreNot) {
  EXPECT_EQ(Value(kTwoTo53), Value(9007199254740992.0));
  EXPECT_FALSE(Value(kTwoTo53 + 1) == Value(9007199254740992.0));
  EXPECT_FALSE(Value(kMax) == Value(9223372036854775808.0));
  EXPECT_EQ(Value(kLeast), Value(-9223372036854775808.0));
  EXPECT_EQ(Value(std::uint64_t{1} << 63), Value(9223372036854775808.0));
  EXPECT_FALSE(Value(std::numeric_limits<std::uint64_t>::max()) == Value(18446744073709551616.0));
  EXPECT_FALSE(Value(-1) == Value(std::numeric_limits<std::uint64_t>::max()));
}

TEST(ValueEqualityTest, OtherKindsAreEqualOnlyToTheirOwnKind) {
  EXPECT_FALSE(Value("1") == Value(1));
  EXPECT_FALSE(Value(ValueArray()) == Value(ValueMap()));
  EXPECT_FALSE(Value("") == Value(false));
  EXPECT_EQ(Value(ValueMap{{"a", 1}, {"b", 2}}), Value(ValueMap{{"b", 2.0}, {"a", true}}));
  EXPECT_FALSE(Value(ValueArray{1, 2}) == Value(ValueArray{2, 1}));
}

TEST(ValueConversionTest, BooleanOfANumberIsNotZero) {
  EXPECT_TRUE(Value(-1).boolean());
  EXPECT_TRUE(Value(0.1).boolean());
  EXPECT_TRUE(Value(kNaN).boolean());
  EXPECT_FALSE(Value(-0.0).boolean());
  EXPECT_FALSE(Value(0U).boolean());
}

TEST(ValueConversionTest, BooleanOfATextLooksAtItsBeginning) {
  for (const char* text : {"Y", "yes", "True", "t", "1", " 2x", "-0.5", "0.1"}) {
    EXPECT_TRUE(Value(text).boolean()) << text;
  }
  for (const char* text : {"", "no", "false", "0", "0.0", " yes", "-", "on"}) {
    EXPECT_FALSE(Value(text).boolean()) << text;
  }
}

TEST(ValueConversionTest, IntegerOfADoubleTruncatesAndSaturates) {
  EXPECT_EQ(Value(2.9).integer(), 2);
  EXPECT_EQ(Value(-2.9).integer(), -2);
  EXPECT_EQ(Value(1e300).integer(), kMax);
  EXPECT_EQ(Value(-kInfinity).integer(), kLeast);
  EXPECT_EQ(Value(kNaN).integer(), 0);
  EXPECT_EQ(Value(9223372036854774784.0).integer(), 9223372036854774784);
  EXPECT_EQ(Value(std::numeric_limits<std::uint64_t>::max()).integer(), kMax);
}

TEST(ValueConversionTest, ATextReadsAsItsLeadingNumber) {
  EXPECT_EQ(Value(" \t+42 apples").integer(), 42);
  EXPECT_EQ(Value("-7").integer(), -7);
  EXPECT_EQ(Value("1.9e2x").integer(), 190);
  EXPECT_EQ(Value("1e").integer(), 1);
  EXPECT_EQ(Value("1e+").number(), 1.0);
  EXPECT_EQ(Value(".5").number(), 0.5);
  EXPECT_EQ(Value("5.").number(), 5.0);
  EXPECT_EQ(Value(".").number(), 0.0);
  EXPECT_EQ(Value("+-5").number(), 0.0);
  EXPECT_EQ(Value("0x10").integer(), 0);
  EXPECT_EQ(Value("nan").number(), 0.0);
  EXPECT_EQ(Value("inf").number(), 0.0);
  EXPECT_EQ(Value("1e999").number(), kInfinity);
  EXPECT_EQ(Value("-1e999").integer(), kLeast);
  EXPECT_EQ(Value("1e-999").number(), 0.0);
  EXPECT_EQ(Value("9223372036854775807").integer(), kMax);
  EXPECT_EQ(Value("9223372036854775808").integer(), kMax);
  EXPECT_EQ(Value("-99999999999999999999").integer(), kLeast);
}

TEST(ValueConversionTest, ADateReadsAsItsSeconds) {
  EXPECT_EQ(Value(Date{1.5}).integer(), 1);
  EXPECT_EQ(Value(Date{1.5}).number(), 1.5);
  EXPECT_TRUE(Value(Date{1.5}).boolean());
}

TEST(ValueConversionTest, ArraysAndMapsReadAsZeroAndFalse) {
  for (const Value& value : {Value(ValueArray{1}), Value(ValueMap{{"a", 1}})}) {
    EXPECT_EQ(value.integer(), 0);
    EXPECT_EQ(value.number(), 0.0);
    EXPECT_FALSE(value.boolean());
  }
}

TEST(ValueConversionTest, ThirtyTwoBitReadingsKeepTheLowBits) {
  EXPECT_EQ(Value(0x1'0000'0001).integer32(), 1);
  EXPECT_EQ(Value(0xFFFF'FFFF).integer32(), -1);
  EXPECT_EQ(Value(0x8000'0000).integer32(), std::numeric_limits<std::int32_t>::min());
  EXPECT_EQ(Value(kLeast).integer32(), 0);
  EXPECT_EQ(Value((std::uint64_t{1} << 63U) + 5).integer32(), 5);  // beyond the range of integer()
  EXPECT_EQ(Value(std::numeric_limits<std::uint64_t>::max()).integer32(), -1);
}

TEST(ValueConversionTest, AnAbsentValueReadsAsZeroFalseOrEmpty) {
  EXPECT_FALSE(booleanOf(nullptr));
  EXPECT_EQ(integerOf(nullptr), 0);
  EXPECT_EQ(numberOf(nullptr), 0.0);
  EXPECT_EQ(textOf(static_cast<const Value*>(nullptr)), "(null)");
}

RC_GTEST_PROP(ValueConversionTest, AnIntegersTextReadsAsTheInteger, ()) {
  const std::int64_t integer = *generate::integer();
  RC_ASSERT(Value(Value(integer).text()).integer() == integer);
}

TEST(ValueTextTest, IsWhatPercentAtPrints) {
  EXPECT_EQ(Value(true).text(), "1");
  EXPECT_EQ(Value(false).text(), "0");
  EXPECT_EQ(Value(-12).text(), "-12");
  EXPECT_EQ(Value(std::numeric_limits<std::uint64_t>::max()).text(), "18446744073709551615");
  EXPECT_EQ(Value("a\"b").text(), "a\"b");
  EXPECT_EQ(Value(Date{0.5}).text(), "1970-01-01T00:00:00.5Z");
  EXPECT_EQ(Value(ValueArray{1, "x", 2.0}).text(), R"([1,"x",2.0])");
  EXPECT_EQ(Value(ValueMap{{"a", true}}).text(), R"({"a":true})");
}

TEST(DoubleTextTest, UsesFixedNotationFromOneTenThousandthToTenQuadrillions) {
  EXPECT_EQ(textOf(2.0), "2");
  EXPECT_EQ(textOf(0.1), "0.1");
  EXPECT_EQ(textOf(-1234.5), "-1234.5");
  EXPECT_EQ(textOf(1e-4), "0.0001");
  EXPECT_EQ(textOf(9.999999999999999e-5), "9.999999999999999e-05");
  EXPECT_EQ(textOf(9999999999999998.0), "9999999999999998");
  EXPECT_EQ(textOf(1e16), "1e+16");
  EXPECT_EQ(textOf(-1e22), "-1e+22");
  EXPECT_EQ(textOf(5e-324), "5e-324");
}

TEST(DoubleTextTest, WritesInfinitiesNanAndNegativeZero) {
  EXPECT_EQ(textOf(kNaN), "nan");
  EXPECT_EQ(textOf(-kNaN), "nan");
  EXPECT_EQ(textOf(kInfinity), "inf");
  EXPECT_EQ(textOf(-kInfinity), "-inf");
  EXPECT_EQ(textOf(0.0), "0");
  EXPECT_EQ(textOf(-0.0), "-0");
}

RC_GTEST_PROP(DoubleTextTest, ReadsBackAsTheSameDouble, ()) {
  const double number = *generate::finiteNumber();
  const double readBack = Value(textOf(number)).number();
  RC_ASSERT(readBack == number);
  RC_ASSERT(std::signbit(readBack) == std::signbit(number));
}

RC_GTEST_PROP(ValueTest, BytesCountWhatIsInside, ()) {
  const Value value = *generate::value();
  struct Recount {
    static std::size_t of(const Value& v) {
      if (v.asString() != nullptr) return v.asString()->size();
      std::size_t bytes = 0;
      if (const ValueArray* array = v.asArray()) {
        for (const Value& element : *array) bytes += sizeof(Value) + of(element);
      }
      if (const ValueMap* map = v.asMap()) {
        for (const ValueMapEntry& entry : *map)
          bytes += sizeof(ValueMapEntry) + entry.key.size() + of(entry.value);
      }
      return bytes;
    }
  };
  RC_ASSERT(value.bytes() == Recount::of(value));
}

TEST(ValueTest, IsSixteenBytes) { EXPECT_EQ(sizeof(Value), 16U); }

}  // namespace
}  // namespace tonewerk
