// SPDX-License-Identifier: Apache-2.0
#include "values/ValueMap.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "support/ValueGenerators.h"

namespace tonewerk {
namespace {

// A model of a map: a list of keys and values that is searched from its beginning.
class ModelMap {
 public:
  void set(const std::string& key, const Value& value) {
    const auto found = find(key);
    if (found != entries_.end()) {
      found->second = value;
    } else {
      entries_.emplace_back(key, value);
    }
  }
  bool erase(const std::string& key) {
    const auto found = find(key);
    if (found == entries_.end()) return false;
    entries_.erase(found);
    return true;
  }
  void merge(const ValueMap& other) {
    for (const ValueMapEntry& entry : other) set(entry.key.string(), entry.value);
  }

  bool matches(const ValueMap& map) const {
    if (map.size() != entries_.size()) return false;
    const bool sameOrder =
        std::equal(entries_.begin(), entries_.end(), map.begin(), [](const auto& a, const auto& b) {
          return b.key == std::string_view(a.first) && a.second == b.value;
        });
    const bool allFound = std::all_of(entries_.begin(), entries_.end(), [&](const auto& entry) {
      const Value* found = map.find(entry.first);
      return found != nullptr && *found == entry.second;
    });
    return sameOrder && allFound;
  }

 private:
  std::vector<std::pair<std::string, Value>>::iterator find(const std::string& key) {
    return std::find_if(entries_.begin(), entries_.end(),
                        [&](const auto& entry) { return entry.first == key; });
  }

