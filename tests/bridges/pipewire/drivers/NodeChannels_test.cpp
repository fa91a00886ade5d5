// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/NodeChannels.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "values/Value.h"
#include "values/ValueMap.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;

std::vector<std::string> textsOf(const std::vector<NodeLoad>& nodes) {
  ValueArray channels;
  appendNodeChannels(channels, nodes);
  std::vector<std::string> texts;
  for (const Value& channel : channels) {
    const ValueMap& map = *channel.asMap();
    EXPECT_EQ(map.text("group"), "Nodes");
    EXPECT_EQ(map.text("format"), "simple");
    texts.push_back(map.text("subgroup") + " " + map.text("name") + " " + map.text("value") +
                    map.text("unit"));
  }
  return texts;
}

TEST(NodeChannels, HaveTheSharesTheGlitchesAndTheProcessOfEachNode) {
  EXPECT_THAT(textsOf({{"player", 77, 12, 340, 2}}),
              ElementsAre("player Busy 12permille", "player Worst 340permille", "player Glitches 2glitches",
                          "player PID 77"));
}

// A channel is known by its names, which must not be there twice.
TEST(NodeChannels, AreSharedByNodesOfTheSameName) {
  EXPECT_THAT(textsOf({{"player", 77, 12, 340, 2}, {"player", 78, 8, 400, 1}}),
              ElementsAre("player Busy 20permille", "player Worst 400permille", "player Glitches 3glitches",
                          "player PID 77"));
}

}  // namespace
}  // namespace tonewerk
