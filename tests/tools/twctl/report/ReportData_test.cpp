// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/ReportData.h"

#include <gmock/gmock.h>
#include <stdlib.h>
#include <string>
#include <time.h>

#include "support/TemporaryDirectory.h"
#include "support/reports/ReportViews.h"
#include "tools/twctl/report/ReportTables.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;

constexpr double kDay = 1'795'132'800.0;  // 2026-11-20 00:00 UTC
constexpr double kNow = kDay + 80'000.0;

class ReportDataTest : public testing::Test {
 protected:
  ReportDataTest() {
    setenv("TZ", "UTC", 1);
    tzset();
  }
  void TearDown() override {
    unsetenv("TZ");
    tzset();
  }

  ValueMap read(const ReportScope& scope = {}) {
    ReportData report = ReportData::read(directory_.path(), scope, kNow);
    EXPECT_EQ(report.problem, "");
    return report.data;
  }
  std::string problem(const ReportScope& scope = {}) {
    return ReportData::read(directory_.path(), scope, kNow).problem;
  }
  // The map or list at these keys, as JSON.
  static std::string at(const ValueMap& data, std::initializer_list<const char*> keys) {
    const Value* found = nullptr;
    for (const char* key : keys) {
      found = (found == nullptr ? data : *found->asMap()).find(key);
      if (found == nullptr) return std::string("no ") + key;
    }
    return found->text();
  }
  static std::string rows(const ValueMap& data, const char* part, const char* list) {
    return data.find(part)->asMap()->find(list)->asMap()->text("rows");
  }

  TemporaryDirectory directory_;
  ReportViews views_{directory_.path("reports.db")};
};

TEST_F(ReportDataTest, AnEmptyStoreHasNothingAndIsNoFailure) {
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"totals", "sessions"}), "0");
  EXPECT_EQ(at(data, {"totals", "playSeconds"}), "0");
  EXPECT_EQ(at(data, {"hours"}), "[]");
  EXPECT_EQ(rows(data, "timeline", "lanes"), "[]");
  EXPECT_EQ(data.number("from"), kNow);
}

TEST_F(ReportDataTest, SumsWhatWasPlayedByApplicationDeviceAndVolume) {
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  views_.played(2, "Melody", kDay + 7200.0, 1200.0, "Headphones", 0.25);
  views_.played(3, "Phone", kDay + 9000.0, 60.0, "Speaker", 1.0);
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"totals", "playSeconds"}), "4860");
  EXPECT_EQ(at(data, {"totals", "averageVolume"}), "0.4444");  // (1800 + 300 + 60) / 4860
  EXPECT_EQ(at(data, {"playing", "byApplication", "top", "rows"}),
            R"([["Melody",4800.0,0.4375,2],["Phone",60.0,1.0,1]])");
  EXPECT_EQ(at(data, {"playing", "byDevice", "top", "rows"}),
            R"([["Speaker",3660.0,0.5082,2],["Headphones",1200.0,0.25,1]])");
  EXPECT_EQ(rows(data, "playing", "byVolume"), "[[4,1200.0],[8,3600.0],[16,60.0]]");
  EXPECT_EQ(rows(data, "playing", "onDevices"),
            R"([["Melody","Speaker",3600.0],["Melody","Headphones",1200.0],["Phone","Speaker",60.0]])");
}

TEST_F(ReportDataTest, WeightsTheVolumeOfAnHourBySeconds) {
  views_.played(1, "Melody", kDay + 100.0, 300.0, "Speaker", 1.0);
  views_.played(2, "Melody", kDay + 3500.0, 200.0, "Speaker", 0.5);
  EXPECT_EQ(at(read(), {"hours"}), "[[1795132800,400.0,0.875,1795136400],[1795136400,100.0,0.5,1795140000]]");
}

