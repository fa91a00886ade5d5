// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/JsonTree.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <rapidcheck.h>
#include <rapidcheck/gtest.h>

#include "support/ValueGenerators.h"

namespace tonewerk {
namespace {

using Failure = JsonTree::Failure;
using Json = nlohmann::json;
using Kind = JsonTree::Kind;
using Node = JsonTree::Node;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

// Converts the tree below `node` into the library's own tree.
Json asJson(const JsonTree& tree, const Node& node) {
  switch (node.kind) {
    case Kind::kNull:
      return nullptr;
    case Kind::kBoolean:
      return node.boolean;
    case Kind::kInteger:
      return node.integer;
    case Kind::kUnsigned:
      return node.unsignedInteger;
    case Kind::kDouble:
      return node.number;
    case Kind::kText:
      return tree.textOf(node);
    case Kind::kArray:
    case Kind::kObject:
      break;
  }
  Json made = node.kind == Kind::kArray ? Json::array() : Json::object();
  std::uint64_t count = 0;
  for (const Node* one = JsonTree::first(node); one != JsonTree::end(node); one = JsonTree::next(*one)) {
    ++count;
    if (node.kind == Kind::kArray) {
      made.push_back(asJson(tree, *one));
    } else {
      made[std::string(tree.keyOf(*one))] = asJson(tree, *one);
    }
  }
  EXPECT_EQ(node.count, count);
  return made;
}

Json parsed(const std::string& text) {
  JsonTree tree;
  std::string words;
  EXPECT_EQ(tree.parse(text, words), Failure::kNone) << words;
  EXPECT_THAT(words, IsEmpty());
  return asJson(tree, tree.root());
}

TEST(JsonTreeTest, HoldsEveryKindOfValue) {
  const std::string text =
      R"({"null": null, "booleans": [true, false], "integers": [0, -1, 9223372036854775807, -9223372036854775808,)"
      R"( 18446744073709551615], "numbers": [0.5, -2.0, 1e3, 18446744073709551616], "text": "a\"\u00e4\n",)"
      R"( "empty": {"object": {}, "array": [], "": ""}})";
  EXPECT_EQ(parsed(text), Json::parse(text));
}

TEST(JsonTreeTest, HoldsATextThatIsOneValue) {
  EXPECT_EQ(parsed("7"), Json(7));
  EXPECT_EQ(parsed("\"a\""), Json("a"));
  EXPECT_EQ(parsed(" [] "), Json::array());
}

TEST(JsonTreeTest, TellsIntegersFromDoubles) {
  JsonTree tree;
  std::string words;
  ASSERT_EQ(tree.parse("[1, -1, 1.0, 18446744073709551616]", words), Failure::kNone);
  std::vector<Kind> kinds;
  for (const Node* one = JsonTree::first(tree.root()); one != JsonTree::end(tree.root());
       one = JsonTree::next(*one)) {
    kinds.push_back(one->kind);
  }
  EXPECT_THAT(kinds, ElementsAre(Kind::kUnsigned, Kind::kInteger, Kind::kDouble, Kind::kDouble));
}

TEST(JsonTreeTest, FindsAnObjectsFieldsAndNotThoseOfObjectsInIt) {
  JsonTree tree;
  std::string words;
  ASSERT_EQ(tree.parse(R"({"a": {"b": 1, "c": 2}, "b": 3})", words), Failure::kNone);
  ASSERT_NE(tree.field(tree.root(), "b"), nullptr);
  EXPECT_EQ(tree.field(tree.root(), "b")->unsignedInteger, 3U);
  EXPECT_EQ(tree.field(tree.root(), "c"), nullptr);
  EXPECT_EQ(tree.field(*tree.field(tree.root(), "a"), "b")->unsignedInteger, 1U);
}

TEST(JsonTreeTest, OfAFieldGivenTwiceTheLastCounts) {
  JsonTree tree;
  std::string words;
  ASSERT_EQ(tree.parse(R"({"a": [1], "b": 2, "a": 3})", words), Failure::kNone);
  EXPECT_EQ(tree.field(tree.root(), "a")->unsignedInteger, 3U);
}

TEST(JsonTreeTest, NamesThePositionOfASyntaxError) {
  JsonTree tree;
  std::string words;
  EXPECT_EQ(tree.parse("{\"a\":\n 1 2}", words), Failure::kNotJson);
  EXPECT_THAT(words, HasSubstr("line 2, column 4"));
  for (const char* text : {"", "[1", "[1]]", "{\"a\"}", "nul", "\"\xff\"", "[1,]", "// none\n1"}) {
    EXPECT_EQ(tree.parse(text, words), Failure::kNotJson) << text;
  }
}

TEST(JsonTreeTest, RefusesNumbersThatNoDoubleCanHold) {
  JsonTree tree;
  std::string words;
  EXPECT_EQ(tree.parse("[1e999]", words), Failure::kNumberOutOfRange);
}

TEST(JsonTreeTest, NestingUsesNoStack) {
  constexpr std::size_t kDepth = 100'000;
  JsonTree tree;
  std::string words;
  ASSERT_EQ(tree.parse(std::string(kDepth, '[') + std::string(kDepth, ']'), words), Failure::kNone);
  EXPECT_EQ(tree.root().span, kDepth);
  EXPECT_EQ(tree.root().count, 1U);
}

TEST(JsonTreeTest, ParsingAgainReplacesTheTree) {
  JsonTree tree;
  std::string words;
  ASSERT_EQ(tree.parse(R"({"a": 1})", words), Failure::kNone);
  ASSERT_EQ(tree.parse(R"(["b"])", words), Failure::kNone);
  EXPECT_EQ(asJson(tree, tree.root()), Json::array({"b"}));
}

RC_GTEST_PROP(JsonTreeProperties, IsTheLibrarysOwnTree, ()) {
  const std::string text = (*generate::map()).text();
  RC_ASSERT(parsed(text) == Json::parse(text));
}

}  // namespace
}  // namespace tonewerk
