// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/ProcessStat.h"

#include <gmock/gmock.h>
#include <string>

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

const std::string kFields = " S 1 2 3 4 5 6 7 8 9 10 1200 300 13 14 15 16 4";

TEST(ProcessStatTest, ParsesNameAndFields) {
  const std::string text = "42 (pipewire)" + kFields + " 18 19\n";
  const auto stat = ProcessStat::parse(text);
  ASSERT_TRUE(stat);
  EXPECT_EQ(stat->name, "pipewire");
  EXPECT_THAT(stat->fields, SizeIs(20));
  EXPECT_EQ(stat->fields[ProcessStat::kState], "S");
  EXPECT_EQ(stat->fields[ProcessStat::kParent], "1");
  EXPECT_EQ(stat->fields[ProcessStat::kUserTicks], "1200");
  EXPECT_EQ(stat->fields[ProcessStat::kSystemTicks], "300");
  EXPECT_EQ(stat->fields[ProcessStat::kThreads], "4");
}

TEST(ProcessStatTest, ANameMayHoldBracketsAndLineEnds) {
  const std::string text = "42 (a) R (\n1 b)" + kFields;
  const auto stat = ProcessStat::parse(text);
  ASSERT_TRUE(stat);
  EXPECT_EQ(stat->name, "a) R (\n1 b");
  EXPECT_EQ(stat->fields[ProcessStat::kState], "S");
}

TEST(ProcessStatTest, IsNoneWithoutANameOrAField) {
  for (const std::string text : {"", "42", "42 (a", "42 a)", ")(", "42 (a) S 1"}) {
    EXPECT_FALSE(ProcessStat::parse(text)) << text;
  }
  const std::string whole = "42 (a)" + kFields;
  EXPECT_TRUE(ProcessStat::parse(whole));
  EXPECT_FALSE(ProcessStat::parse(whole.substr(0, whole.rfind(' '))));
}

TEST(ProcessStatTest, SplitsAtWhiteSpace) {
  EXPECT_THAT(splitWhitespace("  one\ttwo\n three"), ElementsAre("one", "two", "three"));
  EXPECT_THAT(splitWhitespace(" \n"), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