TEST_F(ReportDataTest, CutsStretchesAtTheLimitsOfTime) {
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  views_.played(2, "Before", kDay - 900.0, 600.0, "Speaker", 0.5);
  views_.played(3, "After", kDay + 3601.0, 600.0, "Speaker", 0.5);
  views_.overloaded(1, kDay + 10.0, 64);
  views_.overloaded(1, kDay + 1000.0, 64);
  const ValueMap data = read({.since = kDay + 900.0, .until = kDay + 1800.0});
  EXPECT_EQ(at(data, {"totals", "playSeconds"}), "900");
  EXPECT_EQ(at(data, {"totals", "sessions"}), "1");
  EXPECT_EQ(at(data, {"totals", "overloads"}), "1");
  EXPECT_EQ(data.number("from"), kDay + 900.0);
  EXPECT_EQ(data.number("until"), kDay + 1800.0);
  EXPECT_EQ(rows(data, "timeline", "played"), "[[1,1795133700.0,1795134600.0,0.5,\"Speaker\",0]]");
}

// Stores that an earlier version began have stretches without times. They counted in every range of time.
TEST_F(ReportDataTest, AStretchWithoutTimesCountsWhereItWasRecorded) {
  views_.run(
      "INSERT INTO event (id, at) VALUES (1, 1795046400), (2, 1795132860); INSERT INTO volume_stretch (id, "
      "application, seconds) VALUES (1, 'Old', 100000), (2, 'New', 60); INSERT INTO input_stretch (id, "
      "application, seconds) VALUES (1, 'Old', 1000), (2, 'New', 30)");
  EXPECT_EQ(at(read(), {"totals", "playSeconds"}), "100060");
  const ValueMap newest = read({.since = kDay});
  EXPECT_EQ(at(newest, {"totals", "playSeconds"}), "60");
  EXPECT_EQ(at(newest, {"totals", "inputSeconds"}), "30");
  EXPECT_EQ(at(read({.until = kDay}), {"totals", "playSeconds"}), "100000");
}

// A program says when its stretches began. One wrong time made everything else too narrow to see.
TEST_F(ReportDataTest, AStretchWhoseTimeCannotBeCountsButIsInNoPicture) {
  views_.played(1, "Melody", kDay, 600.0, "Speaker", 0.5);
  views_.run(
      "INSERT INTO volume_stretch (id, session, application, started_at, ended_at, seconds, volume) VALUES "
      "(11, 1, 'Melody', 1e14, 1e14 + 1, 1, 1), (12, 1, 'Melody', 1.79e12, 1.79e12 + 2, 2, 1), (13, 1, "
      "'Melody', 5, 9, 4, 1), (14, 1, 'Melody', -1e14, 1795132900, 8, 1), (15, 1, 'Melody', 1795132700, "
      "1795132790, 16, 1); INSERT INTO input_stretch (id, session, started_at, ended_at, seconds) VALUES "
      "(16, "
      "1, 1e14, 1e14 + 1, 1)");
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"totals", "playSeconds"}), "631");
  EXPECT_EQ(data.number("from"), kDay - 100.0);
  EXPECT_EQ(data.number("until"), kDay + 600.0);
  EXPECT_EQ(rows(data, "timeline", "played"),
            R"([[1,1795132700.0,1795132790.0,1.0,null,null],[1,1795132800.0,1795133400.0,0.5,"Speaker",0]])");
  EXPECT_EQ(rows(data, "timeline", "heard"), "[]");
  EXPECT_EQ(at(data, {"timeline", "leftOut", "misplaced"}), "5");
}

// Only shared group sessions had formats, with the seconds of the whole stretch.
TEST_F(ReportDataTest, SumsTheFormatsOfWhatWasPlayedInTheLimitsOfTime) {
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  views_.played(2, "Melody", kDay + 4000.0, 10.0, "Speaker", 0.5);
  views_.run("INSERT INTO volume_stretch (started_at, ended_at, seconds) VALUES (1795132800, 1795132801, 1)");
  EXPECT_EQ(rows(read(), "playing", "formats"), R"([["Speaker",48000,2,"S32LE",3610.0]])");
  EXPECT_EQ(rows(read({.since = kDay + 900.0, .until = kDay + 1800.0}), "playing", "formats"),
            R"([["Speaker",48000,2,"S32LE",900.0]])");
}

TEST_F(ReportDataTest, AVolumeThatCannotBeIsNotKnown) {
  views_.played(1, "Melody", kDay, 100.0, "Speaker", 0.5);
  views_.played(2, "Melody", kDay, 100.0, "Speaker", 40.0);
  views_.played(3, "Melody", kDay, 100.0, "Speaker", -1.0);
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"totals", "averageVolume"}), "0.5");
  EXPECT_EQ(rows(data, "playing", "byVolume"), "[[8,100.0]]");
}

