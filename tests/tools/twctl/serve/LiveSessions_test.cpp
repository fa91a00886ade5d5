// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/LiveSessions.h"

#include <gmock/gmock.h>
#include <limits>
#include <optional>

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr double kNow = 1000.0;
constexpr double kUnknown = std::numeric_limits<double>::quiet_NaN();

ValueMap listed(std::int64_t reporter, double seconds, const char* application = "player",
                std::int64_t process = 5) {
  return {{"reporterID", reporter},
          {"processIdentifier", process},
          {"application", application},
          {"serviceName", "longformaudio"},
          {"started", true},
          {"seconds", seconds},
          {"processName", "play"}};
}

ValueMap message(std::int64_t reporter, double time, const ValueMap& payload,
                 const char* application = "player") {
  return {{"reporterID", reporter}, {"time", time}, {"application", application}, {"payload", payload}};
}

ValueMap stored(std::int64_t reporter, double started, std::initializer_list<ValueArray> rows,
                const Value& application = "player") {
  std::vector<Value> list;
  for (const ValueArray& row : rows) {
    std::vector<Value> cells{reporter, started};
    for (const Value& cell : row) cells.push_back(cell);
    cells.push_back(application);
    list.emplace_back(ValueArray(std::move(cells)));
  }
  return {{"rows", ValueArray(std::move(list))}};
}

class LiveSessionsTest : public testing::Test {
 protected:
  using Time = std::chrono::steady_clock::time_point;

  // The clock that does not jump is behind by `kBehind`, unless it is given.
  static constexpr double kBehind = 500.0;
  void list(const std::vector<ValueMap>& sessions, double now, std::optional<double> monotonic = {},
            double waited = 0.0) {
    const auto time = [](double seconds) {
      return Time(std::chrono::duration_cast<Time::duration>(std::chrono::duration<double>(seconds)));
    };
    const double until = monotonic.value_or(now - kBehind);
    live_.list(sessions, now, {time(until - waited), time(until)});
  }
  // "100 to 200 at 0.5 on Desk" for each stretch of the session at this place; one that grows has no end.
  std::vector<std::string> stretches(std::size_t place = 0) const {
    const ValueArray all = live_.toValues();
    std::vector<std::string> texts;
    if (place >= all.size()) return {"no such session"};
    for (const Value& row : *all[place].asMap()->find("stretches")->asArray()) {
      const ValueArray& cells = *row.asArray();
      const double ended = *cells[1].asDouble();
      const double volume = *cells[2].asDouble();
      texts.push_back(text(cells[0].number()) + " to " + (ended > 0 ? text(ended) : "now") + " at " +
                      (volume >= 0 ? text(volume) : "?") + " on " + cells[3].text() +
                      (cells[4].integer() == 1 ? ", ringing" : ""));
    }
    return texts;
  }
  static std::string text(double number) {
    std::string digits = std::to_string(number);
    digits.erase(digits.find_last_not_of('0') + 1);
    if (digits.ends_with(".")) digits.pop_back();
    return digits;
  }

  LiveSessions live_;
};

TEST_F(LiveSessionsTest, LetsAStretchGrowUntilSomethingChanges) {
  list({listed(1, 10.0)}, kNow);
  EXPECT_THAT(stretches(), IsEmpty());
  live_.take(message(1, 1001, {{"QMSessionVolume", 0.5}, {"active_devices", "Desk"}}), kNow);
  EXPECT_THAT(stretches(), IsEmpty());
  live_.take(message(1, 1002, {{"session_output_running", true}}), kNow);
  EXPECT_THAT(stretches(), ElementsAre("1002 to now at 0.5 on Desk"));
  live_.take(message(1, 1003, {{"session_output_running", true}, {"QMSessionVolume", 0.5}}), kNow);
  live_.take(message(1, 1004, {{"QMSessionVolume", 0.25}}), kNow);
  live_.take(message(1, 1005, {{"active_devices", "Car"}, {"ringerstate", true}}), kNow);
  EXPECT_THAT(stretches(), ElementsAre("1002 to 1004 at 0.5 on Desk", "1004 to 1005 at 0.25 on Desk",
                                       "1005 to now at 0.25 on Car, ringing"));
  live_.take(message(1, 1006, {{"session_output_running", false}}), kNow);
  live_.take(message(1, 1008, {{"QMSessionVolume", 1.0}}), kNow);
  live_.take(message(1, 1009, {{"session_output_running", true}}), kNow);
  EXPECT_THAT(stretches(),
              ElementsAre("1002 to 1004 at 0.5 on Desk", "1004 to 1005 at 0.25 on Desk",
                          "1005 to 1006 at 0.25 on Car, ringing", "1009 to now at 1 on Car, ringing"));
}

