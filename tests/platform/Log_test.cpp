// SPDX-License-Identifier: Apache-2.0
#include "platform/Log.h"

#include <gmock/gmock.h>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;

// A std::string converts to both a string_view and a Value. It was once printed as a list of its characters.
TEST(LogTest, ShowsEveryKindOfTextUnchanged) {
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  const char* const pointer = "d";
  errorLog(category, "%s %s %s %s %@", std::string("a"), std::string_view("b"), "c", pointer,
           SharedString("e"));
  EXPECT_THAT(log.textsOf("twrs"), ElementsAre("a b c d e"));
}

// A log whose thresholds never change, and which counts how often it is asked for a line.
class FixedLog final : public Log {
 public:
  bool isEnabled(std::string_view /*category*/, LogLevel /*level*/) const override {
    return ++questions_ > 0;
  }
  std::optional<LogLevel> fixedThreshold(std::string_view category) const override {
    return category == "twrs" ? LogLevel::kInfo : LogLevel::kError;
  }
  void write(std::string_view /*subsystem*/, std::string_view category, LogLevel level,
             std::string_view /*message*/) override {
    written_ += std::string(category) + " " + std::string(textOf(level)) + ";";
  }
  const std::string& written() const { return written_; }
  int questions() const { return questions_; }

 private:
  mutable int questions_ = 0;
  std::string written_;
};

TEST(LogTest, AFixedThresholdDecidesWithoutAskingForEachLine) {
  FixedLog log;
  const LogCategory service(log, "com.orvane.tonewerk", "twrs");
  const LogCategory session(log, "com.orvane.tonewerk", "twrr");
  for (const LogCategory* category : {&service, &session}) {
    debugLog(category, "x");
    infoLog(category, "x");
    defaultLog(category, "x");
    errorLog(category, "x");
  }
  EXPECT_EQ(log.written(), "twrs info;twrs default;twrs error;twrr error;");
  EXPECT_EQ(log.questions(), 0);
}

TEST(LogTest, PrefixIsTheFilesBaseNameAndLine) {
  EXPECT_EQ(logPrefix("/a/b/TWReportingSession.cpp", 214), "       TWReportingSession:214   ");
  EXPECT_EQ(logPrefix("x.h", 1), "                        x:1     ");
  EXPECT_EQ(logPrefix("ANameOfMoreThanTwentyFiveCharacters.cpp", 123456),
            "ANameOfMoreThanTwentyFiveCharacters:123456 ");
}

TEST(LogTest, TakesFileAndLineFromTheCall) {
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  infoLog(category, "x");
  const int line = __LINE__ - 1;
  EXPECT_EQ(log.lines().at(0).message, logPrefix("Log_test.cpp", line) + "x");
}

TEST(LogTest, ShowsNumbersByTheirOwnType) {
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  debugLog(category, "%i %lli %lu %zu %d 100%%", -1, std::int64_t{-9000000000}, 7UL, std::size_t{3}, true);
  debugLog(category, "%f %@ %f", 0.5, 0.5, 1e20);
  EXPECT_THAT(log.textsOf("twrs"),
              ElementsAre("-1 -9000000000 7 3 1 100%", "0.500000 0.5 100000000000000000000.000000"));
}

TEST(LogTest, ShowsValuesListsAndAbsentValues) {
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  const Value value(ValueMap{{"a", 1}});
  const Value* absent = nullptr;
  debugLog(category, "%@ %@ %@ %@", value, absent, std::vector<int>{1, 2}, std::optional<int>());
  EXPECT_THAT(log.textsOf("twrs"), ElementsAre(R"({"a":1} (null) (1, 2) (null))"));
}

TEST(LogTest, AFixedLineIsAsIfItWereWrittenWhereItIsMade) {
  MemoryLog log;
  log.setThreshold("twrs", LogLevel::kDefault);
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  const FixedLogLine line("100% x");
  const int number = __LINE__ - 1;
  line.write(LogLevel::kInfo, category);
  EXPECT_TRUE(log.lines().empty());
  line.write(LogLevel::kError, category);
  ASSERT_EQ(log.lines().size(), 1U);
  EXPECT_EQ(log.lines()[0].level, LogLevel::kError);
  EXPECT_EQ(log.lines()[0].message, logPrefix("Log_test.cpp", number) + "100% x");
}

TEST(LogTest, FormatsNothingWithoutACategory) {
  const LogCategory* none = nullptr;
  bool wasAsked = false;
  errorLog(none, "%@", [&] {
    wasAsked = true;
    return std::string("x");
  });
  EXPECT_FALSE(wasAsked);
}

TEST(LogTest, FormatsNothingBelowTheThreshold) {
  MemoryLog log;
  log.setThreshold("twrs", LogLevel::kError);
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  bool wasAsked = false;
  const auto expensive = [&] {
    wasAsked = true;
    return std::string("x");
  };
  defaultLog(category, "%@", expensive);
  EXPECT_FALSE(wasAsked);
  errorLog(category, "%@", expensive);
  EXPECT_TRUE(wasAsked);
  EXPECT_THAT(log.textsOf("twrs"), ElementsAre("x"));
}

}  // namespace
}  // namespace tonewerk
