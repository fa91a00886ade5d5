// SPDX-License-Identifier: Apache-2.0
#include "session/KeySlots.h"

#include <array>
#include <gtest/gtest.h>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "support/PackedMaps.h"

namespace tonewerk {
namespace {

constexpr std::array<std::string_view, 2> kKeys{"b", "d"};

TEST(KeySlotsTest, FindsPackedMessagesThatHaveAKey) {
  ShapeTable shapes;
  KeySlots slots(kKeys);
  for (int again = 0; again < 2; ++again) {
    EXPECT_TRUE(slots.mayHaveAny(packedMapOf({{"a", 1}, {"b", 2}}, shapes)));
    EXPECT_FALSE(slots.mayHaveAny(packedMapOf({{"a", 1}, {"c", 2}}, shapes)));
    EXPECT_TRUE(slots.mayHaveAny(packedMapOf({{"d", 1}}, shapes)));
  }
}

TEST(KeySlotsTest, AnExtendedShapeHasAnAnswerOfItsOwn) {
  ShapeTable shapes;
  KeySlots slots(kKeys);
  ValueMap map = packedMapOf({{"a", 1}}, shapes);
  EXPECT_FALSE(slots.mayHaveAny(map));
  ASSERT_TRUE(map.extend(*shapes.extended(*map.shape(), {{"d", "YES"}})));
  EXPECT_TRUE(slots.mayHaveAny(map));
  EXPECT_EQ(slots.view(map, 1).text(), "YES");
}

TEST(KeySlotsTest, AnyTreeMayHaveAKey) {
  KeySlots slots(kKeys);
  EXPECT_TRUE(slots.mayHaveAny(ValueMap()));
  EXPECT_TRUE(slots.mayHaveAny(ValueMap{{"a", 1}}));
  EXPECT_FALSE(slots.view(ValueMap{{"a", 1}}, 0));
  const ValueMap map{{"a", 1}, {"b", 2}};
  EXPECT_EQ(slots.view(map, 0).integer(), 2);
}

// Two tables number their shapes alike.
TEST(KeySlotsTest, AMessageOfAnotherClientIsNotTakenForOneOfTheFirst) {
  ShapeTable first;
  ShapeTable second;
  KeySlots slots(kKeys);
  EXPECT_FALSE(slots.mayHaveAny(packedMapOf({{"a", 1}}, first)));
  const ValueMap other = packedMapOf({{"b", 1}}, second);
  EXPECT_TRUE(slots.mayHaveAny(other));
  EXPECT_EQ(slots.view(other, 0).integer(), 1);
  EXPECT_FALSE(slots.mayHaveAny(packedMapOf({{"a", 1}}, first)));
}

TEST(KeySlotsTest, NeverMissesAMessageOfManyShapes) {
  std::mt19937 random(20261122);
  ShapeTable shapes;
  KeySlots slots(kKeys);
  for (int made = 0; made < 20'000; ++made) {
    std::vector<ValueMapEntry> entries;
    for (const char key : std::string_view("abcdefghij")) {
      if (random() % 4 == 0) entries.push_back({std::string_view(&key, 1), made});
    }
    if (entries.empty()) continue;
    const ValueMap map = packedMapOf(entries, shapes);
    EXPECT_EQ(slots.mayHaveAny(map), map.contains("b") || map.contains("d")) << map.text();
    EXPECT_TRUE(slots.view(map, 0) == map.view("b")) << map.text();
    EXPECT_TRUE(slots.view(map, 1) == map.view("d")) << map.text();
  }
}

}  // namespace
}  // namespace tonewerk
