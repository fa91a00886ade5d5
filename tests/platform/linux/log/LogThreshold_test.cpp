// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/LogThreshold.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

LogThreshold parsed(std::string_view text) {
  std::string problem;
  const std::optional<LogThreshold> threshold = LogThreshold::parse(text, problem);
  EXPECT_TRUE(threshold.has_value()) << problem;
  return threshold.value_or(LogThreshold());
}

// The lowest level that is written.
LogLevel levelOf(const LogThreshold& threshold, std::string_view category) {
  for (const LogLevel level : {LogLevel::kDebug, LogLevel::kInfo, LogLevel::kDefault}) {
    if (threshold.isEnabled(category, level)) return level;
  }
  return LogLevel::kError;
}

TEST(LogThresholdTest, IsDefaultUnlessSet) { EXPECT_EQ(levelOf(LogThreshold(), "twrr"), LogLevel::kDefault); }

TEST(LogThresholdTest, ALevelHoldsForEveryCategory) {
  EXPECT_EQ(levelOf(parsed("debug"), "twrr"), LogLevel::kDebug);
  EXPECT_EQ(levelOf(parsed("info"), "twrs"), LogLevel::kInfo);
  EXPECT_EQ(levelOf(parsed("default"), "twrs"), LogLevel::kDefault);
  EXPECT_EQ(levelOf(parsed("error"), "twrs"), LogLevel::kError);
}

TEST(LogThresholdTest, AListSetsSingleCategories) {
  const LogThreshold threshold = parsed("twrr=debug, twrs=error ,info");
  EXPECT_EQ(levelOf(threshold, "twrr"), LogLevel::kDebug);
  EXPECT_EQ(levelOf(threshold, "twrs"), LogLevel::kError);
  EXPECT_EQ(levelOf(threshold, "twrc"), LogLevel::kInfo);
}

TEST(LogThresholdTest, OtherCategoriesStayAtDefault) {
  EXPECT_EQ(levelOf(parsed("twrr=debug"), "twrs"), LogLevel::kDefault);
}

TEST(LogThresholdTest, TheLastLevelCounts) {
  const LogThreshold threshold = parsed("debug,twrr=error,twrr=info,error");
  EXPECT_EQ(levelOf(threshold, "twrr"), LogLevel::kInfo);
  EXPECT_EQ(levelOf(threshold, "twrs"), LogLevel::kError);
}

TEST(LogThresholdTest, RefusesAMalformedTextAndNamesIt) {
  for (const char* text : {"", "verbose", "DEBUG", "twrr=", "=debug", "twrr=debug,", "twrr:debug", "3"}) {
    std::string problem;
    EXPECT_FALSE(LogThreshold::parse(text, problem)) << text;
    EXPECT_NE(problem, "") << text;
  }
  std::string problem;
  EXPECT_FALSE(LogThreshold::parse("info,twrr=loud", problem));
  EXPECT_NE(problem.find("\"twrr=loud\""), std::string::npos) << problem;
}

}  // namespace
}  // namespace tonewerk