// Three applications at the same time: the device played for 70 minutes, not for 3 hours.
TEST_F(ReportDataTest, TellsTheTimeOfTheDeviceFromThatOfItsSessions) {
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  views_.played(2, "Game", kDay, 3600.0, "Speaker", 0.5);
  views_.played(3, "Phone", kDay + 600.0, 3600.0, "Earpiece", 0.5);
  views_.played(4, "Phone", kDay + 1200.0, 60.0, "Earpiece", 0.5);
  views_.played(5, "Phone", kDay + 7200.0, 60.0, "Earpiece", 0.5);
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"totals", "playSeconds"}), "10920");
  EXPECT_EQ(at(data, {"totals", "playingSeconds"}), "4260");
  EXPECT_EQ(at(data, {"totals", "overlapSeconds"}), "6660");
}

TEST_F(ReportDataTest, ChoosesApplicationsByPattern) {
  views_.played(1, "Melody", kDay, 600.0, "Speaker", 0.5);
  views_.played(2, "Phone", kDay, 60.0, "Speaker", 0.5);
  views_.overloaded(2, kDay + 1.0, 64);
  views_.run("INSERT INTO haptics VALUES (1, " + std::to_string(kDay) + ", 'Phone', 'on', 2.0, 1)");
  views_.run("INSERT INTO channel_value VALUES (1, " + std::to_string(kDay) +
             ", 'amp', 'g', 's', 'melody', 'x', 4), (2, " + std::to_string(kDay) +
             ", 'amp', 'g', 's', 'phone', 'x', 5)");
  const ValueMap data = read({.application = "Ph*"});
  EXPECT_EQ(at(data, {"totals", "playSeconds"}), "60");
  EXPECT_EQ(at(data, {"totals", "overloads"}), "1");
  EXPECT_EQ(at(data, {"totals", "hapticsSeconds"}), "2");
  EXPECT_EQ(rows(data, "drivers", "values"), R"([["amp","g","s","phone","x",5]])");
  EXPECT_EQ(at(read({.application = "M*"}), {"totals", "overloads"}), "0");
}

