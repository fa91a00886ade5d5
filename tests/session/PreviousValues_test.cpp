// SPDX-License-Identifier: Apache-2.0
#include "session/PreviousValues.h"

#include <gmock/gmock.h>
#include <random>
#include <string>
#include <vector>

#include "support/PackedMaps.h"

namespace tonewerk {
namespace {

class PreviousValuesTest : public testing::Test {
 protected:
  ValueMap packed(const std::vector<ValueMapEntry>& entries) { return packedMapOf(entries, shapes); }

  ShapeTable shapes;
  KeptBytesBudget budget;
  PreviousValues values;
};

TEST_F(PreviousValuesTest, HoldsTheLatestValueOfEachKeyInTheOrderOfTheirFirstArrival) {
  EXPECT_TRUE(values.add(packed({{"a", 1}, {"b", 1}}), budget));
  EXPECT_TRUE(values.add(packed({{"c", 2}, {"a", 2}}), budget));
  EXPECT_TRUE(values.add(packed({{"a", 3}, {"b", 3}}), budget));
  EXPECT_EQ(values.merged().text(), R"({"a":3,"b":3,"c":2})");
  EXPECT_TRUE(values.add(packed({{"c", 4}, {"a", 4}}), budget));
  EXPECT_EQ(values.merged().text(), R"({"a":4,"b":3,"c":4})");
}

TEST_F(PreviousValuesTest, TreesAndPackedMapsAreMergedInTheirOrder) {
  EXPECT_TRUE(values.add(packed({{"a", 1}}), budget));
  EXPECT_TRUE(values.add(packed({{"a", 2}}), budget));
  EXPECT_TRUE(values.add(ValueMap{{"a", 3}, {"b", 3}}, budget));
  EXPECT_EQ(values.merged().text(), R"({"a":3,"b":3})");
  EXPECT_TRUE(values.add(packed({{"a", 4}}), budget));
  EXPECT_EQ(values.merged().text(), R"({"a":4,"b":3})");
}

TEST_F(PreviousValuesTest, WhatDoesNotFitChangesNothing) {
  EXPECT_TRUE(values.add(packed({{"a", 1}}), budget));
  KeptBytesBudget full(10);
  EXPECT_FALSE(values.add(packed({{"a", 2}}), full));
  EXPECT_FALSE(values.add(packed({{"b", 2}}), full));
  EXPECT_FALSE(values.add(ValueMap{{"b", 3}}, full));
  EXPECT_EQ(full.used(), 0U);
  EXPECT_EQ(values.merged().text(), R"({"a":1})");
}

TEST_F(PreviousValuesTest, AFullBudgetLosesNothingThatWasTakenBefore) {
  const std::string text(100, 'x');
  EXPECT_TRUE(values.add(packed({{"a", 1}, {"b", "short"}}), budget));
  EXPECT_TRUE(values.add(packed({{"a", 2}, {"b", text}}), budget));
  ASSERT_TRUE(budget.take(budget.limit() - budget.used() - 10));
  // A new shape: the latest values would become a tree first, for which there is no room.
  EXPECT_FALSE(values.add(packed({{"c", 3}}), budget));
  EXPECT_EQ(values.merged().text(), R"({"a":2,"b":")" + text + R"("})");
}

TEST_F(PreviousValuesTest, ACopyHoldsTheSame) {
  EXPECT_TRUE(values.add(packed({{"a", 1}}), budget));
  EXPECT_TRUE(values.add(packed({{"a", 2}}), budget));
  const PreviousValues copy = values;
  EXPECT_EQ(copy.bytes(), values.bytes());
  EXPECT_EQ(copy.merged().text(), R"({"a":2})");
}

// Also more shapes than are kept apart.
TEST_F(PreviousValuesTest, AgreesWithMergingEachMessage) {
  std::mt19937 random(7);
  ValueMap plain;
  const auto below = [&random](std::size_t limit) { return static_cast<unsigned>(random() % limit); };
  for (int step = 0; step < 20'000; ++step) {
    const unsigned shape = below(step % 1000 < 500 ? 8 : 2 * PreviousValues::kMaxShapes);
    std::vector<ValueMapEntry> entries;
    for (unsigned key = 0; key < 1 + shape % 5; ++key) {
      const Value value = below(3) == 0 ? Value(std::string(below(20), 'x')) : Value(below(100));
      entries.push_back({"key" + std::to_string((shape + key * (1 + shape % 3)) % 40), value});
    }
    if (below(20) == 0) {
      const ValueMap tree{{"key" + std::to_string(below(50)), below(100)}};
      ASSERT_TRUE(values.add(tree, budget));
      plain.merge(tree);
    } else {
      const ValueMap map = packed(entries);
      ASSERT_TRUE(values.add(map, budget));
      plain.merge(map);
    }
    ASSERT_EQ(budget.used(), values.bytes());
    if (step % 50 == 0) {
      ASSERT_EQ(values.merged().text(), plain.text()) << step;
      const std::string key = "key" + std::to_string(below(50));
      ASSERT_EQ(values.latestText(key), plain.text(key)) << step << ", " << key;
    }
  }
}

}  // namespace
}  // namespace tonewerk
