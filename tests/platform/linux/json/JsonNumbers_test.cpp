// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/JsonNumbers.h"

#include <gmock/gmock.h>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

std::vector<std::string> numbersOf(std::string_view text) {
  std::vector<std::string> numbers;
  for (const JsonNumber& number : numbersInJson(text)) {
    numbers.emplace_back(text.substr(number.begin, number.end - number.begin));
  }
  return numbers;
}

TEST(JsonNumbersTest, FindsNumbersOfEveryForm) {
  EXPECT_THAT(numbersOf(R"([0, -0, 12,-3.50 ,1e9,2E-07,{"a":4.5e+6},true,null])"),
              ElementsAre("0", "-0", "12", "-3.50", "1e9", "2E-07", "4.5e+6"));
  EXPECT_THAT(numbersOf("7"), ElementsAre("7"));
  EXPECT_THAT(numbersOf(R"({"a": []})"), IsEmpty());
}

TEST(JsonNumbersTest, FindsNoNumbersInTexts) {
  EXPECT_THAT(numbersOf(R"({"1": "2", "\"3": "\\", "4\\\"5": 6})"), ElementsAre("6"));
}

TEST(JsonNumbersTest, EndsAtAZeroByteLikeTheParser) {
  EXPECT_THAT(numbersOf(std::string_view("[1]\0 2", 6)), ElementsAre("1"));
}

TEST(JsonNumbersTest, TakesTheLongestNumberAtTheBeginning) {
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"12,", "12"}, {"012", "0"}, {"-7]", "-7"}, {"1.5.2", "1.5"}, {"1.", "1"},
      {"1.e5", "1"}, {"1e", "1"},  {"1e+", "1"},  {"1e5x", "1e5"},  {"-0.0e-0", "-0.0e-0"},
      {"", ""},      {"-", ""},    {"+1", ""},    {".5", ""},       {"inf", ""},
      {"nan", ""},   {" 1", ""},   {"0x10", "0"}, {"--1", ""},      {"9E09 ", "9E09"}};
  for (const auto& [text, number] : cases) EXPECT_EQ(leadingJsonNumber(text), number) << text;
}

}  // namespace
}  // namespace tonewerk
