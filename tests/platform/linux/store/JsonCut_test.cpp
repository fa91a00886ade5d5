// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/JsonCut.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <string>

#include "values/CompactJson.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

std::string textOf(const ValueMap& map, std::string_view hidden = {}) {
  std::string text;
  appendCompactJson(text, map, hidden);
  return text;
}

// The text of the map without "hidden", or why there is none.
std::string cut(const ValueMap& map, std::string_view key = "hidden") {
  std::string text = textOf(map);
  const std::optional<JsonCut> found = cutOfEntry(text, map, key);
  if (!found) return "not found";
  return text.erase(found->begin, found->size);
}

TEST(JsonCutTest, LeavesOutAnEntryAtAnyPlace) {
  EXPECT_EQ(cut({{"hidden", 1.5}, {"a", 1}, {"b", 2}}), R"({"a":1,"b":2})");
  EXPECT_EQ(cut({{"a", 1}, {"hidden", -1}, {"b", 2}}), R"({"a":1,"b":2})");
  EXPECT_EQ(cut({{"a", 1}, {"b", 2}, {"hidden", 1e300}}), R"({"a":1,"b":2})");
  EXPECT_EQ(cut({{"hidden", 0}}), "{}");
  EXPECT_EQ(cut({{"a\u00e4\u20ac\U0001F600", "\u00fc"}, {"hidden", 7}}),
            "{\"a\u00e4\u20ac\U0001F600\":\"\u00fc\"}");
}

TEST(JsonCutTest, LeavesOutNothingWhenTheEntryIsNotThere) {
  EXPECT_EQ(cut({{"a", 1}}), R"({"a":1})");
  EXPECT_EQ(cut({{"a", ValueMap{{"hidden", 1}}}}), R"({"a":{"hidden":1}})");
  EXPECT_EQ(cut({{"hidden_too", 1}}), R"({"hidden_too":1})");
}

TEST(JsonCutTest, IsNotMisledByTexts) {
  EXPECT_EQ(cut({{"a", R"(,"hidden":1,)"}, {"hidden", 2}}), textOf({{"a", R"(,"hidden":1,)"}}));
  EXPECT_EQ(cut({{"a", "hidden"}, {"hidden", 2}, {"unhidden", 3}}), R"({"a":"hidden","unhidden":3})");
}

TEST(JsonCutTest, FindsNoEntryWhoseEndItDoesNotKnow) {
  for (const Value& value : {Value("text"), Value(true), Value(), Value(ValueArray{1}), Value(Date{1.0})}) {
    EXPECT_EQ(cut({{"a", 1}, {"hidden", value}}), "not found") << value.text();
  }
}

TEST(JsonCutTest, FindsNoEntryThatMayBeThatOfANestedObject) {
  const ValueMap nested{{"hidden", 1}};
  EXPECT_EQ(cut({{"a", nested}, {"hidden", 2}}), "not found");
  EXPECT_EQ(cut({{"a", 1}, {"hidden", 2}, {"b", nested}}), "not found");
  EXPECT_EQ(cut({{"hidden", 2}, {"b", nested}}), R"({"b":{"hidden":1}})");
}

TEST(JsonCutTest, FindsNoUnusualKey) {
  EXPECT_EQ(cut({{"a", 1}, {",", 2}}, ","), "not found");
  EXPECT_EQ(cut({{"a", 1}, {"x\"", 2}}, "x\""), "not found");
  EXPECT_EQ(cut({{"a", 1}, {"", 2}}, ""), "not found");
}

RC_GTEST_PROP(JsonCutProperty, WhatRemainsIsTheTextWithoutTheEntry, ()) {
  const auto count = *rc::gen::inRange<std::size_t>(0, 6);
  const auto place = *rc::gen::inRange<std::size_t>(0, count + 1);
  ValueMap map;
  for (std::size_t n = 0; n <= count; ++n) {
    if (n == place) map.set("hidden", *rc::gen::arbitrary<double>());
    if (n < count) map.set(*rc::gen::arbitrary<std::string>(), *rc::gen::arbitrary<std::string>());
  }
  RC_PRE(map.size() == count + 1);
  RC_ASSERT(cut(map) == textOf(map, "hidden"));
}

}  // namespace
}  // namespace tonewerk
