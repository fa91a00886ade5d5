// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/Suggestion.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace tonewerk {
namespace {

const std::vector<std::string> kNames{"list", "events", "metrics", "HAL_Playback"};

TEST(SuggestionTest, NamesAllWhereNoneIsClose) {
  EXPECT_EQ(hintFor("evnts", kNames), "did you mean 'events'?");
  EXPECT_EQ(hintFor("nonsense", kNames), "there are list, events, metrics and HAL_Playback");
  EXPECT_EQ(thereAre({"one"}), "there are one");
}

}  // namespace
}  // namespace tonewerk
