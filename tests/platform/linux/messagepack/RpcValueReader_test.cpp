// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcValueReader.h"

#include <cstddef>
#include <gtest/gtest.h>
#include <string>

#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/protobuf/Hex.h"

namespace tonewerk {
namespace {

constexpr ValuePlace kPlaces[] = {ValuePlace::kArgument, ValuePlace::kResult};

std::string bytesOf(const Value& value) {
  std::string bytes;
  RpcWriter(bytes).value(value);
  return bytes;
}

Value nested(std::size_t depth) {
  Value value = ValueArray{};
  for (std::size_t at = 1; at < depth; ++at)
    value = at % 2 == 0 ? Value(ValueArray{value}) : Value(ValueMap{{"k", value}});
  return value;
}

TEST(RpcValueReaderTest, ReadsWhatTheWriterWrites) {
  const ValueMap map{{"numbers", ValueArray{0, -1, INT64_MIN, UINT64_MAX, 2.0, false}},
                     {"nothing", ValueArray{}},
                     {"text", std::string(70'000, 'x')},
                     {"date", Date{-3.25}},
                     {"none", ValueMap{}}};
  for (const ValuePlace place : kPlaces) {
    for (const Value& value : {Value(map), Value(ValueArray{map, 1}), Value(true), Value(-5),
                               Value(UINT64_MAX), Value(2.0), Value("text")}) {
      EXPECT_EQ(readValue(bytesOf(value), place), value);
    }
  }
}

TEST(RpcValueReaderTest, ReadsNilAndNoBytesAsNone) {
  for (const ValuePlace place : kPlaces) {
    EXPECT_FALSE(readValue(fromHex("C0"), place));
    EXPECT_FALSE(readValue("", place));
  }
}

TEST(RpcValueReaderTest, ReadsLessOrMoreThanOneValueAsNone) {
  const std::string bytes = bytesOf(ValueMap{{"a", ValueArray{1, "two"}}});
  for (const ValuePlace place : kPlaces) {
    for (std::size_t size = 0; size < bytes.size(); ++size)
      EXPECT_FALSE(readValue(std::string_view(bytes).substr(0, size), place));
    EXPECT_TRUE(readValue(bytes, place));
    EXPECT_FALSE(readValue(bytes + fromHex("C3"), place));
  }
}

TEST(RpcValueReaderTest, RefusesValuesOutsideTheProtocol) {
  // Binary data, another extension, a date of another length, a map's key that is not a text, nil in an
  // array, bytes that are not UTF-8, a reserved byte, and an extension of an impossible length.
  for (const char* hex : {"C4 01 00", "D4 05 00", "D4 FF 00", "81 01 01", "91 C0", "A1 FF", "81 A1 FF 01",
                          "C1", "C9 FFFFFFFF FF 00"}) {
    for (const ValuePlace place : kPlaces) EXPECT_FALSE(readValue(fromHex(hex), place)) << hex;
  }
}

TEST(RpcValueReaderTest, TakesANoncharacterInAResultOnly) {
  const std::string bytes = fromHex("A3 EFBFBF");
  EXPECT_FALSE(readValue(bytes, ValuePlace::kArgument));
  EXPECT_TRUE(readValue(bytes, ValuePlace::kResult));
}

TEST(RpcValueReaderTest, NestsAsDeepAsInAFrame) {
  // The frame's own array, and an argument's list, count.
  EXPECT_TRUE(readValue(bytesOf(nested(kMaxFrameDepth - 2)), ValuePlace::kArgument));
  EXPECT_FALSE(readValue(bytesOf(nested(kMaxFrameDepth - 1)), ValuePlace::kArgument));
  EXPECT_TRUE(readValue(bytesOf(nested(kMaxFrameDepth - 1)), ValuePlace::kResult));
  EXPECT_FALSE(readValue(bytesOf(nested(kMaxFrameDepth)), ValuePlace::kResult));
}

TEST(RpcValueReaderTest, ReadsNothingLargerThanAFrame) {
  constexpr std::size_t kHeaderBytes = 5;
  for (const ValuePlace place : kPlaces) {
    EXPECT_TRUE(readValue(bytesOf(Value(std::string(kMaxFrameBytes - kHeaderBytes, 'x'))), place));
    EXPECT_FALSE(readValue(bytesOf(Value(std::string(kMaxFrameBytes - kHeaderBytes + 1, 'x'))), place));
  }
}

}  // namespace
}  // namespace tonewerk
