// SPDX-License-Identifier: Apache-2.0
#include "values/PackedMap.h"

#include <cstddef>
#include <cstdlib>
#include <gtest/gtest.h>
#include <initializer_list>
#include <memory>
#include <new>
#include <string>
#include <string_view>
#include <thread>

#include "values/ShapeTable.h"
#include "values/Value.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

// A chunk that holds what fits, and counts what is given back.
class CountingChunk final : public PackedChunk {
 public:
  static CountingChunk* make() { return new (std::aligned_alloc(kBytes, kBytes)) CountingChunk(); }
  static void end(CountingChunk* chunk) {
    chunk->~CountingChunk();
    std::free(chunk);
  }

  void* take(std::size_t bytes) override {
    const std::size_t rounded = (bytes + alignof(PackedMap) - 1) / alignof(PackedMap) * alignof(PackedMap);
    if (rounded > kBytes - used_) return nullptr;
    void* memory = reinterpret_cast<char*>(this) + used_;
    used_ += rounded;
    ++held;
    return memory;
  }
  void giveBack(void*) override { --held; }

  int held = 0;

 private:
  std::size_t used_ = 64;
};

class PackedMapTest : public ::testing::Test {
 protected:
  ShapeTable shapes{{"time"}};

  const Shape& shapeOf(const ValueMap& map) {
    ShapeTable::Place place = ShapeTable::root();
    for (const ValueMapEntry& entry : map) place = shapes.next(place, entry.key);
    return *shapes.shapeAt(place);
  }

  ValueMap packed(const ValueMap& map, PackedChunk* chunk = nullptr) {
    std::string values;
    for (const ValueMapEntry& entry : map) EXPECT_TRUE(appendEncoded(values, entry.value));
    return ValueMap(PackedMap::make(shapeOf(map), values, chunk));
  }
};

TEST_F(PackedMapTest, IsAValueMap) {
  const ValueMap tree{{"a", 1}, {"b", "text"}, {"c", 2.5}};
  const ValueMap map = packed(tree);
  EXPECT_NE(map.packed(), nullptr);
  EXPECT_EQ(map, tree);
  EXPECT_EQ(map.text(), tree.text());
  EXPECT_EQ(map.bytes(), PackedMap::kHeaderBytes + 1 + 5 + 9);
  EXPECT_EQ(tree.packed(), nullptr);
  EXPECT_EQ(tree.shape(), nullptr);
}

TEST_F(PackedMapTest, WithoutKeysIsTheEmptyMap) {
  const ValueMap map = packed({});
  EXPECT_TRUE(map.empty());
  EXPECT_TRUE(map.sharesStorageWith(ValueMap()));
  EXPECT_EQ(map.text(), "{}");
}

TEST_F(PackedMapTest, ACopySharesItsStorageUntilOneIsWritten) {
  const ValueMap map = packed({{"a", 1}});
  ValueMap copy = map;
  EXPECT_TRUE(copy.sharesStorageWith(map));
  copy.set("a", 2);
  EXPECT_EQ(copy.text(), R"({"a":2})");
  EXPECT_EQ(map.text(), R"({"a":1})");
  EXPECT_NE(map.packed(), nullptr);
}

TEST_F(PackedMapTest, ReadingMakesNoTree) {
  const ValueMap map = packed({{"a", 1}, {"b", "text"}});
  EXPECT_EQ(map.integer("a"), 1);
  EXPECT_EQ(map.view("b").asText(), "text");
  const std::size_t bytes = map.bytes();
  // A pointer into the tree stays valid as long as the map does.
  const Value* b = map.find("b");
  EXPECT_EQ(map.find("b"), b);
  EXPECT_EQ(map.begin() + 1, map.end() - 1);
  EXPECT_EQ(map.bytes(), bytes);
}

TEST_F(PackedMapTest, HasOneTreeForAllThreads) {
  for (int round = 0; round < 100; ++round) {
    const ValueMap map = packed({{"a", round}, {"b", "text"}});
    const Value* other = nullptr;
    std::thread thread([&] { other = map.find("b"); });
    const Value* own = map.find("b");
    const std::int64_t a = map.view("a").integer();  // while the other thread may put the tree beside it
    thread.join();
    EXPECT_EQ(own, other);
    EXPECT_EQ(a, round);
    EXPECT_EQ(map.shape()->size(), 2U);
  }
}

