// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/TextWidth.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

TEST(TextWidthTest, CountsTheColumnsOfTheTerminalInWhateverLocale) {
  EXPECT_EQ(textWidth("abc"), 3U);
  EXPECT_EQ(textWidth("\u00e4\u00f6\u00fc"), 3U);
  EXPECT_EQ(textWidth("\u65e5\u672c"), 4U);  // wide
  EXPECT_EQ(textWidth("\U0001F44D"), 2U);    // wide
  EXPECT_EQ(textWidth("e\u0301"), 1U);       // combines
  EXPECT_EQ(textWidth(""), 0U);
}

TEST(TextWidthTest, CutsBetweenCharactersAndLeavesRoomForTheMark) {
  EXPECT_EQ(cutToWidth("abcdef", 6), "abcdef");
  EXPECT_EQ(cutToWidth("abcdefg", 6), "abcde\u2026");
  EXPECT_EQ(cutToWidth("\u65e5\u672c\u8a9e", 6), "\u65e5\u672c\u8a9e");
  // Half of a wide character does not fit.
  EXPECT_EQ(cutToWidth("\u65e5\u672c\u8a9e", 4), "\u65e5\u2026");
  EXPECT_EQ(cutToWidth("e\u0301e\u0301e\u0301", 2), "e\u0301\u2026");
  EXPECT_EQ(cutToWidth("ab", 1), "\u2026");
}

TEST(TextWidthTest, ABrokenCharacterTakesAColumn) {
  EXPECT_EQ(textWidth("a\xFF\xC3"), 3U);
  EXPECT_EQ(cutToWidth("\xFF\xFF\xFF", 2), "\xFF\u2026");
}

}  // namespace
}  // namespace tonewerk
