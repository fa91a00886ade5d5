// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <gmock/gmock.h>
#include <sstream>
#include <string>

#include "support/ScopedTimeZone.h"
#include "support/reports/ReportViews.h"
#include "tools/twctl/CommandLineTest.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;

constexpr double kDay = 1'795'132'800.0;  // 2026-11-20 00:00 UTC

// A store with a glitch that two sessions heard, one of the device, one of four in a second, and an overload
// that nobody has judged.
class GlitchesCommandTest : public CommandLineTest {
 protected:
  GlitchesCommandTest() {
    std::filesystem::create_directories(directory_.path("state"));
    ReportViews views(directory_.path("state") + "/reports.db");
    views.played(1, "Melody", kDay, 7200.0, "Speaker", 0.5);
    views.played(2, "Studio", kDay, 7200.0, "Speaker", 0.5);
    views.run("UPDATE session SET service = 'telephony' WHERE id = 2");
    views.glitched({.event = 10,
                    .session = 1,
                    .at = kDay + 60.0,
                    .id = "1795132860000-7",
                    .cause = "waiting for another",
                    .application = "Studio",
                    .process = "studio",
                    .chain = "studio > player > speaker",
                    .reason = "studio took 8.3 ms of 5.3 ms.",
                    .over = 2.0,
                    .lost = 5.0});
    views.glitched(
        {.event = 11,
         .session = 2,
         .at = kDay + 60.0,
         .id = "1795132860000-7",
         .application = "Studio",
         .process = "studio",
         .cycles = R"([{"begin":0,"period":1000,"nodes":[{"name":"studio","signal":0,"finish":2000}]}])",
         .over = 3.0,
         .lost = 4.0});
    views.glitched({.event = 12,
                    .session = 1,
                    .at = kDay + 120.0,
                    .id = "1795132920000-9",
                    .cause = "device",
                    .firstCause = "device",
                    .node = "headset",
                    .device = "headset",
                    .over = 9.0});
    views.glitched({.event = 13,
                    .session = 1,
                    .at = kDay + 3660.0,
                    .id = "1795136460000-3",
                    .application = "Studio",
                    .over = 7.0,
                    .lost = 6.0,
                    .overloads = 4});
    views.glitched(ReportViews::unjudged(14, 2, kDay + 3700.0));
  }

  std::vector<std::string> lines() const {
    std::vector<std::string> found;
    std::istringstream stream(output());
    for (std::string line; std::getline(stream, line);) found.push_back(line);
    return found;
  }
  // The ids of the glitches that are printed, in their order.
  std::string idsOf(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "glitches");
    arguments.emplace_back("--json");
    EXPECT_EQ(run(arguments), kDone) << errors();
    std::string ids;
    constexpr std::size_t kBehindName = 6;
    for (const std::string& line : lines()) {
      ids += line.substr(kBehindName, line.find(',') - kBehindName) + " ";
    }
    return ids;
  }
};