TEST_F(PackedMapTest, ExtendsInPlaceWhenItIsTheOnlyOne) {
  ValueMap map = packed({{"a", 1}, {"app", "unknown"}, {"b", 2}});
  const PackedMap* block = map.packed();
  const Shape* extended = shapes.extended(*map.shape(), {{"tag", "t"}, {"app", "player"}});
  EXPECT_NE(map.find("app"), nullptr);  // its tree must not stay
  ASSERT_TRUE(map.extend(*extended));
  EXPECT_EQ(map.packed(), block);
  EXPECT_EQ(map.text(), R"({"a":1,"app":"player","b":2,"tag":"t"})");
  EXPECT_EQ(*map.find("app"), Value("player"));
  EXPECT_EQ(map.bytes(), PackedMap::kHeaderBytes + 2);
}

TEST_F(PackedMapTest, ExtendsACopyWhenItIsShared) {
  ValueMap map = packed({{"a", 1}, {"app", "unknown"}});
  const ValueMap other = map;
  ASSERT_TRUE(map.extend(*shapes.extended(*map.shape(), {{"app", "player"}})));
  EXPECT_EQ(map.text(), R"({"a":1,"app":"player"})");
  EXPECT_EQ(other.text(), R"({"a":1,"app":"unknown"})");
}

TEST_F(PackedMapTest, TakesOnlyAnExtensionOfItsOwnShape) {
  ValueMap map = packed({{"a", 1}});
  const Shape* other = shapes.extended(*packed({{"b", 1}}).shape(), {{"tag", "t"}});
  EXPECT_FALSE(map.extend(*other));
  ValueMap tree{{"a", 1}};
  EXPECT_FALSE(tree.extend(*shapes.extended(*map.shape(), {{"tag", "t"}})));
  EXPECT_EQ(map.text(), R"({"a":1})");
}

TEST_F(PackedMapTest, SetsNewAndKnownKeysAndStaysPacked) {
  ValueMap map = packed({{"time", "old"}, {"a", 1}});
  const ValueMap before = map;
  ASSERT_TRUE(map.setPacked({{"invalid", map.view("time")}, {"time", Value(5.5)}}, shapes));
  EXPECT_EQ(map.text(), R"({"time":5.5,"a":1,"invalid":"old"})");
  EXPECT_EQ(map.shape()->known(0), 0U);
  EXPECT_EQ(before.text(), R"({"time":"old","a":1})");
  ValueMap timeless = packed({{"a", 1}});
  ASSERT_TRUE(timeless.setPacked({{"invalid", Value("nil")}, {"time", Value(5.5)}}, shapes));
  EXPECT_EQ(timeless.text(), R"({"a":1,"invalid":"nil","time":5.5})");
}

TEST_F(PackedMapTest, SetsNothingThatNeedsATree) {
  ValueMap map = packed({{"a", 1}});
  EXPECT_FALSE(map.setPacked({{"b", Value(1)}, {"date", Value(Date{1})}}, shapes));
  EXPECT_FALSE(map.setPacked({{"b", map.view("absent")}}, shapes));
  ShapeTable other;
  EXPECT_FALSE(map.setPacked({{"b", Value(1)}}, other));
  EXPECT_TRUE(map.setPacked({{"a", Value(2)}}, other));  // needs no other shape
  ASSERT_TRUE(map.extend(*shapes.extended(*map.shape(), {{"tag", "t"}})));
  EXPECT_FALSE(map.setPacked({{"tag", Value(1)}}, shapes));
  EXPECT_FALSE(map.setPacked({{"b", Value(1)}}, shapes));
  EXPECT_TRUE(map.setPacked({{"a", Value(3)}}, shapes));
  EXPECT_EQ(map.text(), R"({"a":3,"tag":"t"})");
  ValueMap tree{{"a", 1}};
  EXPECT_FALSE(tree.setPacked({{"a", Value(2)}}, shapes));
}

