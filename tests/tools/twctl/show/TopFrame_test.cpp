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
           {"overloads", 1},
           {"seconds", 187.9}},
          12.34,
          0.25};
}

TEST(TopFrameTest, ShowsWhatASessionIsAndDoes) {
  EXPECT_THAT(
      topFrame({row(77)}, {}),
      ElementsAre("1 session, 12.3 messages a second, 1 overload",
                  "session  service    application        client    msg/s  redundant  overloads  running",
                  "77       telephony  com.example.phone  phone 11  12.3   25.0 %     1          3:07"));
}

TEST(TopFrameTest, PutsADashWhereNothingIsKnown) {
  SessionRow unknown = row(77);
  unknown.session.erase("seconds");
  unknown.session.erase("processName");
  unknown.session.erase("overloads");
  unknown.messagesPerSecond.reset();
  unknown.redundantShare.reset();
  const auto lines = topFrame({unknown}, {});
  EXPECT_EQ(lines.at(0), "1 session");
  EXPECT_EQ(lines.at(2), "77       telephony  com.example.phone  ? 11    -      -          -          -");
}

TEST(TopFrameTest, SaysWhoseTheSingleMessageSessionIs) {
  SessionRow single = row(1);
  single.session.erase("processName");
  single.session.set("singleMessageSession", true);
  EXPECT_THAT(topFrame({single}, {}).at(2), HasSubstr("  (the daemon) 11  "));
}

TEST(TopFrameTest, SaysThatThereIsNothing) { EXPECT_THAT(topFrame({}, {}), ElementsAre("0 sessions")); }

TEST(TopFrameTest, MakesControlCharactersHarmless) {
  SessionRow evil = row(77);
  evil.session.set("application", "a\x1b[2Jb\nc");
  evil.session.set("processName", "p\x1b");
  const auto lines = topFrame({evil}, {});
  ASSERT_THAT(lines, SizeIs(3));
  EXPECT_THAT(lines[2], HasSubstr("  a\\u001b[2Jb\\nc  p\\u001b 11  "));
}

TEST(TopFrameTest, SaysHowDevicesAndNodesDo) {
  AudioHealth health;
  health.devices = {{"spea\x1bker", false, 0.34, 0.5, 2}, {"mic", true, std::nullopt, std::nullopt, 1}};
  health.nodes = {{"player", 0.125, 0.9, 3, 4711}};
  EXPECT_THAT(
      topFrame({}, health),
      ElementsAre("0 sessions", "spea\\u001bker: 34 % of the period, less than 50 % at worst, 2 xruns",
                  "mic (input): idle, 1 xrun", "", "node    of the period  worst  glitches  process",
                  "player  12 %           90 %   3         4711"));
}

TEST(TopFrameTest, GivesProgramsEverything) {
  EXPECT_EQ(
      topObject(row(77)).text(),
      R"({"reporterID":77,"serviceType":2,"serviceName":"telephony","started":true,)"
      R"("application":"com.example.phone","processIdentifier":11,"processName":"phone","messages":8,)"
      R"("redundant":2,"overloads":1,"seconds":187.9,"messagesPerSecond":12.34,"redundantShare":0.25})");
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
