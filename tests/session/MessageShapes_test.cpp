// SPDX-License-Identifier: Apache-2.0
#include "session/MessageShapes.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "support/PackedMaps.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

class MessageShapesTest : public ReportingTest {
 protected:
  // What complete messages add to `shape`, found the long way.
  const Shape* extended(const Shape& shape, AudioEventCategory category, AudioEventType type,
                        const SharedString* name) {
    const ValueMapEntry tag{"audiotag", TWReportingContext::current().names().audioTag(category, type)};
    return name == nullptr ? shapes.extended(shape, {tag})
                           : shapes.extended(shape, {tag, {"HostApplicationDisplayID", *name}});
  }

  MessageShapes shapes;
};

TEST_F(MessageShapesTest, CompletedIsTheShapeWithTheTagAndTheName) {
  const ValueMap map = packedMapOf({{"a", 1}}, shapes);
  const SharedString player("player");
  const Shape* named = shapes.completed(*map.shape(), kCategoryVolume, kTypeStart, &player);
  ASSERT_NE(named, nullptr);
  ValueMap message = map;
  ASSERT_TRUE(message.extend(*named));
  EXPECT_EQ(message,
            (ValueMap{{"a", 1}, {"audiotag", "VolumeStart"}, {"HostApplicationDisplayID", "player"}}));
  const Shape* unnamed = shapes.completed(*map.shape(), kCategoryVolume, kTypeStart, nullptr);
  ASSERT_NE(unnamed, nullptr);
  message = map;
  ASSERT_TRUE(message.extend(*unnamed));
  EXPECT_EQ(message, (ValueMap{{"a", 1}, {"audiotag", "VolumeStart"}}));
}

// Ever new kinds take the places of others, and later come again.
TEST_F(MessageShapesTest, EveryKindGetsItsShapeHoweverManyThereAre) {
  constexpr std::size_t kShapes = 100;
  std::vector<ValueMap> maps;
  maps.reserve(kShapes);
  for (std::size_t number = 0; number < kShapes; ++number) {
    maps.push_back(packedMapOf({{"key" + std::to_string(number), 1}}, shapes));
  }
  const std::vector<SharedString> names{"player", "recorder", "Unknown"};
  for (int round = 0; round < 2; ++round) {
    for (const ValueMap& map : maps) {
      for (const AudioEventType type : {kTypeStart, kTypeStop}) {
        for (const SharedString& name : names) {
          const Shape* completed = shapes.completed(*map.shape(), kCategoryVolume, type, &name);
          ASSERT_NE(completed, nullptr);
          ASSERT_EQ(completed, extended(*map.shape(), kCategoryVolume, type, &name));
        }
        ASSERT_EQ(shapes.completed(*map.shape(), kCategoryIo, type, nullptr),
                  extended(*map.shape(), kCategoryIo, type, nullptr));
      }
    }
  }
}

TEST_F(MessageShapesTest, ThereIsNoneWhenTheTableIsFull) {
  const ValueMap map = packedMapOf({{"a", 1}}, shapes);
  for (std::size_t number = 0; shapes.shapes() < ShapeTable::kMaxShapes; ++number) {
    packedMapOf({{"key" + std::to_string(number), 1}}, shapes);
  }
  EXPECT_EQ(shapes.completed(*map.shape(), kCategoryVolume, kTypeStart, nullptr), nullptr);
}

TEST_F(MessageShapesTest, KnownValuesAreReadFromAnyMap) {
  const std::vector<ValueMapEntry> entries{{"twreporting_timestamp", 1.5},
                                           {"session_duration", 2},
                                           {"issue_type", "overload"},
                                           {"HostApplicationDisplayID", "player"}};
  ShapeTable foreign;
  ValueMap tree;
  for (const ValueMapEntry& entry : entries) tree.set(entry.key, entry.value);
  for (const ValueMap& map : {packedMapOf(entries, shapes), packedMapOf(entries, foreign), tree}) {
    EXPECT_EQ(knownValue(map, KnownKey::kTimestamp).number(), 1.5);
    EXPECT_EQ(knownValue(map, KnownKey::kSessionDuration).integer(), 2);
    EXPECT_EQ(knownValue(map, KnownKey::kIssueType).text(), "overload");
    EXPECT_EQ(knownValue(map, KnownKey::kApplicationName).text(), "player");
  }
  for (const ValueMap& map :
       {packedMapOf({{"x", 1}}, shapes), packedMapOf({{"x", 1}}, foreign), ValueMap()}) {
    EXPECT_FALSE(knownValue(map, KnownKey::kTimestamp));
    EXPECT_FALSE(knownValue(map, KnownKey::kSessionDuration));
    EXPECT_FALSE(knownValue(map, KnownKey::kIssueType));
    EXPECT_FALSE(knownValue(map, KnownKey::kApplicationName));
  }
}

}  // namespace
}  // namespace tonewerk
