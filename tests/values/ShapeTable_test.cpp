// SPDX-License-Identifier: Apache-2.0
#include "values/ShapeTable.h"

#include <gtest/gtest.h>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "values/CompactJson.h"
#include "values/Shape.h"

namespace tonewerk {
namespace {

using Place = ShapeTable::Place;

const Shape* shapeOf(ShapeTable& table, const std::vector<std::string>& keys) {
  Place place = ShapeTable::root();
  for (const std::string& key : keys) {
    place = table.next(place, key);
    if (place == ShapeTable::none()) return nullptr;
  }
  return table.shapeAt(place);
}

std::vector<std::string> numbered(std::size_t count, const std::string& name = "key") {
  std::vector<std::string> keys;
  for (std::size_t at = 0; at < count; ++at) keys.push_back(name + std::to_string(at));
  return keys;
}

TEST(ShapeTableTest, GivesEqualSequencesOneShape) {
  ShapeTable table;
  const Shape* shape = shapeOf(table, {"a", "b", "c"});
  EXPECT_EQ(shapeOf(table, {"a", "b", "c"}), shape);
  EXPECT_NE(shapeOf(table, {"a", "c", "b"}), shape);
  EXPECT_NE(shapeOf(table, {"a", "b"}), shape);
  EXPECT_EQ(shapeOf(table, {"a", "b", "c"}), shape);
  EXPECT_EQ(table.shapes(), 3U);
  EXPECT_EQ(table.keys(), 5U);  // a, ab, abc, ac, acb
}

TEST(ShapeTableTest, FindsOnlyWhatWasAdded) {
  ShapeTable table;
  EXPECT_EQ(table.find(ShapeTable::root(), "a"), ShapeTable::none());
  const Place place = table.add(ShapeTable::root(), "a");
  EXPECT_EQ(table.find(ShapeTable::root(), "a"), place);
  EXPECT_EQ(table.find(place, "a"), ShapeTable::none());
}

TEST(ShapeTableTest, FindsTheSlotOfEachKeyInSmallAndLargeShapes) {
  ShapeTable table;
  for (const std::size_t count : {0U, 1U, 16U, 17U, 600U}) {
    const std::vector<std::string> keys = numbered(count);
    const Shape* shape = shapeOf(table, keys);
    ASSERT_NE(shape, nullptr);
    ASSERT_EQ(shape->size(), count);
    for (std::size_t slot = 0; slot < count; ++slot) {
      EXPECT_EQ(shape->key(slot), std::string_view(keys[slot]));
      EXPECT_EQ(shape->find(keys[slot]), slot);
    }
    EXPECT_EQ(shape->find("absent"), Shape::kNoSlot);
    EXPECT_FALSE(shape->hasDoubledKey());
  }
}

TEST(ShapeTableTest, KnowsWhatFollowsFromTheKeys) {
  ShapeTable table({"time", "absent"});
  const Shape* shape = shapeOf(table, {"level", "time", "a \"quote\"\n"});
  EXPECT_EQ(shape->known(0), 1U);
  EXPECT_EQ(shape->known(1), Shape::kNoSlot);
  EXPECT_TRUE(shape->hasKeyWithSpace());
  EXPECT_EQ(shape->json(0), R"(,"level":)");
  EXPECT_EQ(shape->json(2), R"(,"a \"quote\"\n":)");
  EXPECT_FALSE(shapeOf(table, {"level", "time"})->hasKeyWithSpace());
}

TEST(ShapeTableTest, NoticesADoubledKeyInSmallAndLargeShapes) {
  ShapeTable table;
  EXPECT_TRUE(shapeOf(table, {"a", "b", "a"})->hasDoubledKey());
  EXPECT_TRUE(shapeOf(table, {"", ""})->hasDoubledKey());
  std::vector<std::string> many = numbered(40);
  many.emplace_back("key7");
  EXPECT_TRUE(shapeOf(table, many)->hasDoubledKey());
  EXPECT_EQ(shapeOf(table, many)->find("key7"), 7U);
}

TEST(ShapeTableTest, ExtendsAShapeByConstants) {
  ShapeTable table({"tag"});
  const Shape* shape = shapeOf(table, {"a", "app", "b"});
  const Shape* extended = table.extended(*shape, {{"tag", "playback"}, {"app", "player"}, {"number", 7}});
  ASSERT_NE(extended, nullptr);
  EXPECT_EQ(extended->base(), shape);
  EXPECT_EQ(extended->size(), 5U);
  EXPECT_EQ(extended->variables(), 2U);
  EXPECT_EQ(extended->known(0), 3U);
  EXPECT_EQ(extended->find("app"), 1U);  // keeps its place
  EXPECT_EQ(extended->constant(1).value(), Value("player"));
  EXPECT_EQ(extended->constant(3).value(), Value("playback"));
  EXPECT_EQ(extended->constant(4).value(), Value(7));
  EXPECT_FALSE(extended->constant(0));
}

TEST(ShapeTableTest, GivesEqualConstantsOneShape) {
  ShapeTable table;
  const Shape* shape = shapeOf(table, {"a"});
  const Shape* extended = table.extended(*shape, {{"tag", "playback"}});
  EXPECT_EQ(table.extended(*shape, {{"tag", "playback"}}), extended);
  EXPECT_NE(table.extended(*shape, {{"tag", "routing"}}), extended);
  EXPECT_NE(table.extended(*shape, {{"tag2", "playback"}}), extended);
  EXPECT_EQ(table.extended(*shape, {{"tag", "playback"}}), extended);
  EXPECT_NE(table.extended(*shapeOf(table, {"b"}), {{"tag", "playback"}}), extended);
  // These are equal values, but not the same JSON.
  const Shape* integer = table.extended(*shape, {{"n", 0}});
  const Shape* real = table.extended(*shape, {{"n", 0.0}});
  const Shape* negative = table.extended(*shape, {{"n", -0.0}});
  EXPECT_NE(integer, real);
  EXPECT_NE(real, negative);
}

TEST(ShapeTableTest, TakesNoConstantWithoutAnExactForm) {
  ShapeTable table;
  const Shape* shape = shapeOf(table, {"a"});
  EXPECT_EQ(table.extended(*shape, {{"date", Date{0.1}}}), nullptr);
  EXPECT_EQ(table.extended(*shape, {{"list", ValueArray{1}}}), nullptr);
  EXPECT_EQ(table.extended(*shape, {{"map", ValueMap{}}}), nullptr);
}

TEST(ShapeTableTest, AppendsAKeyToAShapeOfKeys) {
  ShapeTable table;
  const Shape* shape = shapeOf(table, {"a"});
  EXPECT_EQ(table.appended(*shape, "b"), shapeOf(table, {"a", "b"}));
  EXPECT_EQ(table.appended(*table.extended(*shape, {{"tag", 1}}), "b"), nullptr);
}

TEST(ShapeTableTest, KnowsNothingOfShapesOfOtherTables) {
  ShapeTable table;
  ShapeTable other;
  const Shape* shape = shapeOf(other, {"a"});
  EXPECT_EQ(table.appended(*shape, "b"), nullptr);
  EXPECT_EQ(table.extended(*shape, {{"tag", 1}}), nullptr);
}

TEST(ShapeTableTest, ItsShapesOutliveIt) {
  Counted<const Shape> kept;
  {
    ShapeTable table;
    const Shape* shape = shapeOf(table, {"a", "b"});
    kept = Counted<const Shape>(*table.extended(*shape, {{"tag", "text"}}));
  }
  EXPECT_EQ(kept->find("b"), 1U);
  EXPECT_EQ(kept->base()->size(), 2U);
  EXPECT_EQ(kept->constant(2).value(), Value("text"));
}

TEST(ShapeTableTest, MakesNoMoreShapesThanItsLimit) {
  ShapeTable table;
  for (std::size_t at = 0; at < ShapeTable::kMaxShapes; ++at)
    ASSERT_NE(shapeOf(table, {"key" + std::to_string(at)}), nullptr) << at;
  EXPECT_EQ(shapeOf(table, {"one more"}), nullptr);
  EXPECT_EQ(table.extended(*shapeOf(table, {"key0"}), {{"tag", 1}}), nullptr);
  EXPECT_NE(shapeOf(table, {"key7"}), nullptr);
  EXPECT_EQ(table.shapes(), ShapeTable::kMaxShapes);
}

TEST(ShapeTableTest, CountsExtendedShapesToo) {
  ShapeTable table;
  const Shape* shape = shapeOf(table, {"a"});
  for (std::size_t at = 1; at < ShapeTable::kMaxShapes; ++at)
    ASSERT_NE(table.extended(*shape, {{"tag", static_cast<int>(at)}}), nullptr) << at;
  EXPECT_EQ(table.extended(*shape, {{"tag", "one more"}}), nullptr);
  EXPECT_NE(table.extended(*shape, {{"tag", 5}}), nullptr);
  EXPECT_EQ(shapeOf(table, {"b"}), nullptr);
}

TEST(ShapeTableTest, HoldsNoMoreKeysThanItsLimit) {
  ShapeTable table;
  Place last = ShapeTable::root();
  for (std::size_t at = 0; at < ShapeTable::kMaxKeys; ++at) {
    last = table.next(ShapeTable::root(), std::to_string(at));
    ASSERT_NE(last, ShapeTable::none()) << at;
  }
  EXPECT_EQ(table.next(ShapeTable::root(), "one more"), ShapeTable::none());
  EXPECT_EQ(table.next(last, "one more"), ShapeTable::none());
  EXPECT_EQ(table.next(ShapeTable::root(), std::to_string(ShapeTable::kMaxKeys - 1)), last);
  EXPECT_EQ(table.keys(), ShapeTable::kMaxKeys);
}

TEST(ShapeTableTest, TakesNoLongerSequenceThanItsLimit) {
  ShapeTable table;
  EXPECT_NE(shapeOf(table, numbered(ShapeTable::kMaxKeysOfShape)), nullptr);
  EXPECT_EQ(shapeOf(table, numbered(ShapeTable::kMaxKeysOfShape + 1)), nullptr);
}

TEST(ShapeTableTest, HoldsNoMoreBytesThanItsLimit) {
  ShapeTable table;
  const Shape* kept = shapeOf(table, {"kept"});
  const std::string longKey(10'000, 'k');
  std::size_t count = 0;
  while (table.next(ShapeTable::root(), longKey + std::to_string(count)) != ShapeTable::none()) ++count;
  EXPECT_GT(count, ShapeTable::kMaxBytes / 11'000);
  EXPECT_LE(table.bytes(), ShapeTable::kMaxBytes);
  EXPECT_GT(table.bytes(), ShapeTable::kMaxBytes - 11'000);
  EXPECT_EQ(shapeOf(table, {longKey + "0"}), nullptr);  // the key is there, but its shape has no room
  EXPECT_EQ(shapeOf(table, {"kept"}), kept);
}

TEST(ShapeTableTest, RefusesOnlyTheShapeThatIsTooLarge) {
  ShapeTable table;
  const Shape* shape = shapeOf(table, {"a"});
  const std::string longKey(ShapeTable::kMaxBytes / 3, 'x');
  ASSERT_NE(table.next(ShapeTable::root(), longKey), ShapeTable::none());
  EXPECT_EQ(shapeOf(table, {longKey, "b"}), nullptr);
  EXPECT_EQ(shapeOf(table, {longKey, "b"}), nullptr);
  EXPECT_EQ(table.extended(*shape, {{"tag", std::string(ShapeTable::kMaxBytes, 'x')}}), nullptr);
  EXPECT_NE(shapeOf(table, {"b"}), nullptr);
  EXPECT_NE(table.extended(*shape, {{"tag", "text"}}), nullptr);
  EXPECT_LE(table.bytes(), ShapeTable::kMaxBytes);
}

TEST(ShapeTableTest, BoundsTheBytesOfKeysAndConstantsOnTheWire) {
  ShapeTable table;
  const auto onTheWire = [](const Shape& shape) {
    std::string bytes;
    for (std::size_t slot = 0; slot < shape.size(); ++slot) {
      EXPECT_TRUE(appendEncoded(bytes, Value(shape.key(slot))));
      if (shape.isConstant(slot)) bytes += shape.constant(slot).bytes();
    }
    return bytes.size();
  };
  EXPECT_EQ(shapeOf(table, {})->wireBytes(), 0U);
  for (const std::size_t size : {0U, 1U, 31U, 32U, 255U, 256U, 65535U, 65536U}) {
    const Shape* shape = shapeOf(table, {"a", std::string(size, 'k')});
    ASSERT_NE(shape, nullptr) << size;
    EXPECT_GE(shape->wireBytes(), onTheWire(*shape)) << size;
    EXPECT_LE(shape->wireBytes(), onTheWire(*shape) + 4) << size;
    const Shape* extended =
        table.extended(*shape, {{"a", std::string(size, 'v')}, {"real", 0.5}, {"truth", true}});
    ASSERT_NE(extended, nullptr) << size;
    EXPECT_GE(extended->wireBytes(), onTheWire(*extended)) << size;
    EXPECT_LE(extended->wireBytes(), onTheWire(*extended) + 4) << size;
  }
}

TEST(ShapeTableTest, FindsOneOfManyKeysThatMayFollow) {
  ShapeTable table;
  std::vector<Place> places;
  places.reserve(5000);
  for (int at = 0; at < 5000; ++at) places.push_back(table.next(ShapeTable::root(), std::to_string(at)));
  for (int at = 4999; at >= 0; at -= 7)
    EXPECT_EQ(table.find(ShapeTable::root(), std::to_string(at)), places[static_cast<std::size_t>(at)]);
}

// The key as MessagePack has it, with a value behind it.
std::string entryOf(const std::string& key) { return static_cast<char>(0xA0 + key.size()) + key + "\x07"; }

TEST(ShapeTableTest, WalksAlongKeysThatCameLately) {
  for (std::size_t size = 3; size < 32; ++size) {
    ShapeTable table;
    const std::string key(size, 'k');
    const std::string other(34 - size, 'o');
    const ShapeTable::Place first = table.next(ShapeTable::root(), "first");
    const ShapeTable::Place place = table.next(first, key);
    const ShapeTable::Place beside = table.next(first, other);
    ShapeTable::Place walked = first;
    EXPECT_EQ(table.walk(walked, entryOf(other)), 1 + other.size());
    EXPECT_EQ(walked, beside);
    // Any of a few is found when it has been looked for, but no other.
    EXPECT_EQ(table.find(first, key), place);
    EXPECT_EQ(table.find(first, other), beside);
    walked = first;
    EXPECT_EQ(table.walk(walked, entryOf(key)), 1 + size);
    EXPECT_EQ(walked, place);
    walked = first;
    EXPECT_EQ(table.walk(walked, entryOf(key + "x")), 0U);
    EXPECT_EQ(table.walk(walked, std::string_view(entryOf(key)).substr(0, size)), 0U);
    EXPECT_EQ(walked, first);
    walked = ShapeTable::root();
    EXPECT_EQ(table.walk(walked, entryOf(key)), 0U);
  }
}

TEST(ShapeTableTest, DoesNotWalkAlongAKeyThatDiffersInOneCharacter) {
  for (std::size_t size = 1; size < 32; ++size) {
    ShapeTable table;
    const ShapeTable::Place place = table.next(ShapeTable::root(), std::string(size, 'k'));
    for (std::size_t at = 0; at < size; ++at) {
      std::string other(size, 'k');
      other[at] = 'o';
      ShapeTable::Place walked = ShapeTable::root();
      EXPECT_EQ(table.walk(walked, entryOf(other)), 0U) << size << " " << at;
      EXPECT_EQ(table.walk(walked, entryOf(std::string(size, 'k'))), 1 + size);
      EXPECT_EQ(walked, place);
    }
  }
}

TEST(ShapeTableTest, DoesNotWalkAlongALongKey) {
  ShapeTable table;
  const std::string key(32, 'k');
  const ShapeTable::Place place = table.next(ShapeTable::root(), key);
  ShapeTable::Place walked = ShapeTable::root();
  EXPECT_EQ(table.walk(walked, "\xD9\x20" + key), 0U);
  EXPECT_EQ(table.walk(walked, entryOf(key)), 0U);
  EXPECT_EQ(table.find(ShapeTable::root(), key), place);
}

}  // namespace
}  // namespace tonewerk
