// SPDX-License-Identifier: Apache-2.0
#include "values/CompactJson.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>
#include <nlohmann/json.hpp>
#include <rapidcheck/gtest.h>
#include <string>
#include <string_view>
#include <vector>

#include "support/PackedMaps.h"
#include "support/ValueGenerators.h"

namespace tonewerk {
namespace {

using Json = nlohmann::ordered_json;

std::string compact(const Value& value) {
  std::string out;
  appendCompactJson(out, value);
  return out;
}

// Returns whether an independent JSON parser reads what `value` holds, including the forms of numbers.
bool says(const Json& json, const Value& value) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return json.is_boolean() && json.get<bool>() == value.boolean();
    case Value::Kind::kInteger:
      return json.is_number_integer() && json.get<std::int64_t>() == value.integer();
    case Value::Kind::kUnsigned:
      return json.is_number_unsigned() && json.get<std::uint64_t>() == *value.asUnsigned();
    case Value::Kind::kDouble:
      if (!std::isfinite(value.number())) return json.is_null();
      return json.is_number_float() && json.get<double>() == value.number();
    case Value::Kind::kString:
    case Value::Kind::kDate:
      return json.is_string() && json.get<std::string>() == value.text();
    case Value::Kind::kArray: {
      const ValueArray& array = *value.asArray();
      if (!json.is_array() || json.size() != array.size()) return false;
      for (std::size_t at = 0; at < array.size(); ++at) {
        if (!says(json[at], array[at])) return false;
      }
      return true;
    }
    case Value::Kind::kMap:
      break;
  }
  const ValueMap& map = *value.asMap();
  if (!json.is_object() || json.size() != map.size()) return false;
  const ValueMapEntry* entry = map.begin();
  for (const auto& member : json.items()) {
    if (!(entry->key == std::string_view(member.key())) || !says(member.value(), entry->value)) return false;
    ++entry;
  }
  return true;
}

std::string withoutKey(const ValueMap& map, std::string_view hidden) {
  std::string out;
  appendCompactJson(out, map, hidden);
  return out;
}

TEST(CompactJsonTest, LeavesAnEntryOut) {
  const std::vector<ValueMapEntry> entries{{"a", 1}, {"b \"", "two"}, {"c", 3.0}};
  ShapeTable shapes;
  const ValueMap packed = packedMapOf(entries, shapes);
  const ValueMap tree{entries[0], entries[1], entries[2]};
  for (const std::string_view hidden : {"a", "b \"", "c", "d", ""}) {
    ValueMap rest = tree;
    rest.erase(hidden);
    EXPECT_EQ(withoutKey(tree, hidden), rest.text()) << hidden;
    EXPECT_EQ(withoutKey(packed, hidden), rest.text()) << hidden;
  }
}

TEST(CompactJsonTest, LeavesTheOnlyEntryOut) {
  ShapeTable shapes;
  EXPECT_EQ(withoutKey({{"a", 1}}, "a"), "{}");
  EXPECT_EQ(withoutKey(packedMapOf({{"a", 1}}, shapes), "a"), "{}");
}

RC_GTEST_PROP(CompactJsonTest, SaysTheSameToAnyParserInTheSameOrder, ()) {
  const Value value = *generate::value();
  const Json parsed = Json::parse(compact(value), nullptr, false);
  RC_ASSERT_FALSE(parsed.is_discarded());
  RC_ASSERT(says(parsed, value));
}

TEST(CompactJsonTest, EscapesWhatJsonRequires) {
  EXPECT_EQ(compact("\"\\/\b\f\n\r\t\x01\x1f\x7f"), "\"\\\"\\\\/\\b\\f\\n\\r\\t\\u0001\\u001f\x7f\"");
  EXPECT_EQ(compact(std::string_view("a\0b", 3)), R"("a\u0000b")");
  EXPECT_EQ(compact("\xC3\xA4"), "\"\xC3\xA4\"");
}

// appendCompactJson() checks most of a text eight characters at a time.
TEST(CompactJsonTest, EscapesACharacterAtAnyPlaceInAText) {
  for (std::size_t at = 0; at < 24; ++at) {
    for (const char* character : {"\"", "\\", "\x1f"}) {
      const std::string plain(23, 'x');
      const std::string before = plain.substr(0, at);
      const std::string after = plain.substr(at);
      const std::string escaped = *character == '\x1f' ? "\\u001f" : "\\" + std::string(character);
      std::string value = before;
      value += character;
      value += after;
      std::string expected = "{\"k\":\"";
      expected += before;
      expected += escaped;
      expected += after;
      expected += "\"}";
      EXPECT_EQ(ValueMap({{"k", value}}).text(), expected);
    }
  }
}

TEST(CompactJsonTest, ADoubleReadsBackAsADouble) {
  EXPECT_EQ(compact(2.0), "2.0");
  EXPECT_EQ(compact(-0.0), "-0.0");
  EXPECT_EQ(compact(1e22), "1e+22");
  EXPECT_EQ(compact(0.5), "0.5");
}

TEST(CompactJsonTest, NumbersThatJsonCannotExpressAreNull) {
  EXPECT_EQ(compact(std::numeric_limits<double>::quiet_NaN()), "null");
  EXPECT_EQ(compact(-std::numeric_limits<double>::infinity()), "null");
}

TEST(CompactJsonTest, HasNoWhiteSpace) {
  EXPECT_EQ(compact(ValueMap{{"a", ValueArray{1, ValueMap()}}, {"b", ValueArray()}, {"c", Date{0}}}),
            R"({"a":[1,{}],"b":[],"c":"1970-01-01T00:00:00Z"})");
}

}  // namespace
}  // namespace tonewerk
