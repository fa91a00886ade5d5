// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <limits>
#include <rapidcheck/gtest.h>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ValueGenerators.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

// The contract of all JSON services.
template <typename Service>
class JsonServiceContract : public testing::Test {
 protected:
  std::optional<Value> parse(std::string_view text) {
    problem_.clear();
    return service_.parse(text, problem_);
  }

  Service service_;
  std::string problem_;
};

using Services = testing::Types<NlohmannJsonService, MemoryJsonService>;
TYPED_TEST_SUITE(JsonServiceContract, Services);

TYPED_TEST(JsonServiceContract, CompactTextHasNoWhiteSpaceAndSaysNaNAsNull) {
  EXPECT_EQ(this->service_.compact({{"b", 2.0}, {"a", ValueArray{1, kNaN}}, {"date", Date{0.5}}}),
            R"({"b":2.0,"a":[1,null],"date":"1970-01-01T00:00:00.5Z"})");
}

TYPED_TEST(JsonServiceContract, PrettyTextIsIndentedByTwoSpaces) {
  const ValueMap map{{"b", 2.0},           {"a", ValueArray{1, ValueMap{{"t", "x\"y"}}, true}},
                     {"none", ValueMap()}, {"empty", ValueArray()},
                     {"date", Date{0}},    {"big", std::numeric_limits<std::uint64_t>::max()},
                     {"huge", 1e22}};
  EXPECT_EQ(this->service_.pretty(map, this->problem_), R"({
  "b": 2.0,
  "a": [
    1,
    {
      "t": "x\"y"
    },
    true
  ],
  "none": {},
  "empty": [],
  "date": "1970-01-01T00:00:00Z",
  "big": 18446744073709551615,
  "huge": 1e+22
})");
  EXPECT_EQ(this->service_.pretty({}, this->problem_), "{}");
}

TYPED_TEST(JsonServiceContract, PrettyTextFailsForNumbersThatJsonLacks) {
  for (const double number : {kNaN, std::numeric_limits<double>::infinity()}) {
    this->problem_.clear();
    const ValueMap map{{"a", ValueMap{{"b", ValueArray{1, 2, number}}}}};
    EXPECT_EQ(this->service_.pretty(map, this->problem_), std::nullopt);
    EXPECT_NE(this->problem_.find(textOf(number)), std::string::npos) << this->problem_;
  }
}

TYPED_TEST(JsonServiceContract, ReadsEveryKindOfValue) {
  EXPECT_EQ(this->parse(R"( {"a": [1, -2, 2.5, true, "x\u00e4"], "b": {}} )"),
            Value(ValueMap{{"a", ValueArray{1, -2, 2.5, true, "x\xC3\xA4"}}, {"b", ValueMap()}}));
  EXPECT_EQ(this->parse("2.0")->kind(), Value::Kind::kDouble);
  EXPECT_EQ(this->parse("1")->kind(), Value::Kind::kInteger);
}

TYPED_TEST(JsonServiceContract, LargeIntegersKeepTheirValueAsLongAsTheyCan) {
  EXPECT_EQ(this->parse("-9223372036854775808"), Value(std::numeric_limits<std::int64_t>::min()));
  EXPECT_EQ(this->parse("9223372036854775807")->kind(), Value::Kind::kInteger);
  EXPECT_EQ(this->parse("9223372036854775808"), Value(std::uint64_t{1} << 63));
  EXPECT_EQ(this->parse("18446744073709551616"), Value(18446744073709551616.0));
  EXPECT_EQ(this->parse("18446744073709551616")->kind(), Value::Kind::kDouble);
}

TYPED_TEST(JsonServiceContract, InvalidJsonAndNullAreRefused) {
  for (const char* text :
       {"", "{", "{\"a\":1,}", "nul", "null", "[1, null]", "1 2", "\"\xFF\"", "NaN", "1e999"}) {
    EXPECT_EQ(this->parse(text), std::nullopt) << text;
    EXPECT_NE(this->problem_, "") << text;
  }
}

TYPED_TEST(JsonServiceContract, OfAKeyGivenTwiceTheLastWins) {
  EXPECT_EQ(this->parse(R"({"a": 1, "a": 2})"), Value(ValueMap{{"a", 2}}));
}

TEST(NlohmannJsonServiceTest, AProblemHasItsPosition) {
  const NlohmannJsonService service;
  std::string problem;
  EXPECT_FALSE(service.pretty({{"a", ValueMap{{"b", ValueArray{1, kNaN}}}}}, problem));
  EXPECT_EQ(problem, "a.b[1] is nan, which JSON cannot say");
  EXPECT_FALSE(service.parse(R"({"a": [1, {"b": null}]})", problem));
  EXPECT_EQ(problem, "a[1].b is null");
  EXPECT_FALSE(service.parse("{\n  oops", problem));
  EXPECT_NE(problem.find("line 2"), std::string::npos) << problem;
  EXPECT_NE(problem.front(), '[');
}

TEST(NlohmannJsonServiceTest, DeepNestingIsRefused) {
  std::string problem;
  const std::string deep(100'000, '[');
  EXPECT_FALSE(NlohmannJsonService().parse(deep + std::string(deep.size(), ']'), problem));
  EXPECT_EQ(problem, "values are nested deeper than 200");
}

RC_GTEST_PROP(NlohmannJsonServiceTest, PrettyAndCompactTextSayTheSame, ()) {
  const NlohmannJsonService service;
  const ValueMap map = *generate::map();
  std::string problem;
  const auto pretty = service.pretty(map, problem);
  const auto compact = service.parse(service.compact(map), problem);
  RC_ASSERT(pretty.has_value() == compact.has_value());  // both fail if a number is NaN or infinite
  if (pretty) RC_ASSERT(service.parse(*pretty, problem) == compact);
}

RC_GTEST_PROP(NlohmannJsonServiceTest, TheDoubleWritesTheSamePrettyText, ()) {
  const ValueMap map = *generate::map();
  std::string problem;
  const auto text = NlohmannJsonService().pretty(map, problem);
  const auto other = MemoryJsonService().pretty(map, problem);
  RC_ASSERT(text == other);
  if (text)
    RC_ASSERT(NlohmannJsonService().parse(*text, problem) == NlohmannJsonService().parse(*other, problem));
}

}  // namespace
}  // namespace tonewerk
