// SPDX-License-Identifier: Apache-2.0
#include "values/EncodedValue.h"

#include <cstdint>
#include <gtest/gtest.h>
#include <limits>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {
namespace {

std::string encoded(const Value& value) {
  std::string bytes;
  EXPECT_TRUE(appendEncoded(bytes, value));
  return bytes;
}

TEST(EncodedValueTest, ReadsWhatWasEncodedInTheShortestForm) {
  constexpr auto kMax = std::numeric_limits<std::uint64_t>::max();
  const std::pair<Value, std::size_t> kLengths[] = {{true, 1},
                                                    {0, 1},
                                                    {127, 1},
                                                    {128, 2},
                                                    {255, 2},
                                                    {256, 3},
                                                    {65535, 3},
                                                    {65536, 5},
                                                    {1LL << 32, 9},
                                                    {kMax, 9},
                                                    {-1, 1},
                                                    {-32, 1},
                                                    {-33, 2},
                                                    {-128, 2},
                                                    {-129, 3},
                                                    {-32768, 3},
                                                    {-32769, 5},
                                                    {INT64_MIN, 9},
                                                    {2.0, 9},
                                                    {"", 1},
                                                    {std::string(31, 'x'), 32},
                                                    {std::string(32, 'x'), 34},
                                                    {std::string(255, 'x'), 257},
                                                    {std::string(256, 'x'), 259},
                                                    {std::string(65536, 'x'), 65541}};
  for (const auto& [value, length] : kLengths) {
    const std::string bytes = encoded(value);
    EXPECT_EQ(bytes.size(), length) << value.text().substr(0, 40);
    EXPECT_EQ(EncodedValue(bytes.data()).value(), value) << value.text().substr(0, 40);
    EXPECT_EQ(EncodedValue(bytes.data()).kind(), value.kind());
    EXPECT_EQ(EncodedValue(bytes.data()).bytes().size(), length);
  }
}

TEST(EncodedValueTest, EncodesNothingThatHasNoExactForm) {
  std::string bytes;
  for (const Value& value : {Value(Date{0.1}), Value(ValueArray{}), Value(ValueMap{})}) {
    EXPECT_FALSE(appendEncoded(bytes, value));
    EXPECT_EQ(bytes, "");
  }
}

TEST(EncodedValueTest, KnowsWhereEachKindEnds) {
  using namespace std::literals;
  for (const std::string_view bytes :
       {"\xC0"sv, "\x01"sv, "\xA2xy"sv, "\xD9\x02xy"sv, "\xDA\0\x01x"sv, "\xDB\0\0\0\x01x"sv, "\xC4\x01x"sv,
        "\xC7\x01\x05x"sv, "\xC8\0\x01\x05x"sv, "\xC9\0\0\0\x01\x05x"sv, "\xD4\x05x"sv,
        "\xD8\x05"
        "0123456789abcdef"sv,
        "\x92\x01\x02"sv,
        "\x82\xA1"
        "a\x01\xA1"
        "b\x90"sv,
        "\xDC\0\x01\x80"sv, "\xDF\0\0\0\x01\x01\x01"sv, "\xCB\0\0\0\0\0\0\0\0"sv}) {
    EXPECT_EQ(EncodedValue(bytes.data()).bytes(), bytes);
  }
}

TEST(EncodedValueTest, ReadsTheThreeFormsOfADate) {
  using namespace std::literals;
  EXPECT_EQ(encoding::dateOf("\0\0\0\x05"sv), Date{5});
  EXPECT_EQ(encoding::dateOf("\0\0\0\0\xFF\xFF\xFF\xFF"sv), Date{4294967295.0});
  EXPECT_EQ(encoding::dateOf("\x1D\xCD\x65\0\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFE"sv), Date{-1.5});
  EXPECT_FALSE(encoding::dateOf("\0\0\0"sv));
  EXPECT_FALSE(encoding::dateOf("\xFF\xFF\xFF\xFF\0\0\0\0"sv));
}

std::string textOf(std::string_view text) { return encoded(Value(text)); }

// A map whose keys count up, or down. The key with the highest number has `lastValue`.
std::string numberedMap(int count, bool isBackwards, std::string_view lastValue) {
  std::string bytes{'\xDE', '\0', static_cast<char>(count)};
  for (int at = 0; at < count; ++at) {
    const int key = isBackwards ? count - 1 - at : at;
    bytes += textOf("key" + std::to_string(key));
    bytes += key == count - 1 ? std::string(lastValue) : encoded(Value(key));
  }
  return bytes;
}

bool areEqual(const std::string& a, const std::string& b) {
  const bool isEqual = EncodedValue(a.data()) == EncodedValue(b.data());
  EXPECT_EQ(EncodedValue(b.data()) == EncodedValue(a.data()), isEqual);
  EXPECT_EQ(EncodedValue(a.data()).value() == EncodedValue(b.data()).value(), isEqual);
  return isEqual;
}

TEST(EncodedValueTest, ComparesMapsInAnyOrder) {
  for (const int count : {1, 2, 16, 17, 200}) {
    const std::string map = numberedMap(count, false, "\x91\x05");
    EXPECT_TRUE(areEqual(map, numberedMap(count, false, "\x91\x05"))) << count;
    EXPECT_TRUE(areEqual(map, numberedMap(count, true, "\x91\x05"))) << count;
    EXPECT_FALSE(areEqual(map, numberedMap(count, true, "\x91\x06"))) << count;
    EXPECT_FALSE(areEqual(map, numberedMap(count, false, "\x91\x06"))) << count;
    EXPECT_FALSE(areEqual(map, numberedMap(count + 1, true, "\x91\x05")));
  }
  EXPECT_FALSE(
      areEqual("\x82\xA1"
               "a\x01\xA1"
               "b\x02",
               "\x82\xA1"
               "a\x01\xA1"
               "c\x02"));
  EXPECT_FALSE(
      areEqual("\x81\xA1"
               "a\x01",
               "\x91\x01"));
}

TEST(EncodedValueTest, ComparesNumbersByTheirValues) {
  using namespace std::literals;
  EXPECT_TRUE(areEqual("\x92\x05\x07", "\x92\xCC\x05\xCD\0\x07"s));
  EXPECT_TRUE(areEqual("\x91\x02", "\x91\xCA\x40\0\0\0"s));
  EXPECT_FALSE(areEqual("\x91\xCC\x05", "\x91\xCC\x06"));
  EXPECT_FALSE(areEqual("\x91\xCA\x7F\xC0\0\0"s, "\x91\x05"));
  EXPECT_FALSE(areEqual("\x05",
                        "\xA1"
                        "5"));
}

// Each level holds 16 keys in one order or the other, the innermost a long array. Who looks for each key from
// the start of the map walks over the array 16 times on each level.
TEST(EncodedValueTest, ComparesDeeplyNestedMapsInOneWalkForEachLevel) {
  const auto nested = [](bool isBackwards) {
    std::string value{'\xDD', '\0', '\0', '\xC3', '\x50'};
    value.append(50'000, '\x01');
    for (int level = 0; level < 29; ++level) value = numberedMap(16, isBackwards, value);
    return value;
  };
  const std::string forwards = nested(false);
  const std::string same = nested(false);
  const std::string backwards = nested(true);
  EXPECT_TRUE(EncodedValue(forwards.data()) == EncodedValue(same.data()));
  EXPECT_TRUE(EncodedValue(forwards.data()) == EncodedValue(backwards.data()));
  EXPECT_TRUE(EncodedValue(backwards.data()) == EncodedValue(forwards.data()));
}

}  // namespace
}  // namespace tonewerk