TEST_F(PackedMapTest, ComparesTheSameShapeByValue) {
  const ValueMap one = packed({{"time", 1.5}, {"a", 1}, {"b", "text"}});
  EXPECT_EQ(one, packed({{"time", 1.5}, {"a", 1.0}, {"b", "text"}}));
  EXPECT_EQ(one, packed({{"time", 1.5}, {"a", true}, {"b", "text"}}));
  const ValueMap later = packed({{"time", 2}, {"a", 1}, {"b", "text"}});
  EXPECT_FALSE(one == later);
  EXPECT_TRUE(one.equalsIgnoring(later, {"time"}));
  EXPECT_FALSE(one.equalsIgnoring(packed({{"time", 2}, {"a", 1}, {"b", "texts"}}), {"time"}));
  EXPECT_TRUE(one.equalsIgnoring(packed({{"time", 2}, {"a", 1}, {"b", ""}}), {"time", "b"}));
}

TEST_F(PackedMapTest, ComparesConstantsWithValues) {
  ValueMap map = packed({{"a", 1}});
  ASSERT_TRUE(map.extend(*shapes.extended(*map.shape(), {{"tag", "t"}})));
  EXPECT_EQ(map, packed({{"tag", "t"}, {"a", 1}}));
  EXPECT_FALSE(map == packed({{"tag", "u"}, {"a", 1}}));
  ValueMap other = packed({{"a", 1}});
  ASSERT_TRUE(other.extend(*shapes.extended(*other.shape(), {{"tag", "u"}})));
  EXPECT_FALSE(map == other);
  EXPECT_TRUE(map.equalsIgnoring(other, {"tag"}));
}

TEST_F(PackedMapTest, AMergeKeepsTextsThatStayTheSame) {
  ValueMap all{{"b", "text"}, {"c", 3}};
  const SharedString text = *all.find("b")->asString();
  all.merge(packed({{"a", 1}, {"b", "text"}}));
  EXPECT_EQ(all.text(), R"({"b":"text","c":3,"a":1})");
  EXPECT_TRUE(all.find("b")->asString()->sharesStorageWith(text));
}

TEST_F(PackedMapTest, LiesInAChunkAndGivesItsMemoryBack) {
  CountingChunk* chunk = CountingChunk::make();
  {
    ValueMap map = packed({{"a", 1}, {"b", "text"}}, chunk);
    EXPECT_EQ(chunk->held, 1);
    EXPECT_EQ(map.text(), R"({"a":1,"b":"text"})");
    ASSERT_NE(map.find("a"), nullptr);
    ValueMap changed = map;
    ASSERT_TRUE(changed.setPacked({{"a", Value(2)}}, shapes, chunk));
    EXPECT_EQ(chunk->held, 2);
    ValueMap extended = map;
    ASSERT_TRUE(extended.extend(*shapes.extended(*map.shape(), {{"tag", "t"}}), chunk));
    EXPECT_EQ(chunk->held, 3);
  }
  EXPECT_EQ(chunk->held, 0);
  CountingChunk::end(chunk);
}

TEST_F(PackedMapTest, LiesOnTheHeapWhenTheChunkIsFull) {
  CountingChunk* chunk = CountingChunk::make();
  const ValueMap large = packed({{"a", std::string(PackedChunk::kBytes, 'x')}}, chunk);
  EXPECT_EQ(chunk->held, 0);
  EXPECT_EQ(large.text("a").size(), PackedChunk::kBytes);
  CountingChunk::end(chunk);
}

TEST_F(PackedMapTest, OutlivesItsTable) {
  auto table = std::make_unique<ShapeTable>();
  std::string values;
  ASSERT_TRUE(appendEncoded(values, 7));
  const Shape* shape = table->shapeAt(table->next(ShapeTable::root(), "key"));
  const ValueMap map(PackedMap::make(*shape, values));
  table.reset();
  EXPECT_EQ(map.text(), R"({"key":7})");
}

}  // namespace
}  // namespace tonewerk
