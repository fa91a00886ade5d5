// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcTimestamp.h"

#include <gmock/gmock.h>
#include <limits>

#include "platform/linux/protobuf/Hex.h"

namespace tonewerk {
namespace {

TEST(RpcTimestampTest, ReadsSecondsOfThirtyTwoBits) {
  EXPECT_EQ(dateOfTimestamp(fromHex("00000000")), Date{0.0});
  EXPECT_EQ(dateOfTimestamp(fromHex("FFFFFFFF")), Date{4294967295.0});
}

TEST(RpcTimestampTest, ReadsNanosecondsAndThirtyFourBits) {
  // 500,000,000 ns in the upper 30 bits, 2^34 - 1 s in the lower 34.
  EXPECT_EQ(dateOfTimestamp(fromHex("77359403 FFFFFFFF")), Date{17179869183.5});
}

TEST(RpcTimestampTest, ReadsNanosecondsAndSixtyFourSignedBits) {
  EXPECT_EQ(dateOfTimestamp(fromHex("1DCD6500 FFFFFFFFFFFFFFFF")), Date{-0.5});
  EXPECT_EQ(dateOfTimestamp(fromHex("00000000 0000000400000000")), Date{17179869184.0});
}

TEST(RpcTimestampTest, RefusesAWholeSecondOfNanoseconds) {
  EXPECT_TRUE(dateOfTimestamp(fromHex("3B9AC9FF 0000000000000000")));
  EXPECT_FALSE(dateOfTimestamp(fromHex("3B9ACA00 0000000000000000")));
  EXPECT_TRUE(dateOfTimestamp(fromHex("EE6B27FC00000000")));
  EXPECT_FALSE(dateOfTimestamp(fromHex("EE6B280000000000")));
}

TEST(RpcTimestampTest, RefusesEveryOtherLength) {
  for (const std::size_t length : {0U, 1U, 2U, 3U, 5U, 7U, 9U, 11U, 13U, 16U}) {
    EXPECT_FALSE(dateOfTimestamp(std::string(length, '\0'))) << length;
  }
}

TEST(RpcTimestampTest, WritesTheShortestFormThatHoldsTheDate) {
  EXPECT_EQ(timestampOf(Date{0.0}), fromHex("00000000"));
  EXPECT_EQ(timestampOf(Date{4294967295.0}), fromHex("FFFFFFFF"));
  EXPECT_EQ(timestampOf(Date{4294967296.0}), fromHex("0000000100000000"));
  EXPECT_EQ(timestampOf(Date{17179869183.5}), fromHex("77359403FFFFFFFF"));
  EXPECT_EQ(timestampOf(Date{17179869184.0}), fromHex("000000000000000400000000"));
  EXPECT_EQ(timestampOf(Date{-0.5}), fromHex("1DCD6500FFFFFFFFFFFFFFFF"));
}

TEST(RpcTimestampTest, ReadsBackWhatItWrote) {
  for (const double seconds : {1763634000.123456, 1.0 / 3.0, -62135596800.25, 1e12 + 0.5, -1e15}) {
    const auto read = dateOfTimestamp(timestampOf(Date{seconds}));
    ASSERT_TRUE(read);
    EXPECT_NEAR(read->seconds, seconds, 1e-9) << seconds;
  }
}

TEST(RpcTimestampTest, CarriesAFractionThatRoundsUpIntoTheSeconds) {
  EXPECT_EQ(timestampOf(Date{0.9999999999}), fromHex("00000001"));
}

TEST(RpcTimestampTest, WritesTheNearestDateThatFits) {
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  EXPECT_EQ(timestampOf(Date{kInfinity}), fromHex("00000000 7FFFFFFFFFFFFFFF"));
  EXPECT_EQ(timestampOf(Date{-kInfinity}), fromHex("00000000 8000000000000000"));
  EXPECT_EQ(timestampOf(Date{1e300}), fromHex("00000000 7FFFFFFFFFFFFFFF"));
  EXPECT_EQ(timestampOf(Date{std::numeric_limits<double>::quiet_NaN()}), fromHex("00000000"));
}

}  // namespace
}  // namespace tonewerk