TEST_F(GlitchesCommandTest, PrintsEachGlitchOnceTheNewestLast) {
  EXPECT_EQ(run({"glitches"}), kDone) << errors();
  const auto found = lines();
  ASSERT_EQ(found.size(), 5U) << output();
  EXPECT_THAT(found[1], AllOf(StartsWith("11  2026-11-20 00:01:00Z  late"),
                              HasSubstr("Studio (studio, 4711)  Melody and 1 more  3 ms  5 ms  1")));
  EXPECT_THAT(found[2], HasSubstr("device      the device headset"));
  EXPECT_THAT(found[3], AllOf(StartsWith("13"), HasSubstr("4")));
  EXPECT_THAT(found[4], HasSubstr("not judged  not known              Studio             -     -     1"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(GlitchesCommandTest, PrintsTheLastTenUnlessMoreAreWanted) {
  {
    ReportViews views(directory_.path("more.db"));
    views.played(1, "Melody", kDay, 7200.0, "Speaker", 0.5);
    for (int i = 1; i <= 12; ++i)
      views.glitched({.event = i, .at = kDay + i, .id = std::to_string(i) + "-1"});
  }
  std::filesystem::rename(directory_.path("more.db"), directory_.path("state") + "/reports.db");
  EXPECT_EQ(idsOf({}), "3 4 5 6 7 8 9 10 11 12 ");
  EXPECT_EQ(idsOf({"-n", "2"}), "11 12 ");
  EXPECT_EQ(idsOf({"-n", "100"}), "1 2 3 4 5 6 7 8 9 10 11 12 ");
  EXPECT_EQ(idsOf({"-n", "all"}), "1 2 3 4 5 6 7 8 9 10 11 12 ");
}

TEST_F(GlitchesCommandTest, ChoosesByTimeAndByWhatTheGlitchesAre) {
  EXPECT_EQ(idsOf({"--since", "2026-11-20 01:00:00Z"}), "13 14 ");
  EXPECT_EQ(idsOf({"--until", "2026-11-20 00:01:30Z"}), "11 ");
  EXPECT_EQ(idsOf({"--app", "Mel*"}), "10 12 13 ");
  EXPECT_EQ(idsOf({"--app", "Studio"}), "11 13 14 ");
  EXPECT_EQ(idsOf({"--device", "head*"}), "12 ");
  EXPECT_EQ(idsOf({"--service", "tele*"}), "11 14 ");
  EXPECT_EQ(idsOf({"--session", "2"}), "11 14 ");
  EXPECT_EQ(idsOf({"--app", "nobody"}), "");
}

TEST_F(GlitchesCommandTest, GivesProgramsEverythingWithTheNamesOfTheView) {
  EXPECT_EQ(run({"glitches", "--json", "--until", "2026-11-20 00:01:30Z"}), kDone);
  EXPECT_EQ(
      output(),
      R"({"id":11,"at":1795132860.0,"glitch_id":"1795132860000-7","cause":"late","first_cause":"late",)"
      R"("confidence":0.9,"culprit_application":"Studio","culprit_process":"studio","culprit_pid":4711,)"
      R"("culprit_node":"filter","device":"speaker","chain":null,"over_ms":3.0,"period_ms":5.3,)"
      R"("quantum":256,"rate":48000,"lost_ms":5.0,"overloads":1,"sessions":2,"application":"Melody",)"
      R"("applications":2,"reason":null})"
      "\n");
}

TEST_F(GlitchesCommandTest, SaysWhoCausedHowManyAndCountsAGlitchOfTwoSessionsOnce) {
  EXPECT_EQ(run({"glitches", "--by", "application"}), kDone) << errors();
  const auto found = lines();
  ASSERT_EQ(found.size(), 6U) << output();
  EXPECT_EQ(found[0], "7 glitches");
  EXPECT_EQ(found[3], "Studio       5         71 %   11 ms  7 ms   2026-11-20 01:01:00Z");
  EXPECT_EQ(found[4], "the device   1         14 %   5 ms   9 ms   2026-11-20 00:02:00Z");
  EXPECT_THAT(found[5], StartsWith("not known    1         14 %   0 ms   - "));
}

TEST_F(GlitchesCommandTest, AddsUpByCauseAndDevice) {
  EXPECT_EQ(run({"glitches", "--by", "cause", "--json"}), kDone);
  EXPECT_THAT(lines()[0], StartsWith(R"({"cause":"late","glitches":5,"share":0.714285)"));
  EXPECT_THAT(lines()[0], HasSubstr(R"("lost_ms":11.0,"worst_over_ms":7.0,"first_at":1795132860.0)"));
  EXPECT_THAT(output(), HasSubstr(R"({"cause":null,"glitches":1)"));
  EXPECT_EQ(run({"glitches", "--by", "device", "-n", "1"}), kDone);
  EXPECT_THAT(output(),
              AllOf(StartsWith("7 glitches\n"), HasSubstr("speaker  5 "), Not(HasSubstr("headset"))));
}

TEST_F(GlitchesCommandTest, AddsUpByTheHoursOfTheLocalClock) {
  const ScopedTimeZone zone("Asia/Kolkata");  // half an hour off
  EXPECT_EQ(run({"glitches", "--by", "hour"}), kDone);
  const auto found = lines();
  ASSERT_EQ(found.size(), 5U) << output();
  EXPECT_THAT(found[3], StartsWith("2026-11-20 05:00  2 "));
  EXPECT_THAT(found[4], StartsWith("2026-11-20 06:00  5 "));
}

TEST_F(GlitchesCommandTest, ShowsTheCyclesOfOneAndWhatToDo) {
  for (const char* id : {"1795132860000-7", "10", "11"}) {
    EXPECT_EQ(run({"glitches", "--why", id}), kDone) << errors();
    EXPECT_THAT(output(), StartsWith("the glitch's cycle, of 1 ms\n  studio "));
    EXPECT_THAT(output(), HasSubstr("\nglitch    1795132860000-7\ntime      2026-11-20 00:01:00Z\n"));
    EXPECT_THAT(output(), HasSubstr("\nculprit   Studio (studio, 4711)\n"
                                    "heard by  Studio in session 2 (late)\n"
                                    "          Melody in session 1 (waiting for another)\n"));
    EXPECT_THAT(output(), HasSubstr("\nto do     - Let Studio do less"));
  }
}

TEST_F(GlitchesCommandTest, TellsTheLatestAlsoWhenNobodyHasJudgedIt) {
  EXPECT_EQ(run({"glitches", "--why", "latest"}), kDone) << errors();
  EXPECT_THAT(output(),
              StartsWith("glitch    event 14\ntime      2026-11-20 01:01:40Z\ncause     not judged: "));
  EXPECT_THAT(output(), HasSubstr("to do     - "));
  EXPECT_EQ(run({"glitches", "--why", "latest", "--json"}), kDone);
  EXPECT_THAT(output(), StartsWith(R"({"event":14,"at":1795136500.0,)"));
  EXPECT_THAT(output(), HasSubstr(R"("cycles":[]})"));
}

TEST_F(GlitchesCommandTest, TellsTheLatestOfThoseThatOtherOptionsChoose) {
  EXPECT_EQ(run({"glitches", "--why", "latest", "--device", "head*"}), kDone) << errors();
  EXPECT_THAT(output(), HasSubstr("glitch    1795132920000-9\n"));
  EXPECT_EQ(run({"glitches", "--why", "latest", "--app", "nobody"}), kRefused);
  EXPECT_EQ(errors(), "twctl: no glitch was recorded, or none that was asked for\n");
}

TEST_F(GlitchesCommandTest, NamesTheNearestGlitchesOfAnUnknownOne) {
  EXPECT_EQ(run({"glitches", "--why", "1795132930000-1"}), kRefused);
  EXPECT_EQ(errors(),
            "twctl: the store has no glitch \"1795132930000-1\"; the nearest ones are: 1795132920000-9, "
            "1795132860000-7, 1795136460000-3\n");
  EXPECT_EQ(run({"glitches", "--why", "that"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("the newest ones are: 14, 1795136460000-3, 1795132920000-9"));
  EXPECT_THAT(output(), IsEmpty());
}

TEST_F(GlitchesCommandTest, PrintsNothingOfAForgedGlitchThatControlsTheTerminal) {
  {
    ReportViews views(directory_.path("forged.db"));
    views.played(1, "Melody", kDay, 7200.0, "Speaker", 0.5);
    const std::string name = "\x1b[31m" + std::string(5000, 'x');
    views.glitched({.event = 1,
                    .at = kDay,
                    .id = name,
                    .cause = name,
                    .firstCause = name,
                    .application = name,
                    .process = name,
                    .node = name,
                    .device = name,
                    .chain = name,
                    .reason = name,
                    .cycles = "[[[[",
                    .over = 1e9,
                    .lost = 1e9});
  }
  std::filesystem::rename(directory_.path("forged.db"), directory_.path("state") + "/reports.db");
  for (const auto& arguments : std::vector<std::vector<std::string>>{{"glitches"},
                                                                     {"glitches", "--json"},
                                                                     {"glitches", "--by", "application"},
                                                                     {"glitches", "--why", "1"},
                                                                     {"glitches", "--why", "1", "--json"}}) {
    EXPECT_EQ(run(arguments), kDone) << errors();
    EXPECT_THAT(output(), AllOf(Not(HasSubstr("\x1b")), HasSubstr("\\u001b[31m")));
    EXPECT_LT(output().size(), 10'000U);
  }
}

TEST_F(GlitchesCommandTest, SaysThatThereAreNone) {
  { ReportViews(directory_.path("empty.db")).run("SELECT 1"); }
  std::filesystem::rename(directory_.path("empty.db"), directory_.path("state") + "/reports.db");
  EXPECT_EQ(run({"glitches"}), kDone);
  EXPECT_EQ(output(), "No glitch was recorded.\n");
  EXPECT_EQ(run({"glitches", "--by", "cause"}), kDone);
  EXPECT_EQ(output(), "No glitch was recorded.\n");
  EXPECT_EQ(run({"glitches", "--json"}), kDone);
  EXPECT_EQ(output(), "");
  EXPECT_EQ(run({"glitches", "--why", "latest"}), kRefused);
  EXPECT_EQ(errors(), "twctl: no glitch was recorded, or none that was asked for\n");
}

TEST_F(GlitchesCommandTest, RefusesWhatItCannotDo) {
  EXPECT_EQ(run({"glitches", "--by", "hours"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("did you mean 'hour'?"));
  EXPECT_EQ(run({"glitches", "--by", "hour", "--why", "1"}), kWrongUsage);
  EXPECT_EQ(run({"glitches", "-n", "0"}), kWrongUsage);
  EXPECT_EQ(run({"glitches", "--session", "0"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: --session: \"0\" is no whole number from 1\n");
  EXPECT_EQ(run({"glitches", "--why", ""}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("the store has no glitch \"\"; the newest ones are: 14"));
  EXPECT_EQ(run({"glitches", "--since", "then"}), kWrongUsage);
  EXPECT_EQ(run({"glitches", "--service", "telefony"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("did you mean 'telephony'?"));
}

TEST_F(GlitchesCommandTest, SaysThatTheStoreHasNoGlitchesYetWhereAnEarlierDaemonMadeIt) {
  {
    ReportViews views(directory_.path("old.db"));
    views.run("DROP TABLE glitch");
  }
  std::filesystem::rename(directory_.path("old.db"), directory_.path("state") + "/reports.db");
  EXPECT_EQ(run({"glitches"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("a daemon of this version adds them when it opens the file"));
}

}  // namespace
}  // namespace tonewerk