TEST_F(ReportDataTest, CountsOverloadsByBufferSizeAndDay) {
  views_.played(1, "Studio", kDay - 5 * 86'400.0, 600.0, "Speaker", 0.5);
  views_.played(2, "Studio", kDay + 20'000.0, 600.0, "Speaker", 0.5);
  views_.overloaded(1, kDay - 5 * 86'400.0 + 1.0, 64);
  views_.overloaded(2, kDay + 20'001.0, 64);
  views_.overloaded(2, kDay + 20'002.0, 128);
  const ValueMap data = read();
  EXPECT_EQ(rows(data, "issues", "byBuffer"), "[[64,2,1.0],[128,1,0.5]]");
  EXPECT_EQ(at(data, {"issues", "overTime"}), "[[1794700800,1794787200,1],[1795132800,1795219200,2]]");
  EXPECT_EQ(at(data, {"issues", "stepSeconds"}), "86400");
  const ValueMap shortTime = read({.since = kDay});
  EXPECT_EQ(at(shortTime, {"issues", "overTime"}), "[[1795150800,1795154400,2]]");
  EXPECT_EQ(at(shortTime, {"issues", "stepSeconds"}), "3600");
}

TEST_F(ReportDataTest, SaysWhoseTheGlitchesWereAndCountsOneOfTwoSessionsOnce) {
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  views_.played(2, "Studio", kDay, 3600.0, "Speaker", 0.5);
  views_.glitched({.event = 1,
                   .session = 1,
                   .at = kDay + 5.0,
                   .id = "5-1",
                   .cause = "waiting for another",
                   .application = "Studio",
                   .over = 2.0,
                   .lost = 5.0});
  views_.glitched({.event = 2,
                   .session = 2,
                   .at = kDay + 5.0,
                   .id = "5-1",
                   .application = "Studio",
                   .reason = "It was late.",
                   .over = 3.0,
                   .lost = 4.0});
  views_.glitched({.event = 3,
                   .session = 1,
                   .at = kDay + 6.0,
                   .id = "6-1",
                   .cause = "device",
                   .firstCause = "device",
                   .over = 1.0,
                   .lost = 1.0,
                   .overloads = 3});
  views_.glitched(ReportViews::unjudged(4, 1, kDay + 7.0));
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"glitches", "count"}), "5");
  EXPECT_EQ(at(data, {"glitches", "judged"}), "4");
  EXPECT_EQ(at(data, {"glitches", "known"}), "4");
  EXPECT_EQ(at(data, {"glitches", "lostMs"}), "6");
  EXPECT_EQ(rows(data, "glitches", "top"),
            R"([["the device","device",3,1.0,1.0],["Studio","late",1,5.0,3.0],[null,null,1,0.0,null]])");
  EXPECT_EQ(
      rows(data, "timeline", "glitches"),
      R"([[1795132805.0,"late","Studio",3.0,5.0,1,"Studio"],[1795132806.0,"device","the device",1.0,1.0,3,)"
      R"("Melody"],[1795132807.0,null,null,null,null,1,"Melody"]])");
  EXPECT_THAT(rows(data, "glitches", "newest"),
              HasSubstr(R"([2,1795132805.0,"late","Studio",null,"Studio",2,3.0,5.0,1,"It was late.",1])"));
  // Of one session only what it heard.
  EXPECT_EQ(at(read({.session = 2}), {"glitches", "count"}), "1");
  EXPECT_EQ(at(read({.since = kDay + 6.5}), {"glitches", "count"}), "1");
}

TEST_F(ReportDataTest, BoundsWhatItTakesOfGlitchesWhateverTheySay) {
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  const std::string text(2000, 'x');
  views_.glitched({.event = 1,
                   .at = kDay,
                   .id = "1-1",
                   .cause = text,
                   .firstCause = text,
                   .application = text,
                   .process = text,
                   .device = text,
                   .chain = text,
                   .reason = text,
                   .over = 1e9,
                   .lost = 1e9});
  views_.run(
      "WITH RECURSIVE n(i) AS (SELECT 2 UNION ALL SELECT i + 1 FROM n WHERE i < 2000) INSERT INTO glitch "
      "SELECT "
      "i, at + i, began_at + i, i || '-1', session, service, application, cause, first_cause, confidence, "
      "culprit_application || i, culprit_process, culprit_pid, culprit_node, node, device, chain, over_ms, "
      "period_ms, quantum, rate, lost_ms, overloads, reason, cycles FROM glitch, n");
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"glitches", "count"}), "2000");
  EXPECT_EQ(at(data, {"timeline", "leftOut", "glitches"}), "500");
  EXPECT_LT(data.find("timeline")->asMap()->text("glitches").size(), 500'000U);
  EXPECT_LT(data.text("glitches").size(), 120'000U);
}

TEST_F(ReportDataTest, AStoreThatAnEarlierDaemonHasMadeHasNoGlitchesAndIsNoFailure) {
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  views_.run("DROP TABLE glitch");
  EXPECT_EQ(at(read(), {"glitches", "count"}), "0");
}

// With one offset for all days, an overload just after midnight was counted for the day before.
TEST_F(ReportDataTest, CountsOverloadsByTheDaysOfAClockThatChanges) {
  setenv("TZ", "Europe/Berlin", 1);
  tzset();
  constexpr double kMidnight = 1'792'879'200.0;  // 2026-10-25 00:00 CEST, a day of 25 hours
  views_.played(1, "Studio", kMidnight - 3 * 86'400.0, 60.0, "Speaker", 0.5);
  views_.overloaded(1, kMidnight - 3 * 86'400.0 + 60.0, 64);
  views_.overloaded(1, kMidnight + 60.0, 64);
  views_.overloaded(1, kMidnight + 24.5 * 3600, 64);   // 23:30 CET
  views_.overloaded(1, kMidnight + 25.01 * 3600, 64);  // 00:00:36 CET
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"issues", "overTime"}),
            "[[1792620000,1792706400,1],[1792879200,1792969200,2],[1792969200,1793055600,1]]");
}

