// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/preferences/TomlText.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include "support/ValueGenerators.h"

namespace tonewerk {
namespace {

RC_GTEST_PROP(TomlTextTest, ReadsBackAsEqualValues, ()) {
  const ValueMap map = *generate::map();
  std::string problem;
  const std::optional<std::string> text = tomlText(map, problem);
  if (!text) {
    RC_ASSERT(problem.find("greatest integer") != std::string::npos);
    return;
  }
  RC_ASSERT(parseToml(*text, problem) == map);
}

RC_GTEST_PROP(TomlTextTest, EveryTextCanBeSaid, ()) {
  const ValueMap map{{SharedString(*generate::text()), Value(*generate::text())}};
  std::string problem;
  const std::optional<std::string> text = tomlText(map, problem);
  RC_LOG() << problem;
  RC_ASSERT(text.has_value());
}

RC_GTEST_PROP(TomlTextTest, EveryNumberAndDateCanBeSaid, ()) {
  const ValueMap map{{"number", Value(*generate::number())}, {"date", Value(*generate::date())}};
  std::string problem;
  const std::optional<std::string> text = tomlText(map, problem);
  RC_LOG() << problem;
  RC_ASSERT(text.has_value());
}

TEST(TomlTextTest, ReadsEveryKindOfValue) {
  std::string problem;
  const auto values = parseToml(R"(
text = 'a'
integer = 0xFF
double = 1e3
boolean = true
date = 2026-11-20T11:18:00.5+01:00
local = 2026-11-20T10:18:00
day = 2026-11-20
time = 10:18:00
mixed = [1, "x", {deep = inf}]
[[consumers]]
name = "local"
events = ["com.orvane.*"]
)",
                                problem);
  ASSERT_TRUE(values) << problem;
  EXPECT_EQ(
      *values,
      (ValueMap{
          {"text", "a"},
          {"integer", 255},
          {"double", 1000.0},
          {"boolean", true},
          {"date", Date{1'795'169'880.5}},
          {"local", "2026-11-20T10:18:00"},
          {"day", "2026-11-20"},
          {"time", "10:18:00"},
          {"mixed", ValueArray{1, "x", ValueMap{{"deep", std::numeric_limits<double>::infinity()}}}},
          {"consumers", ValueArray{ValueMap{{"name", "local"}, {"events", ValueArray{"com.orvane.*"}}}}}}));
}

TEST(TomlTextTest, AProblemHasItsPosition) {
  std::string problem;
  EXPECT_FALSE(parseToml("a = 1\nb = oops\n", problem));
  EXPECT_EQ(problem.substr(0, 2), "2:") << problem;
}

TEST(TomlTextTest, DeepNestingIsRefused) {
  std::string problem;
  EXPECT_FALSE(parseToml("a = " + std::string(100'000, '['), problem));
}

TEST(TomlTextTest, AValueIsOneValue) {
  EXPECT_EQ(parseTomlValue("[1, 2]"), Value(ValueArray{1, 2}));
  EXPECT_EQ(parseTomlValue("\"x\""), Value("x"));
  EXPECT_EQ(parseTomlValue("just words"), std::nullopt);
  EXPECT_EQ(parseTomlValue(""), std::nullopt);
  EXPECT_EQ(parseTomlValue("1\nother = 2"), std::nullopt);
}

}  // namespace
}  // namespace tonewerk
