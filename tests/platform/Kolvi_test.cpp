// SPDX-License-Identifier: Apache-2.0
#include "platform/Kolvi.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

// Returns one event for each signpost; its duration is the length of the signpost's name.
std::vector<KolviEvent> lengthOf(const std::string& signpost) { return {{signpost.size(), {}}}; }

ValueMap interval(const char* name) { return {{"name", name}, {"type", "interval"}}; }

TEST(KolviTest, AnArrayGivesItsElementsAndAMapItself) {
  const ValueArray list{interval("a"), interval("b")};
  EXPECT_EQ(probeDictionariesOf(list), list);
  EXPECT_EQ(probeDictionariesOf(interval("a")), ValueArray{interval("a")});
  EXPECT_EQ(probeDictionariesOf(ValueArray{}), ValueArray{});
}

TEST(KolviTest, AnyOtherRootGivesNone) {
  EXPECT_EQ(probeDictionariesOf("text"), std::nullopt);
  EXPECT_EQ(probeDictionariesOf(1), std::nullopt);
  EXPECT_EQ(probeDictionariesOf(true), std::nullopt);
}

TEST(KolviTest, TheSignpostDefaultsToTheName) {
  const ValueArray list{ValueMap{{"name", "a"}, {"type", "interval"}, {"signpost", "decode"}},
                        interval("bb")};
  EXPECT_THAT(signpostsOf(list), ElementsAre("bb", "decode"));
  const auto probes = makeKolviProbes(list, lengthOf);
  ASSERT_THAT(probes, SizeIs(2));
  EXPECT_EQ(probes[0].name, "a");
  EXPECT_EQ(probes[0].events.at(0).timeDuration, 6U);
  EXPECT_EQ(probes[1].events.at(0).timeDuration, 2U);
}

TEST(KolviTest, ChildrenFormATree) {
  ValueMap parent = interval("parent");
  parent.set("children", ValueArray{interval("one"), interval("two")});
  const ValueArray list{ValueMap{{"name", "group"}, {"children", ValueArray{parent}}}};
  EXPECT_THAT(signpostsOf(list), ElementsAre("one", "parent", "two"));
  const auto probes = makeKolviProbes(list, lengthOf);
  ASSERT_THAT(probes, SizeIs(1));
  EXPECT_FALSE(probes[0].isIntervalProbe);
  EXPECT_THAT(probes[0].events, IsEmpty());
  ASSERT_THAT(probes[0].children, SizeIs(1));
  EXPECT_TRUE(probes[0].children[0].isIntervalProbe);
  ASSERT_THAT(probes[0].children[0].children, SizeIs(2));
  EXPECT_EQ(probes[0].children[0].children[1].name, "two");
}

TEST(KolviTest, AProbeOfAnotherTypeNeedsNoSignpost) {
  const ValueArray list{ValueMap{{"name", "a"}, {"type", "counter"}}, ValueMap{{"name", "b"}}};
  EXPECT_THAT(signpostsOf(list), IsEmpty());
  EXPECT_THAT(makeKolviProbes(list, lengthOf), SizeIs(2));
}

TEST(KolviTest, ElementsThatAreNotProbesAreSkipped) {
  const ValueArray list{"text", 1, ValueMap{{"type", "interval"}}, interval("a"),
                        ValueMap{{"name", "b"}, {"children", "text"}}};
  EXPECT_THAT(signpostsOf(list), ElementsAre("a"));
  const auto probes = makeKolviProbes(list, lengthOf);
  ASSERT_THAT(probes, SizeIs(2));
  EXPECT_THAT(probes[1].children, IsEmpty());
}

TEST(KolviTest, AProbeDescribesItself) {
  KolviProbe probe;
  probe.name = "a";
  EXPECT_EQ(probe.description(), "probe \"a\"");
  const auto probes = makeKolviProbes({interval("a")}, lengthOf);
  EXPECT_EQ(probes.at(0).description(), "interval probe \"a\"");
}

}  // namespace
}  // namespace tonewerk