TEST_F(LiveSessionsTest, KeepsAMessageUntilItsSessionIsListed) {
  live_.take(message(7, 999, {{"session_output_running", true}, {"QMSessionVolume", 1.0}}), kNow);
  EXPECT_THAT(live_.toValues(), IsEmpty());
  list({listed(7, 2.0)}, kNow);
  EXPECT_THAT(stretches(), ElementsAre("999 to now at 1 on "));
}

TEST_F(LiveSessionsTest, EndsWhatIsNoLongerListedAndForgetsItLater) {
  list({listed(1, 10.0)}, kNow);
  live_.take(message(1, 1001, {{"session_output_running", true}}), kNow);
  list({}, 1005.0);
  EXPECT_THAT(stretches(), ElementsAre("1001 to 1005 at ? on "));
  list({}, 1005.0 + LiveSessions::kKeptSeconds);
  EXPECT_THAT(live_.toValues(), IsEmpty());
}

TEST_F(LiveSessionsTest, TellsANewSessionWithTheSameIdentifier) {
  list({listed(1, 10.0)}, kNow);
  live_.take(message(1, 1001, {{"session_output_running", true}}), kNow);
  list({listed(1, 1.0)}, 1020.0);
  EXPECT_THAT(stretches(0), IsEmpty());
  EXPECT_THAT(stretches(1), ElementsAre("1001 to 1020 at ? on "));
}

// The clock that counts a session's seconds stands still while the machine sleeps.
TEST_F(LiveSessionsTest, KeepsASessionWhenTheMachineHasSleptOrItsClockIsSet) {
  list({listed(1, 10.0)}, 1000.0, 500.0);
  live_.take(message(1, 1001, {{"session_output_running", true}}), 1001.0);
  list({listed(1, 12.0)}, 4602.0, 502.0);
  EXPECT_THAT(stretches(), ElementsAre("1001 to now at ? on "));
  list({listed(1, 13.0)}, 900.0, 503.0);
  EXPECT_THAT(stretches(), ElementsAre("1001 to now at ? on "));
  ASSERT_EQ(live_.toValues().size(), 1U);
  EXPECT_EQ(live_.toValues()[0].asMap()->number("started"), 990.0);
}

TEST_F(LiveSessionsTest, KeepsASessionWhenAListingComesLate) {
  list({listed(1, 10.0)}, 1000.0);
  live_.take(message(1, 1001, {{"session_output_running", true}}), 1001.0);
  list({listed(1, 11.0)}, 1031.0, 531.0, 30.0);
  EXPECT_THAT(stretches(), ElementsAre("1001 to now at ? on "));
  list({listed(1, 42.0)}, 1032.0);
  EXPECT_THAT(stretches(), ElementsAre("1001 to now at ? on "));
  EXPECT_EQ(live_.toValues().size(), 1U);
}

TEST_F(LiveSessionsTest, LeavesOutSessionsThatHaveNotStartedAndTheDaemonsOwn) {
  ValueMap waiting = listed(1, 0.0);
  waiting.set("started", false);
  ValueMap own = listed(1, 5.0);
  own.set("singleMessageSession", true);
  list({waiting, own}, kNow);
  EXPECT_THAT(live_.toValues(), IsEmpty());
}

TEST_F(LiveSessionsTest, TellsTwoClientsWithTheSameIdentifierByTheirApplications) {
  list({listed(1, 10.0, "one", 5), listed(1, 10.0, "two", 6)}, kNow);
  live_.take(message(1, 1001, {{"session_output_running", true}}, "two"), kNow);
  EXPECT_THAT(stretches(0), IsEmpty());
  EXPECT_THAT(stretches(1), ElementsAre("1001 to now at ? on "));
}

// The other session is known at the next listing.
TEST_F(LiveSessionsTest, GivesAMessageToNoSessionOfAnotherApplication) {
  list({listed(1, 10.0, "one", 5)}, kNow);
  live_.take(message(1, 1001, {{"session_output_running", true}}, "two"), kNow);
  EXPECT_THAT(stretches(), IsEmpty());
  live_.take(message(1, 1002, {{"session_output_running", true}}, ""), kNow);
  EXPECT_THAT(stretches(), ElementsAre("1002 to now at ? on "));
  list({listed(1, 11.0, "one", 5), listed(1, 1.0, "two", 6)}, 1001.0);
  EXPECT_THAT(stretches(0), ElementsAre("1002 to now at ? on "));
  EXPECT_THAT(stretches(1), ElementsAre("1001 to now at ? on "));
}