TEST_F(ReportDataTest, CountsOverloadsByWeekOverYearsAndKeepsTheNewest) {
  views_.run("BEGIN");
  constexpr int kWeeks = ReportData::kMostSteps + 1;
  views_.played(1, "Studio", kDay, 60.0, "Speaker", 0.5);
  for (int i = 0; i < kWeeks; ++i) views_.overloaded(1, kDay - i * 604'800.0, 64);
  views_.run("COMMIT");
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"issues", "stepSeconds"}), "604800");
  const ValueArray& steps = *data.find("issues")->asMap()->find("overTime")->asArray();
  ASSERT_EQ(steps.size(), static_cast<std::size_t>(ReportData::kMostSteps));
  const std::string newest = (*(steps.end() - 1)).text();
  EXPECT_EQ(newest, "[1794787200,1795392000,1]");  // from Monday, 2026-11-16
  EXPECT_EQ(at(data, {"totals", "overloads"}), std::to_string(kWeeks));
}

TEST_F(ReportDataTest, KeepsTheLongestAndTheMostOverloadedSessionsAndCountsTheOthers) {
  views_.run("BEGIN");
  for (int i = 1; i <= ReportData::kMostSessions + 50; ++i) {
    views_.played(i, "Melody", kDay + i, 10.0 + i, "Speaker", 0.5);
  }
  views_.overloaded(1, kDay + 5.0, 64);  // the shortest one
  views_.run("COMMIT");
  const ValueMap data = read();
  const std::string lanes = rows(data, "timeline", "lanes");
  EXPECT_THAT(lanes, HasSubstr("[[1,1001,"));
  EXPECT_THAT(lanes, HasSubstr("[450,1450,"));
  EXPECT_THAT(lanes, testing::Not(HasSubstr("[2,1002,")));
  EXPECT_EQ(at(data, {"timeline", "leftOut", "sessions"}),
            std::to_string(ReportData::kMostSessions + 50 - ReportData::kLongestSessions - 1));
  EXPECT_EQ(at(data, {"totals", "sessions"}), std::to_string(ReportData::kMostSessions + 50));
}

// Those that overloaded most were taken from all sessions, and were often among the longest ones already.
TEST_F(ReportDataTest, KeepsTheMostOverloadedOfTheSessionsThatAreNotAmongTheLongest) {
  views_.run("BEGIN");
  for (int i = 1; i <= ReportData::kLongestSessions + 200; ++i) {
    views_.played(i, "Melody", kDay + i, 10.0 + i, "Speaker", 0.5);
    views_.overloaded(i, kDay + i, 64);
    if (i > 200) views_.overloaded(i, kDay + i + 1.0, 64);  // the longest
  }
  views_.run("COMMIT");
  EXPECT_EQ(at(read(), {"timeline", "leftOut", "sessions"}),
            std::to_string(ReportData::kLongestSessions + 200 - ReportData::kMostSessions));
}

TEST_F(ReportDataTest, CountsTheInputsThatItLeavesOut) {
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  views_.run(
      "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < " +
      std::to_string(ReportData::kMostMarks + 7) +
      ") INSERT INTO input_stretch (id, session, started_at, ended_at, seconds) SELECT i, 1, 1795132800 "
      "+ i, 1795132800.5 + i, 0.5 FROM n");
  EXPECT_EQ(at(read(), {"timeline", "leftOut", "inputs"}), "7");
}

TEST_F(ReportDataTest, KeepsTheLongestStretchesOfEverySession) {
  const std::string stretches = "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < " +
                                std::to_string(ReportData::kMostStretches + 100) +
                                ") INSERT INTO volume_stretch SELECT i, 1, 's', 'Melody', 1795132800 + i, "
                                "1795132800.5 + i, 0.5, 'Speaker', "
                                "0.5, 0.5, 48000, 2, 'f', 0, 0 FROM n";
  views_.played(1, "Melody", kDay, 3600.0, "Speaker", 0.5);
  views_.played(2, "Phone", kDay, 0.1, "Earpiece", 0.75);
  views_.run(stretches);
  const ValueMap data = read();
  EXPECT_EQ(data.find("timeline")->asMap()->find("played")->asMap()->find("rows")->asArray()->size(),
            static_cast<std::size_t>(ReportData::kMostStretches));
  EXPECT_THAT(rows(data, "timeline", "played"),
              testing::AllOf(HasSubstr("[1,1795132800.0,1795136400.0,"), HasSubstr("\"Earpiece\"")));
  EXPECT_EQ(at(data, {"timeline", "leftOut", "stretches"}), "102");
}

