// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/TopFrame.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::SizeIs;

SessionRow row(std::int64_t reporterID) {
  return {{{"reporterID", reporterID},
           {"serviceType", 2},
           {"serviceName", "telephony"},
           {"started", true},
           {"application", "com.example.phone"},
           {"processIdentifier", 11},
           {"processName", "phone"},
           {"messages", 8},
           {"redundant", 2},
           {"seconds", 187.9}},
          12.34,
          0.25};
}

std::vector<SessionRow> rows(std::size_t count) {
  std::vector<SessionRow> all;
  for (std::size_t at = 1; at <= count; ++at) all.push_back(row(static_cast<std::int64_t>(at)));
  return all;
}

TEST(TopFrameTest, ShowsWhatASessionIsAndDoes) {
  EXPECT_THAT(topFrame({row(77)}, std::nullopt),
              ElementsAre("1 session, 12.3 messages a second",
                          "session  service    application        client    msg/s  redundant  running",
                          "77       telephony  com.example.phone  phone 11  12.3   25.0 %     3:07"));
}

TEST(TopFrameTest, PutsADashWhereNothingIsKnown) {
  SessionRow unknown = row(77);
  unknown.session.erase("seconds");
  unknown.session.erase("processName");
  unknown.messagesPerSecond.reset();
  unknown.redundantShare.reset();
  const auto lines = topFrame({unknown}, std::nullopt);
  EXPECT_EQ(lines.at(0), "1 session");
  EXPECT_EQ(lines.at(2), "77       telephony  com.example.phone  ? 11    -      -          -");
}

TEST(TopFrameTest, SaysWhoseTheSingleMessageSessionIs) {
  SessionRow single = row(1);
  single.session.erase("processName");
  single.session.set("singleMessageSession", true);
  EXPECT_THAT(topFrame({single}, std::nullopt).at(2), HasSubstr("  (the daemon) 11  "));
}

TEST(TopFrameTest, SaysThatThereIsNothing) {
  EXPECT_THAT(topFrame({}, std::nullopt), ElementsAre("0 sessions"));
}

TEST(TopFrameTest, WhatFitsTheHeightIsShownWhole) {
  EXPECT_THAT(topFrame(rows(4), TerminalSize{80, 6}), SizeIs(6));
  EXPECT_THAT(topFrame(rows(4), TerminalSize{80, 6}).back(), HasSubstr("telephony"));
}

TEST(TopFrameTest, SaysHowManyMoreThereAre) {
  const auto lines = topFrame(rows(5), TerminalSize{80, 6});
  ASSERT_THAT(lines, SizeIs(6));
  EXPECT_THAT(lines[4], HasSubstr("telephony"));
  EXPECT_EQ(lines[5], "... and 2 more");
}

TEST(TopFrameTest, FitsIntoTheSmallestWindow) {
  for (const std::size_t height : {1U, 2U, 3U}) {
    const auto lines = topFrame(rows(5), TerminalSize{10, height});
    EXPECT_LE(lines.size(), height);
    EXPECT_EQ(lines.front(), "5 sessions");
  }
}

TEST(TopFrameTest, CutsLinesToTheWidthBetweenCharacters) {
  SessionRow wide = row(77);
  wide.session.set("serviceName", "\xC3\xBC\xC3\xBC\xC3\xBC\xC3\xBC");
  EXPECT_EQ(topFrame({wide}, TerminalSize{11, 24}).at(2), "77       \xC3\xBC\xC3\xBC");
}

TEST(TopFrameTest, MakesControlCharactersHarmless) {
  SessionRow evil = row(77);
  evil.session.set("application", "a\x1b[2Jb\nc");
  evil.session.set("processName", "p\x1b");
  const auto lines = topFrame({evil}, std::nullopt);
  ASSERT_THAT(lines, SizeIs(3));
  EXPECT_THAT(lines[2], HasSubstr("  a\\u001b[2Jb\\nc  p\\u001b 11  "));
}

TEST(TopFrameTest, GivesProgramsEverything) {
  EXPECT_EQ(topObject(row(77)).text(),
            R"({"reporterID":77,"serviceType":2,"serviceName":"telephony","started":true,)"
            R"("application":"com.example.phone","processIdentifier":11,"processName":"phone","messages":8,)"
            R"("redundant":2,"seconds":187.9,"messagesPerSecond":12.34,"redundantShare":0.25})");
}

TEST(TopFrameTest, WritesRunningTimesAsPeopleDo) {
  EXPECT_EQ(runningTime(-1), "0 s");
  EXPECT_EQ(runningTime(59.9), "59 s");
  EXPECT_EQ(runningTime(60), "1:00");
  EXPECT_EQ(runningTime(3599), "59:59");
  EXPECT_EQ(runningTime(3600), "1:00:00");
  EXPECT_EQ(runningTime(86399), "23:59:59");
  EXPECT_EQ(runningTime(2 * 86400 + 3 * 3600 + 4 * 60 + 5), "2 d 3:04:05");
}

}  // namespace
}  // namespace tonewerk
