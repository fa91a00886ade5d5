// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/GlitchCycles.h"

#include <gmock/gmock.h>
#include <string>

#include "platform/linux/json/NlohmannJsonService.h"

namespace tonewerk {
namespace {

using testing::IsEmpty;
using testing::SizeIs;

class GlitchCyclesTest : public testing::Test {
 protected:
  std::vector<GlitchCycle> read(const std::string& text) const { return GlitchCycles::read(text, json_); }

  NlohmannJsonService json_;
};

TEST_F(GlitchCyclesTest, AreReadOldestFirst) {
  const auto cycles = read(
      R"([{"begin":0,"period":5333.3,"nodes":[{"name":"player","process":"mpv","signal":12.1,"awake":15.5}]},)"
      R"({"begin":-5333.3,"period":5333.3,"nodes":[{"name":"player","signal":12,"awake":15,"finish":820.4}]}])");
  ASSERT_THAT(cycles, SizeIs(2));
  EXPECT_EQ(cycles[0].begin, -5333.3);
  EXPECT_FALSE(cycles[0].isOfGlitch());
  EXPECT_EQ(cycles[0].nodes[0].finish, 820.4);
  EXPECT_TRUE(cycles[1].isOfGlitch());
  EXPECT_EQ(cycles[1].nodes[0].name, "player");
  EXPECT_EQ(cycles[1].nodes[0].process, "mpv");
  EXPECT_EQ(cycles[1].nodes[0].signal, 12.1);
  EXPECT_EQ(cycles[1].nodes[0].awake, 15.5);
  EXPECT_FALSE(cycles[1].nodes[0].finish);
}

TEST_F(GlitchCyclesTest, WhatIsNoCycleAndNoNodeIsLeftOut) {
  for (const char* text :
       {"", "[{", "7", "{}", "null", "[null]", "[7,[],\"a\",{}]", R"([{"begin":0,"period":5}])",
        R"([{"begin":0,"period":0,"nodes":[]}])", R"([{"begin":"0","period":5,"nodes":[]}])",
        R"([{"begin":1e300,"period":5,"nodes":[]}])"}) {
    EXPECT_THAT(read(text), IsEmpty()) << text;
  }
  const auto cycles = read(
      R"([{"begin":0,"period":5,"nodes":[7,{},{"name":""},{"name":3},{"name":"a","signal":-4,"awake":"x","finish":1e99}]}])");
  ASSERT_THAT(cycles, SizeIs(1));
  ASSERT_THAT(cycles[0].nodes, SizeIs(1));
  EXPECT_EQ(cycles[0].nodes[0].signal, 0.0);
  EXPECT_FALSE(cycles[0].nodes[0].awake);
  EXPECT_FALSE(cycles[0].nodes[0].finish);
}

TEST_F(GlitchCyclesTest, NoNodeWakesBeforeItsSignalOrFinishesBeforeItWakes) {
  const auto cycles =
      read(R"([{"begin":0,"period":5,"nodes":[{"name":"a","signal":4,"awake":3,"finish":2}]}])");
  ASSERT_THAT(cycles, SizeIs(1));
  EXPECT_EQ(cycles[0].nodes[0].awake, 4.0);
  EXPECT_EQ(cycles[0].nodes[0].finish, 4.0);
}

TEST_F(GlitchCyclesTest, HaveLimits) {
  std::string nodes;
  for (int i = 0; i < 1000; ++i) {
    nodes += std::string(i == 0 ? "" : ",") + R"({"name":"a)" + std::string(99, 'x') + "\u00e9\"}";
  }
  std::string text = "[";
  for (int i = 0; i < 100; ++i) {
    text +=
        std::string(i == 0 ? "" : ",") + R"({"begin":0,"period":5,"nodes":[)" + (i == 0 ? nodes : "") + "]}";
  }
  const auto cycles = read(text + "]");
  ASSERT_THAT(cycles, SizeIs(GlitchCycles::kMostCycles));
  ASSERT_THAT(cycles[0].nodes, SizeIs(GlitchCycles::kMostNodes));
  // No half of a character is left.
  EXPECT_EQ(cycles[0].nodes[0].name, "a" + std::string(99, 'x'));
}

}  // namespace
}  // namespace tonewerk
