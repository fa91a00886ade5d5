// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/Ulid.h"

#include <gtest/gtest.h>
#include <set>

namespace tonewerk {
namespace {

UlidGenerator::Random allOf(std::uint32_t byte) {
  return [byte] { return byte; };
}

TEST(UlidGeneratorTest, IsTheTimeInMillisecondsAndThenTheRandomBits) {
  UlidGenerator zeros(allOf(0));
  EXPECT_EQ(zeros.next(0.001), "00000000010000000000000000");
  EXPECT_EQ(zeros.next(1469918176.385), "01ARYZ6S410000000000000000");
  UlidGenerator ones(allOf(0xFF));
  EXPECT_EQ(ones.next(0.001), "0000000001FZZZZZZZZZZZZZZZ");
}

TEST(UlidGeneratorTest, CountsUpWithinAMillisecondAndWhenTheClockGoesBack) {
  UlidGenerator generator(allOf(0xFF));
  const std::string first = generator.next(5.0);
  const std::string second = generator.next(5.0);
  const std::string third = generator.next(4.0);
  EXPECT_LT(first, second);
  EXPECT_LT(second, third);
  EXPECT_EQ(second, "00000004W8G000000000000000");
}

TEST(UlidGeneratorTest, AcceptsInvalidTimes) {
  UlidGenerator generator(allOf(0));
  EXPECT_EQ(generator.next(-1.0).size(), 26U);
  EXPECT_EQ(generator.next(1e300).substr(0, 10), "7ZZZZZZZZZ");
}

TEST(UlidGeneratorTest, NeverMakesAnIdentifierTwice) {
  UlidGenerator generator;
  std::set<std::string> seen;
  for (int n = 0; n < 10'000; ++n) EXPECT_TRUE(seen.insert(generator.next(1e9 + n * 1e-4)).second);
}

}  // namespace
}  // namespace tonewerk