TEST_F(LiveSessionsTest, RemembersOfEachApplicationItsOwn) {
  list({listed(1, 100.0, "one", 5), listed(1, 100.0, "two", 6)}, kNow);
  live_.remember(stored(1, 900.0, {{950.0, 1, 0.5, "Desk", kUnknown}}, "two"), kNow);
  EXPECT_THAT(stretches(0), IsEmpty());
  EXPECT_THAT(stretches(1), ElementsAre("950 to now at 0.5 on Desk"));
  // The store does not know the application yet.
  live_.remember(stored(1, 900.0, {{960.0, 1, 0.25, "Car", kUnknown}}, kUnknown), kNow);
  EXPECT_THAT(stretches(0), ElementsAre("960 to now at 0.25 on Car"));
}

// Each new reading of the store repeats what was said before, and a part of what was watched.
TEST_F(LiveSessionsTest, RemembersFromTheStoreWhatWasSaidBeforeTheWatchingBegan) {
  list({listed(1, 100.0)}, kNow);
  live_.take(message(1, 1003, {{"QMSessionVolume", 0.25}}), kNow);
  const ValueMap rows = stored(1, 900.5,
                               {{1003.0, kUnknown, 0.25, kUnknown, kUnknown},
                                {960.0, kUnknown, 0.75, kUnknown, kUnknown},
                                {950.0, 1, 0.5, "Desk", kUnknown}});
  for (int i = 0; i < 2; ++i) {
    live_.remember(rows, kNow);
    EXPECT_THAT(stretches(), ElementsAre("950 to 960 at 0.5 on Desk", "960 to 1003 at 0.75 on Desk",
                                         "1003 to now at 0.25 on Desk"));
  }
  live_.remember(stored(1, 500.0, {{600.0, 1, 1.0, "Other", 0}}), kNow);  // an earlier session
  EXPECT_EQ(stretches().size(), 3U);
}

// The changes that there is no room for are merged into the state before the others.
TEST_F(LiveSessionsTest, KeepsWhatItHasMergedWhenTheStoreIsRead) {
  list({listed(1, 100.0)}, kNow);
  live_.take(message(1, 1001, {{"session_output_running", true}, {"active_devices", "Desk"}}), kNow);
  for (std::size_t i = 0; i < LiveSessions::kMostChanges + 50; ++i) {
    live_.take(message(1, 1002.0 + static_cast<double>(i), {{"QMSessionVolume", i % 2 == 0 ? 0.5 : 1.0}}),
               kNow);
  }
  const std::vector<std::string> before = stretches();
  ASSERT_GT(before.size(), 100U);
  EXPECT_THAT(before.back(), "1251 to now at 1 on Desk");
  live_.remember(stored(1, 900.0, {{950.0, 1, 0.25, "Car", kUnknown}}), kNow);
  EXPECT_EQ(stretches(), before);
}

TEST_F(LiveSessionsTest, DoesNotBelieveAClockThatIsFarOff) {
  list({listed(1, 10.0)}, kNow);
  live_.take(message(1, 5e9, {{"session_output_running", true}, {"QMSessionVolume", 7}}), kNow);
  EXPECT_THAT(stretches(), ElementsAre("1000 to now at 1 on "));
}

TEST_F(LiveSessionsTest, KeepsTheNewestChangesAndTheFirstSessions) {
  std::vector<ValueMap> many;
  for (std::size_t i = 0; i < LiveSessions::kMostSessions + 3; ++i)
    many.push_back(listed(static_cast<std::int64_t>(i), 10.0));
  list(many, kNow);
  EXPECT_EQ(live_.toValues().size(), LiveSessions::kMostSessions);
  EXPECT_EQ(live_.leftOut(), 3U);
  live_.take(message(0, 1000, {{"session_output_running", true}}), kNow);
  for (std::size_t i = 0; i < 2 * LiveSessions::kMostChanges; ++i) {
    live_.take(message(0, 1001.0 + static_cast<double>(i), {{"QMSessionVolume", i % 2 == 0 ? 0.5 : 1.0}}),
               kNow);
  }
  EXPECT_LE(stretches().size(), LiveSessions::kMostChanges + 1);
  EXPECT_THAT(stretches().back(), "1400 to now at 1 on ");
}

}  // namespace
}  // namespace tonewerk
