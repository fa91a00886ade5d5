// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/ServeToken.h"

#include <gmock/gmock.h>
#include <set>

namespace tonewerk {
namespace {

TEST(ServeTokenTest, HasAHundredAndSixtyBitsThatNobodyKnows) {
  std::set<std::string> tokens;
  for (int i = 0; i < 100; ++i) tokens.insert(newServeToken().value_or(""));
  EXPECT_EQ(tokens.size(), 100U);
  for (const std::string& token : tokens) {
    EXPECT_EQ(token.size(), 40U);
    EXPECT_EQ(token.find_first_not_of("0123456789abcdef"), std::string::npos) << token;
  }
}

TEST(ServeTokenTest, IsTheSameOnlyWhenEveryLetterIs) {
  EXPECT_TRUE(isSameSecret("abcd", "abcd"));
  for (const char* other : {"", "abc", "abcde", "xbcd", "abcx", "abcdabcd"}) {
    EXPECT_FALSE(isSameSecret(other, "abcd")) << other;
  }
  EXPECT_FALSE(isSameSecret("", ""));
}

}  // namespace
}  // namespace tonewerk
