// SPDX-License-Identifier: Apache-2.0
#include "values/PrettyJson.h"

#include <gtest/gtest.h>
#include <limits>
#include <optional>
#include <rapidcheck/gtest.h>
#include <string>

#include "support/PackedMaps.h"
#include "support/ValueGenerators.h"

namespace tonewerk {
namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

std::optional<std::string> pretty(const ValueMap& map, std::string& problem) {
  std::string text;
  return appendPrettyJson(text, map, problem) ? std::optional(text) : std::nullopt;
}

TEST(PrettyJsonTest, APackedMapHasTheTextOfItsTree) {
  const std::vector<ValueMapEntry> entries{
      {"quote\"", 1},      {"b", -2.5},
      {"\xC3\xA4", true},  {"text", "line\n\"x\""},
      {"", false},         {"big", std::numeric_limits<std::uint64_t>::max()},
      {"whole", 48'000.0}, {"long", std::string(300, 'x')}};
  ShapeTable shapes;
  ValueMap tree;
  for (const ValueMapEntry& entry : entries) tree.set(entry.key, entry.value);
  std::string problem;
  EXPECT_EQ(pretty(packedMapOf(entries, shapes), problem), pretty(tree, problem));
}

TEST(PrettyJsonTest, ConstantsOfAShapeAreWrittenLikeItsValues) {
  ShapeTable shapes;
  ValueMap map = packedMapOf({{"a", 1}, {"b", 2}}, shapes);
  const Shape* extended = shapes.extended(*map.shape(), {{"a", "one"}, {"c", true}});
  ASSERT_TRUE(map.extend(*extended));
  std::string problem;
  EXPECT_EQ(pretty(map, problem), "{\n  \"a\": \"one\",\n  \"b\": 2,\n  \"c\": true\n}");
}

TEST(PrettyJsonTest, AMemberIsTheOnlyEntryOfItsMap) {
  std::string text = "before ";
  std::string problem;
  EXPECT_TRUE(appendPrettyJson(text, "the \"first\"", ValueMap{{"a", ValueArray{1, 2}}}, problem));
  EXPECT_EQ(text, R"(before {
  "the \"first\"": {
    "a": [
      1,
      2
    ]
  }
})");
  text.clear();
  EXPECT_TRUE(appendPrettyJson(text, "empty", ValueMap(), problem));
  EXPECT_EQ(text, "{\n  \"empty\": {}\n}");
}

RC_GTEST_PROP(PrettyJsonTest, AMemberIsWrittenAsInAMapOfOneEntry, ()) {
  const ValueMap map = *generate::map();
  std::string problem;
  std::string otherProblem;
  std::string text;
  const bool isWritten = appendPrettyJson(text, "Volume_Summary_1", map, problem);
  RC_ASSERT(pretty(ValueMap{{"Volume_Summary_1", map}}, otherProblem) ==
            (isWritten ? std::optional(text) : std::nullopt));
  RC_ASSERT(problem == otherProblem);
}

TEST(PrettyJsonTest, AProblemLeavesTheTextAndNamesThePlace) {
  ShapeTable shapes;
  const ValueMap packed = packedMapOf({{"long", std::string(3'000, 'x')}, {"level", kNaN}, {"b", 1}}, shapes);
  std::string text = "before";
  std::string problem;
  EXPECT_FALSE(appendPrettyJson(text, "Volume_Generic_1", packed, problem));
  EXPECT_EQ(text, "before");
  EXPECT_EQ(problem, "Volume_Generic_1.level is nan, which JSON cannot say");
  const ValueMap deep{{"a", ValueArray{1, ValueMap{{"b", -std::numeric_limits<double>::infinity()}}}}};
  EXPECT_FALSE(appendPrettyJson(text, deep, problem));
  EXPECT_EQ(text, "before");
  EXPECT_EQ(problem, "a[1].b is -inf, which JSON cannot say");
}

}  // namespace
}  // namespace tonewerk
