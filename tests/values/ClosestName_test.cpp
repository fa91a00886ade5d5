// SPDX-License-Identifier: Apache-2.0
#include "values/ClosestName.h"

#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {
namespace {

const std::vector<std::string> kNames{"list", "events", "metrics", "HAL_Playback"};

TEST(ClosestNameTest, IsTheNameThatTakesTheFewestChanges) {
  EXPECT_EQ(closestTo("lst", kNames), "list");                  // a letter is missing
  EXPECT_EQ(closestTo("eventss", kNames), "events");            // a letter too many
  EXPECT_EQ(closestTo("mwtrics", kNames), "metrics");           // a wrong letter
  EXPECT_EQ(closestTo("lsit", kNames), "list");                 // two swapped
  EXPECT_EQ(closestTo("event", {"events", "vent"}), "events");  // the first of two equally close
}

TEST(ClosestNameTest, TakesUpperAndLowerCaseForTheSame) {
  EXPECT_EQ(closestTo("hal_playback", kNames), "HAL_Playback");
}

TEST(ClosestNameTest, IsNoneWhereAWordIsSomethingElse) {
  for (const char* word : {"", "x", "nonsense", "top", "playbacks"}) {
    EXPECT_EQ(closestTo(word, kNames), std::nullopt) << word;
  }
  EXPECT_EQ(closestTo("x", {"y"}), std::nullopt) << "nothing is left of it";
  EXPECT_EQ(closestTo("list", {}), std::nullopt);
}

}  // namespace
}  // namespace tonewerk
