// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/KeyValueLines.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

TEST(KeyValueLinesTest, FindsALineByItsWholeName) {
  const KeyValueLines lines(
      "MemTotal:  8000 kB\nVmRSSx:\t1 kB\n VmRSS:\t2 kB\nVmRSS:\t   3 kB\nVmRSS: 4\nName:\ta b");
  EXPECT_EQ(lines.find("MemTotal"), "8000 kB");
  EXPECT_EQ(lines.find("VmRSS"), "3 kB");
  EXPECT_EQ(lines.find("Name"), "a b");
  EXPECT_EQ(lines.find("Total"), std::nullopt);
  EXPECT_EQ(lines.find("Mem"), std::nullopt);
}

TEST(KeyValueLinesTest, ALineMayHaveNoValue) {
  const KeyValueLines lines("\nGroups:\t \nSeccomp:");
  EXPECT_EQ(lines.find("Groups"), "");
  EXPECT_EQ(lines.find("Seccomp"), "");
  EXPECT_EQ(lines.number("Groups"), std::nullopt);
  EXPECT_EQ(KeyValueLines("").find("Groups"), std::nullopt);
}

TEST(KeyValueLinesTest, GivesTheNumberThatALineBeginsWith) {
  const KeyValueLines lines("Uid:\t1000\t1001\nVmSwap:\t24 kB\nState:\tS\nHuge:\t18446744073709551616 kB\n");
  EXPECT_EQ(lines.number("Uid"), 1000U);
  EXPECT_EQ(lines.number("VmSwap"), 24U);
  EXPECT_EQ(lines.number("State"), std::nullopt);
  EXPECT_EQ(lines.number("Huge"), std::nullopt);
  EXPECT_EQ(lines.number("VmPin"), std::nullopt);
}

}  // namespace
}  // namespace tonewerk
