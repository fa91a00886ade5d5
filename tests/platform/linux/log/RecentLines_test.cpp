// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/RecentLines.h"

#include <gtest/gtest.h>

#include "platform/linux/diagnostics/collectors/LogTailCollector.h"
#include "platform/linux/log/RememberingLog.h"
#include "platform/linux/log/StreamLog.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

TEST(RecentLinesTest, KeepsTheLastLines) {
  RecentLines lines({2, 1000, 100});
  lines.add("one\n");
  lines.add("two");
  EXPECT_EQ(lines.text(), "one\ntwo\n");
  lines.add("three");
  EXPECT_EQ(lines.text(), "two\nthree\n");
}

TEST(RecentLinesTest, KeepsNoMoreBytesThanItsBound) {
  RecentLines lines({100, 8, 8});
  lines.add("abc");
  lines.add("def");
  EXPECT_EQ(lines.text(), "abc\ndef\n");
  lines.add("");
  EXPECT_EQ(lines.text(), "def\n\n");
}

TEST(RecentLinesTest, CutsLongLines) {
  RecentLines lines({100, 1000, 5});
  lines.add("abcd");
  lines.add("abcde\n");
  EXPECT_EQ(lines.text(), "abcd\nabcd\n");
}

TEST(RecentLinesTest, CutsLongLinesBetweenCharacters) {
  RecentLines lines({100, 1000, 5});
  lines.add("abc\u00E9");
  EXPECT_EQ(lines.text(), "abc\n");
}

TEST(RememberingLogTest, MakesEveryLineValidUtf8) {
  ManualClock clock;
  auto inner = std::make_unique<MemoryLog>();
  const MemoryLog& written = *inner;
  const auto lines = std::make_shared<RecentLines>();
  RememberingLog log(std::move(inner), lines, clock);
  log.write("com.orvane.tonewerk", "twrr", LogLevel::kError, "a tool said \xE9");
  EXPECT_EQ(written.lines().front().message, "a tool said \uFFFD");
  EXPECT_TRUE(lines->text().ends_with("a tool said \uFFFD\n"));
}

TEST(RememberingLogTest, HasTheThresholdOfTheLogBelow) {
  ManualClock clock;
  const RememberingLog log(std::make_unique<StreamLog>(-1, clock, LogThreshold(LogLevel::kError)),
                           std::make_shared<RecentLines>(), clock);
  EXPECT_EQ(log.fixedThreshold("twrr"), LogLevel::kError);
}

TEST(RememberingLogTest, KeepsTheLinesThatItPassesOn) {
  ManualClock clock;
  auto inner = std::make_unique<MemoryLog>();
  MemoryLog& written = *inner;
  written.setThreshold(LogLevel::kInfo);
  const auto lines = std::make_shared<RecentLines>();
  RememberingLog log(std::move(inner), lines, clock);
  EXPECT_FALSE(log.isEnabled("twrr", LogLevel::kDebug));
  EXPECT_TRUE(log.isEnabled("twrr", LogLevel::kInfo));
  EXPECT_EQ(log.fixedThreshold("twrr"), std::nullopt);  // that of a MemoryLog may change
  log.write("com.orvane.tonewerk", "twrr", LogLevel::kInfo, "start called");
  ASSERT_EQ(written.lines().size(), 1u);
  EXPECT_EQ(written.lines().front(),
            (MemoryLog::Line{"com.orvane.tonewerk", "twrr", LogLevel::kInfo, "start called"}));

  LogTailCollector collector(lines);
  EXPECT_EQ(collector.fileName(), "log.txt");
  EXPECT_EQ(collector.collect().text, "2025-11-20T10:18:00.000000Z info twrr start called\n");
}

}  // namespace
}  // namespace tonewerk
