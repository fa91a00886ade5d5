// SPDX-License-Identifier: Apache-2.0
#include "values/ShortenedText.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

TEST(ShortenedTextTest, LeavesATextThatFits) {
  EXPECT_EQ(shortened("four", 4), "four");
  EXPECT_EQ(shortened("", 0), "");
}

TEST(ShortenedTextTest, CutsBetweenCharacters) {
  EXPECT_EQ(shortened("four", 3), "fou");
  EXPECT_EQ(shortened("a\xE2\x82\xAC", 3), "a");
  EXPECT_EQ(shortened("a\xE2\x82\xAC", 4), "a\xE2\x82\xAC");
  EXPECT_EQ(shortened("\xC3\xBC", 1), "");
}

}  // namespace
}  // namespace tonewerk