TEST_F(ReportDataTest, NamesTheMostPlayedApplicationsAndAddsUpTheOthers) {
  for (int i = 0; i < ReportData::kMostNames + 3; ++i) {
    views_.played(i + 1, "App " + std::to_string(i), kDay, 100.0 - i, "Speaker", 0.5);
  }
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"playing", "byApplication", "rest"}),
            R"({"names":3,"seconds":261.0})");  // 88, 87 and 86
}

TEST_F(ReportDataTest, AddsUpWhatDriversCountedInAllSessions) {
  views_.played(1, "Melody", kDay, 100.0, "Speaker", 0.5);
  for (const char* session : {"1", "2"}) {
    views_.run(std::string("INSERT INTO channel_bucket VALUES (") + session +
               ", 1795132900, 'amp', 'g', NULL, 'wake', 'ms', 0, 5, 3), (" + session +
               ", 1795132900, 'amp', 'g', '', 'wake', 'ms', 5, 9, 4)");
    views_.run(std::string("INSERT INTO channel_state VALUES (") + session +
               ", 1795132900, 'amp', 'g', '', 'power', 'on', 2, 700, 0.7)");
  }
  const ValueMap data = read();
  EXPECT_EQ(rows(data, "drivers", "buckets"),
            R"([["amp","g","","wake","ms",0,5,6],["amp","g","","wake","ms",5,9,8]])");
  EXPECT_EQ(rows(data, "drivers", "states"), R"([["amp","g","","power","","on",4,1400]])");
  EXPECT_EQ(rows(read({.session = 1}), "drivers", "states"), R"([["amp","g","","power","","on",2,700]])");
}

// Rows above a limit were left out of the sums, and nobody was told.
TEST_F(ReportDataTest, AddsUpNeighboursOfManyBucketsAndTheShortestOfManyStates) {
  views_.played(1, "Melody", kDay, 100.0, "Speaker", 0.5);
  views_.run(
      "WITH RECURSIVE n(i) AS (SELECT 0 UNION ALL SELECT i + 1 FROM n WHERE i < 999) INSERT INTO "
      "channel_bucket SELECT 1, 1795132900, 'amp', 'g', '', 'wake', 'ms', i * 10, i * 10 + 10, 3 FROM n; "
      "WITH "
      "RECURSIVE n(i) AS (SELECT 0 UNION ALL SELECT i + 1 FROM n WHERE i < 999) INSERT INTO channel_state "
      "SELECT 1, 1795132900, 'amp', 'g', '', 'power', 's' || i, 1, 1000 - i, 0 FROM n");
  const ValueMap data = read();
  const auto sum = [&](const char* list, std::size_t column) {
    std::int64_t all = 0;
    const ValueArray& found = *data.find("drivers")->asMap()->find(list)->asMap()->find("rows")->asArray();
    EXPECT_EQ(found.size(), static_cast<std::size_t>(ReportData::kMostParts)) << list;
    for (const Value& row : found) all += *(row.asArray()->begin() + column)->asInteger();
    return all;
  };
  EXPECT_EQ(sum("buckets", 7), 3000);
  EXPECT_EQ(sum("states", 7), 500'500);
  EXPECT_THAT(rows(data, "drivers", "buckets"),
              testing::StartsWith(R"([["amp","g","","wake","ms",0,160,48],)"));
  EXPECT_THAT(rows(data, "drivers", "states"), HasSubstr(R"("all other states",937,)"));
}

TEST_F(ReportDataTest, CountsLeaksOfTheHapticsEngineApartAndItsStatusNot) {
  views_.run(
      "INSERT INTO haptics VALUES (1, 1795132800, 'Game', 'Flumen_Haptics_EngineOnDuration', 2.0, NULL), (2, "
      "1795132801, 'Game', 'Flumen_Haptics_ClientStatus', NULL, 1), (3, 1795132802, NULL, "
      "'LeakedHapticsSessionInfo', 3600.0, NULL)");
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"totals", "hapticsEvents"}), "1");
  EXPECT_EQ(at(data, {"totals", "hapticsSeconds"}), "2");
  EXPECT_EQ(at(data, {"totals", "hapticsLeaks"}), "1");
  EXPECT_EQ(at(data, {"totals", "leakedSeconds"}), "3600");
  EXPECT_EQ(at(data, {"haptics", "rows"}), R"([["Game",1,2.0]])");
  EXPECT_EQ(rows(data, "timeline", "haptics"), R"([[1795132800.0,"Game",2.0]])");
}

