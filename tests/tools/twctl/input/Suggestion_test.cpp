// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/Suggestion.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace tonewerk {
namespace {

const std::vector<std::string> kNames{"list", "events", "metrics", "HAL_Playback"};

TEST(SuggestionTest, IsTheNameThatTakesTheFewestChanges) {
  EXPECT_EQ(closestTo("lst", kNames), "list");                  // a letter is missing
  EXPECT_EQ(closestTo("eventss", kNames), "events");            // a letter too many
  EXPECT_EQ(closestTo("mwtrics", kNames), "metrics");           // a wrong letter
  EXPECT_EQ(closestTo("lsit", kNames), "list");                 // two swapped
  EXPECT_EQ(closestTo("event", {"events", "vent"}), "events");  // the first of two equally close
}

TEST(SuggestionTest, TakesUpperAndLowerCaseForTheSame) {
  EXPECT_EQ(closestTo("hal_playback", kNames), "HAL_Playback");
}

TEST(SuggestionTest, IsNoneWhereAWordIsSomethingElse) {
  for (const char* word : {"", "x", "nonsense", "top", "playbacks"}) {
    EXPECT_EQ(closestTo(word, kNames), std::nullopt) << word;
  }
  EXPECT_EQ(closestTo("x", {"y"}), std::nullopt) << "nothing is left of it";
  EXPECT_EQ(closestTo("list", {}), std::nullopt);
}

TEST(SuggestionTest, NamesAllWhereNoneIsClose) {
  EXPECT_EQ(hintFor("evnts", kNames), "did you mean 'events'?");
  EXPECT_EQ(hintFor("nonsense", kNames), "there are list, events, metrics and HAL_Playback");
  EXPECT_EQ(thereAre({"one"}), "there are one");
}

}  // namespace
}  // namespace tonewerk
