// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/TextCache.h"

#include <gmock/gmock.h>
#include <string>

namespace tonewerk {
namespace {

TEST(TextCacheTest, SharesATextThatComesAgain) {
  TextCache cache(16, 8);
  const auto first = cache.find("volume");
  const auto second = cache.find("volume");
  ASSERT_TRUE(first && second);
  EXPECT_EQ(*first, "volume");
  EXPECT_TRUE(first->sharesStorageWith(*second));
}

TEST(TextCacheTest, KeepsTextsUpToItsLengthAndNoneLonger) {
  TextCache cache(16, 8);
  EXPECT_TRUE(cache.find("12345678")->sharesStorageWith(*cache.find("12345678")));
  EXPECT_FALSE(cache.find("123456789")->sharesStorageWith(*cache.find("123456789")));
}

TEST(TextCacheTest, StillFindsTheRightTextWhenPlacesAreFought) {
  TextCache cache(1, 8);
  EXPECT_EQ(*cache.find("a"), "a");
  EXPECT_EQ(*cache.find("b"), "b");
  EXPECT_EQ(*cache.find("a"), "a");
  EXPECT_EQ(*cache.find(""), "");
}

TEST(TextCacheTest, FindsTheRightTextsInEveryOrder) {
  TextCache cache(64, 8);
  for (const char* text : {"a", "b", "c", "a", "b", "c", "c", "b", "a", "", "a", "c", "", ""}) {
    EXPECT_EQ(*cache.find(text), text);
  }
}

TEST(TextCacheTest, RefusesWhatIsNotUtf8WhateverItsLength) {
  TextCache cache(16, 8);
  EXPECT_FALSE(cache.find("\xFF"));
  EXPECT_FALSE(cache.find("\xFF"));
  EXPECT_FALSE(cache.find(std::string(100, 'a') + "\xFF"));
}

}  // namespace
}  // namespace tonewerk