TEST_F(ReportDataTest, ASessionsPageHasOnlyWhatIsOfThisSession) {
  views_.played(7, "Melody", kDay, 100.0, "Speaker", 0.5);
  views_.played(8, "Phone", kDay, 900.0, "Headphones", 0.5);
  views_.overloaded(7, kDay + 5.0, 32);
  views_.run(
      "INSERT INTO event VALUES (1, 1795132800, 7, 'Volume', 'Generic', 'client', '{}'), (2, 1795132801, 7, "
      "'Volume', 'Generic', 'client', '{}'), (3, 1795132802, 7, 'Volume', 'Summary', 'derived', '{}'), (4, "
      "1795132802, 8, 'Volume', 'Summary', 'derived', '{}')");
  views_.run(
      "INSERT INTO haptics VALUES (1, 1795132850, 'Melody', 'on', 2.0, 1), (2, 1795132999, 'Melody', 'on', "
      "4.0, 1), (3, 1795132850, 'Phone', 'on', 8.0, 1)");
  const ValueMap data = read({.session = 7});
  EXPECT_EQ(at(data, {"totals", "playSeconds"}), "100");
  EXPECT_EQ(at(data, {"totals", "hapticsSeconds"}), "2");
  EXPECT_EQ(at(data, {"session", "application"}), "Melody");
  EXPECT_EQ(at(data, {"session", "kinds", "rows"}),
            R"([["Volume","Generic","client",2,1795132800.0,1795132801.0],)"
            R"(["Volume","Summary","derived",1,1795132802.0,1795132802.0]])");
  EXPECT_EQ(at(data, {"session", "issues", "rows"}), R"([[1795132805.0,"overload","mixer",0.5,32]])");
}

TEST_F(ReportDataTest, SaysThatASessionIsUnknownAndWhichOnesHaveThisReporterIdentifier) {
  views_.played(7, "Melody", kDay, 100.0, "Speaker", 0.5);
  views_.played(8, "Melody", kDay, 100.0, "Speaker", 0.5);
  views_.run("UPDATE session SET reporter_id = 1007");
  EXPECT_THAT(problem({.session = 1007}), HasSubstr("no session has the id 1007; the reporter identifier "
                                                    "1007 is that of these sessions, newest first: 8, 7"));
  EXPECT_THAT(problem({.session = 99}), HasSubstr("no session has the id 99; "));
  EXPECT_TRUE(ReportData::read(directory_.path(), {.session = 99}, kNow).isUnknownSession);
}

TEST_F(ReportDataTest, SaysWhyASessionOfTheStoreIsNotInTheScope) {
  views_.played(7, "Melody", kDay, 100.0, "Speaker", 0.5);
  EXPECT_THAT(problem({.since = kDay + 200.0, .session = 7}),
              testing::EndsWith(": session 7 was not open in the time of --since and --until"));
  EXPECT_THAT(problem({.application = "Ph*", .session = 7}),
              testing::EndsWith(": session 7 is not of an application that Ph* fits"));
  EXPECT_FALSE(
      ReportData::read(directory_.path(), {.since = kDay + 200.0, .session = 7}, kNow).isUnknownSession);
}