  std::vector<std::pair<std::string, Value>> entries_;
};

std::size_t recountedBytes(const ValueMap& map) {
  std::size_t bytes = 0;
  for (const ValueMapEntry& entry : map)
    bytes += sizeof(ValueMapEntry) + entry.key.size() + entry.value.bytes();
  return bytes;
}

ValueMap numbered(int count) {
  ValueMap map;
  for (int number = 0; number < count; ++number) map.set("key" + std::to_string(number), number);
  return map;
}

RC_GTEST_PROP(ValueMapTest, BehavesLikeAListOfKeysAndValues, ()) {
  ValueMap map;
  ModelMap model;
  const auto steps = *rc::gen::container<std::vector<std::tuple<int, std::string>>>(
      rc::gen::tuple(rc::gen::inRange(0, 10), generate::key()));
  for (const auto& [action, key] : steps) {
    if (action < 6) {
      const Value value = *generate::scalar();
      map.set(key, value);
      model.set(key, value);
    } else if (action < 9) {
      RC_ASSERT(map.erase(key) == model.erase(key));
    } else {
      const ValueMap other = *generate::map(1);
      map.merge(other);
      model.merge(other);
    }
    RC_ASSERT(model.matches(map));
    RC_ASSERT(map.bytes() == recountedBytes(map));
  }
}

// A map that grew beyond 16 keys, shrank and grew again used to lose the keys set last.
TEST(ValueMapTest, FindsKeysSetAfterErasuresInALargeMap) {
  ValueMap map = numbered(40);
  for (int number = 0; number < 39; ++number) map.erase("key" + std::to_string(number));
  for (int number = 100; number < 140; ++number) {
    const std::string key = "key" + std::to_string(number);
    map.set(key, number);
    ASSERT_EQ(map.integer(key), number);
  }
  EXPECT_EQ(map.size(), 41U);
}

TEST(ValueMapTest, KeepsAKeysPlaceWhenItsValueIsReplaced) {
  ValueMap map{{"a", 1}, {"b", 2}, {"c", 3}};
  map.set("b", "new");
  EXPECT_EQ(map.text(), R"({"a":1,"b":"new","c":3})");
  map.erase("a");
  map.set("a", 4);
  EXPECT_EQ(map.text(), R"({"b":"new","c":3,"a":4})");
}

TEST(ValueMapTest, AddsKeysThatAreNew) {
  ValueMap map;
  for (int at = 0; at < 40; ++at) map.add("key" + std::to_string(at), at);
  EXPECT_EQ(map.size(), 40U);
  for (int at = 0; at < 40; ++at) EXPECT_EQ(map.integer("key" + std::to_string(at)), at);
}

TEST(ValueMapTest, AMergedTextReplacesAnEqualOneAndAnother) {
  const Value text("some text");
  ValueMap map{{"same", text}, {"other", "before"}, {"kept", 1}};
  const std::size_t bytes = map.bytes();
  map.merge({{"other", "longer than before"}, {"same", text}, {"new", true}});
  EXPECT_EQ(map, (ValueMap{{"same", text}, {"other", "longer than before"}, {"kept", 1}, {"new", true}}));
  EXPECT_GT(map.bytes(), bytes);
  map.erase("new");
  map.merge({{"other", "before"}});
  EXPECT_EQ(map.bytes(), bytes);
}

TEST(ValueMapTest, TheLastValueOfARepeatedKeyWins) {
  EXPECT_EQ((ValueMap{{"a", 1}, {"b", 2}, {"a", 3}}).text(), R"({"a":3,"b":2})");
}

RC_GTEST_PROP(ValueMapTest, OrderDoesNotMatterToEquality, ()) {
  const ValueMap map = *generate::map();
  ValueMap reversed;
  for (auto entry = map.end(); entry != map.begin();) {
    --entry;
    reversed.set(entry->key, entry->value);
  }
  RC_ASSERT(map == reversed);
  RC_ASSERT(reversed == map);
}

RC_GTEST_PROP(ValueMapTest, AMapWithAnotherKeyIsAnotherMap, ()) {
  const ValueMap map = *generate::map();
  ValueMap other = map;
  other.set("a key that is in no map", 1);
  RC_ASSERT_FALSE(map == other);
  RC_ASSERT(map.equalsIgnoring(other, {"a key that is in no map"}));
  RC_ASSERT(other.equalsIgnoring(map, {"a key that is in no map"}));
}

TEST(ValueMapTest, IgnoredKeysMayDifferOrBeAbsentOnEitherSide) {
  const ValueMap a{{"time", 1}, {"level", 5}};
  EXPECT_TRUE(a.equalsIgnoring(ValueMap{{"time", 2}, {"level", 5}}, {"time"}));
  EXPECT_TRUE(a.equalsIgnoring(ValueMap{{"level", 5}}, {"time", "nowhere"}));
  EXPECT_FALSE(a.equalsIgnoring(ValueMap{{"time", 1}, {"level", 6}}, {"time"}));
  EXPECT_FALSE(a.equalsIgnoring(ValueMap{{"other", 5}, {"time", 1}}, {"time"}));
}

RC_GTEST_PROP(ValueMapTest, WritingToACopyLeavesTheOriginalAlone, ()) {
  const ValueMap original = *generate::map();
  const std::string before = original.text();
  ValueMap copy = original;
  RC_ASSERT(copy.sharesStorageWith(original));
  copy.set(*generate::key(), Value("changed"));
  if (!original.empty()) copy.erase(original.begin()->key);
  copy.merge(*generate::map());
  RC_ASSERT(original.text() == before);
}

TEST(ValueMapTest, MergingIntoAnEmptyMapSharesItsStorage) {
  const ValueMap other = numbered(3);
  ValueMap map;
  map.merge(other);
  EXPECT_TRUE(map.sharesStorageWith(other));
}

TEST(ValueMapTest, AnEmptiedMapEqualsAnEmptyOne) {
  ValueMap map{{"a", 1}};
  EXPECT_TRUE(map.erase("a"));
  EXPECT_FALSE(map.erase("a"));
  EXPECT_EQ(map, ValueMap());
  EXPECT_EQ(map.bytes(), 0U);
}

TEST(ValueMapTest, FindsEveryKeyOfALargeMap) {
  const ValueMap map = numbered(5000);
  for (int number = 0; number < 5000; ++number)
    ASSERT_EQ(map.integer("key" + std::to_string(number)), number);
  EXPECT_FALSE(map.contains("key5000"));
}

TEST(ValueMapTest, AnAbsentKeyReadsAsZeroFalseOrEmpty) {
  const ValueMap map;
  EXPECT_EQ(map.find("a"), nullptr);
  EXPECT_FALSE(map.boolean("a"));
  EXPECT_EQ(map.integer("a"), 0);
  EXPECT_EQ(map.number("a"), 0.0);
  EXPECT_EQ(map.text("a"), "");
}

RC_GTEST_PROP(ValueArrayTest, WritingToACopyLeavesTheOriginalAlone, ()) {
  const ValueArray original(*rc::gen::container<std::vector<Value>>(generate::scalar()));
  const std::size_t size = original.size();
  ValueArray copy = original;
  copy.append(1);
  RC_ASSERT(original.size() == size);
  RC_ASSERT(copy.size() == size + 1);
  RC_ASSERT_FALSE(original == copy);
}

}  // namespace
}  // namespace tonewerk
