// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/ValueArguments.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

TEST(ValueArgumentsTest, TellsBooleansNumbersAndTexts) {
  EXPECT_NE(valueOfArgument("true").asBoolean(), nullptr);
  EXPECT_EQ(valueOfArgument("false"), Value(false));
  EXPECT_NE(valueOfArgument("-5").asInteger(), nullptr);
  EXPECT_EQ(valueOfArgument("-5"), Value(-5));
  EXPECT_EQ(valueOfArgument("18446744073709551615"), Value(UINT64_MAX));
  EXPECT_NE(valueOfArgument("2.0").asDouble(), nullptr);
  EXPECT_EQ(valueOfArgument("1e3"), Value(1000.0));
  for (const char* text : {"", "True", "5x", " 5", "inf", "nan", "-", "0x10", "1e999", "some words"}) {
    EXPECT_EQ(valueOfArgument(text), Value(text)) << text;
    EXPECT_NE(valueOfArgument(text).asString(), nullptr) << text;
  }
}

TEST(ValueArgumentsTest, SplitsAnEntryAtTheFirstEqualsSign) {
  const auto entry = entryOfArgument("key=a=b");
  ASSERT_TRUE(entry);
  EXPECT_EQ(entry->key, "key");
  EXPECT_EQ(entry->value, Value("a=b"));
  ASSERT_TRUE(entryOfArgument("key="));
  EXPECT_EQ(entryOfArgument("key=")->value, Value(""));
  EXPECT_FALSE(entryOfArgument("key"));
  EXPECT_FALSE(entryOfArgument("=value"));
}

TEST(ValueArgumentsTest, KnowsCategories) {
  EXPECT_EQ(categoryOfArgument("Generic"), 1U);
  EXPECT_EQ(categoryOfArgument("HearingHealth"), 16U);
  EXPECT_EQ(categoryOfArgument("HAL_Playback"), 0x20000004U);
  EXPECT_EQ(categoryOfArgument("Toolbox_IO"), 0x80000007U);
  EXPECT_EQ(categoryOfArgument("Unknown"), 0xFFFFFFFFU);
  EXPECT_EQ(categoryOfArgument("4294967295"), 0xFFFFFFFFU);
  EXPECT_EQ(categoryOfArgument("0"), 0U);
  for (const char* text : {"", "playback", "Undefined", "_Playback", "HAL_", "HAL_Undefined",
                           "Nobody_Playback", "-1", "4294967296", "4x"}) {
    EXPECT_FALSE(categoryOfArgument(text)) << text;
  }
}

TEST(ValueArgumentsTest, KnowsTypes) {
  EXPECT_EQ(typeOfArgument("Generic"), 0);
  EXPECT_EQ(typeOfArgument("Listeningenhancement"), 14);
  EXPECT_EQ(typeOfArgument("MemoryLog"), 19);
  EXPECT_EQ(typeOfArgument("Unknown"), 65535);
  EXPECT_EQ(typeOfArgument("11"), 11);
  for (const char* text : {"", "start", "65536", "-1", "1.0"}) EXPECT_FALSE(typeOfArgument(text)) << text;
}

// The largest identifier plus one was read as the largest, and the answer was about another session.
TEST(ValueArgumentsTest, RefusesAnIdentifierOutOfRange) {
  for (const char* good : {"0", "7", "-1", "9223372036854775807", "-9223372036854775808"}) {
    EXPECT_EQ(problemWithReporterID(good), "");
  }
  for (const char* bad : {"9223372036854775808", "-9223372036854775809", "", "seven", "7.0", "7 ", "0x7"}) {
    EXPECT_NE(problemWithReporterID(bad), "") << bad;
  }
}

}  // namespace
}  // namespace tonewerk