TEST_F(ReportDataTest, ARunningSessionHasNoEndAndLastsUntilNowOrTheNewestReportOfADaemonThatHasGone) {
  views_.played(1, "Melody", kDay, 100.0, "Speaker", 0.5);
  views_.run("UPDATE session SET ended_at = NULL, ending = NULL, messages = NULL, overloads = NULL");
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"totals", "running"}), "1");
  EXPECT_EQ(data.number("until"), kDay + 100.0);
  EXPECT_THAT(rows(data, "timeline", "lanes"), HasSubstr("1795132800.0,null,null,null,"));
  EXPECT_EQ(read({.daemonAnswers = true}).number("until"), kNow);
  EXPECT_EQ(read({.until = kDay + 500.0, .daemonAnswers = true}).number("until"), kDay + 500.0);
}

TEST_F(ReportDataTest, TheTimeSinceAMomentEndsNow) {
  views_.played(1, "Melody", kDay, 100.0, "Speaker", 0.5);
  EXPECT_EQ(read({.since = kDay}).number("until"), kNow);
  EXPECT_EQ(read().number("until"), kDay + 100.0);
  EXPECT_EQ(read({.daemonAnswers = true}).number("until"), kDay + 100.0);  // nothing runs
}

TEST_F(ReportDataTest, ValuesThatAreNotKnownAreNull) {
  views_.run(
      "INSERT INTO volume_stretch (session, started_at, ended_at, seconds) VALUES (NULL, NULL, NULL, 5), "
      "(NULL, "
      "1795132800, NULL, 7); INSERT INTO issue (at, kind) VALUES (1795132800, 'overload')");
  const ValueMap data = read();
  EXPECT_EQ(at(data, {"totals", "playSeconds"}), "12");
  EXPECT_EQ(at(data, {"playing", "byApplication", "top", "rows"}), "[[null,12.0,null,0]]");
  EXPECT_EQ(rows(data, "issues", "byBuffer"), "[[null,1,0.0]]");
}

TEST_F(ReportDataTest, NamesTheFileAndWhatItLacks) {
  views_.run("DROP TABLE channel_state");
  EXPECT_THAT(problem(), testing::AllOf(HasSubstr("reports.db: "), HasSubstr("it has no views for reports")));
  views_.run("DROP TABLE volume_stretch");
  EXPECT_THAT(problem(), testing::AllOf(HasSubstr("reports.db: "), HasSubstr("it has no views for reports")));
  const TemporaryDirectory empty;
  EXPECT_THAT(ReportData::read(empty.path(), {}, kNow).problem, HasSubstr("there is no such file"));
}

TEST_F(ReportDataTest, ReadsNoFurtherWhenItIsStopped) {
  std::stop_source stop;
  ReportScope scope;
  scope.stop = stop.get_token();
  EXPECT_EQ(ReportData::read(directory_.path(), scope, kNow).problem, "");
  stop.request_stop();
  EXPECT_THAT(ReportData::read(directory_.path(), scope, kNow).problem, HasSubstr("the reading was stopped"));
}

TEST_F(ReportDataTest, SaysOnDemandWhatSessionsThatStillRunHaveSaidOfPlayback) {
  views_.played(1, "Melody", kDay, 60.0, "Speaker", 0.5);
  views_.played(2, "Phone", kDay + 100.0, 60.0, "Earpiece", 0.5);
  views_.run(
      "UPDATE session SET ended_at = NULL, ending = NULL WHERE id = 2;"
      "INSERT INTO event VALUES (1, 5, 1, '', '', 'client', '{\"QMSessionVolume\":1}'),"
      "(2, 6, 2, '', '', 'client', '{\"QMSessionVolume\":0.25,\"active_devices\":\"Car\"}'),"
      "(3, 7, 2, '', '', 'client', '{\"session_output_running\":true,\"twreporting_timestamp\":6.5}'),"
      "(4, 8, 2, '', '', 'client', '{\"io_cycle\":3}'), (5, 9, 2, '', '', 'derived', "
      "'{\"QMSessionVolume\":1}')");
  ReportScope scope;
  EXPECT_TRUE(ReportData::read(directory_.path(), scope, kNow).running.empty());
  scope.hasRunning = true;
  EXPECT_EQ(ReportData::read(directory_.path(), scope, kNow).running.text("rows"),
            "[[1002,1795132900.0,6.5,1,null,null,null,\"Phone\"],"
            "[1002,1795132900.0,6.0,null,0.25,\"Car\",null,\"Phone\"]]");
}

}  // namespace
}  // namespace tonewerk
