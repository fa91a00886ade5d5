// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/StringInterner.h"

#include <gmock/gmock.h>
#include <string>

namespace tonewerk {
namespace {

TEST(StringInternerTest, SharesATextThatComesAgain) {
  StringInterner cache(16, 8);
  const auto first = cache.find("volume");
  const auto second = cache.find("volume");
  ASSERT_TRUE(first && second);
  EXPECT_EQ(*first, "volume");
  EXPECT_TRUE(first->sharesStorageWith(*second));
}

TEST(StringInternerTest, KeepsTextsUpToItsMaximumLength) {
  StringInterner cache(16, 8);
  EXPECT_TRUE(cache.find("12345678")->sharesStorageWith(*cache.find("12345678")));
  EXPECT_FALSE(cache.find("123456789")->sharesStorageWith(*cache.find("123456789")));
}

TEST(StringInternerTest, FindsTheRightTextWhenTextsShareASlot) {
  StringInterner cache(1, 8);
  EXPECT_EQ(*cache.find("a"), "a");
  EXPECT_EQ(*cache.find("b"), "b");
  EXPECT_EQ(*cache.find("a"), "a");
  EXPECT_EQ(*cache.find(""), "");
}

TEST(StringInternerTest, FindsTheRightTextsInEveryOrder) {
  StringInterner cache(64, 8);
  for (const char* text : {"a", "b", "c", "a", "b", "c", "c", "b", "a", "", "a", "c", "", ""}) {
    EXPECT_EQ(*cache.find(text), text);
  }
}

TEST(StringInternerTest, RefusesTextsOfAnyLengthThatAreNotUtf8) {
  StringInterner cache(16, 8);
  EXPECT_FALSE(cache.find("\xFF"));
  EXPECT_FALSE(cache.find("\xFF"));
  EXPECT_FALSE(cache.find(std::string(100, 'a') + "\xFF"));
}

}  // namespace
}  // namespace tonewerk
