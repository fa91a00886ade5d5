// SPDX-License-Identifier: Apache-2.0
//
// The summaries of a client's playback and recording when its session stops, made by the whole service with
// all workers. The expected numbers were computed by hand.
#include <cmath>
#include <gtest/gtest.h>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "support/ServiceTest.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr AudioEventCategory kPlayback = 4;
constexpr double kBegin = ManualClock::kStart + 100.0;  // when playback begins, after the session's start

class SessionSummariesTest : public ServiceTest {
 protected:
  SessionSummariesTest() : ServiceTest(allWorkerClasses()) {
    makeInternalBuild();  // so that JSON files are written
    create(*client, kSession);
    ask(*client, "setServiceType", {kLongFormAudio, kSession});
    ask(*client, "setConfiguration",
        {ValueMap{{"HostApplicationDisplayID", "com.example.player"}}, kSession});
    startAgain();
  }

  void startAgain() { ask(*client, "startReportingSessionForID", {kSession}); }
  // Consecutive messages must differ, so that none is redundant. `at` is the message's time.
  void send(ValueMap payload, const Value& at) {
    payload.set("twreporting_timestamp", at);
    ask(*client, "sendMessage",
        {payload, kPlayback, static_cast<int>(kTypeStart), Value(ValueArray{kSession})});
  }
  void stop() { ask(*client, "stopReportingSessionForID", {kSession}); }

  std::vector<ValueMap> summaries(const std::string& category) const {
    return test.metricon.eventsNamed("com.orvane.longformaudio." + category + ".Summary");
  }
  // Each as "seconds@volume index/count".
  std::vector<std::string> played() const {
    std::vector<std::string> texts;
    for (const ValueMap& summary : summaries("Volume")) {
      texts.push_back(summary.text("play_seconds") + "@" + summary.text("QMSessionVolume") + " " +
                      summary.text("msgidx") + "/" + summary.text("msgcnt"));
    }
    return texts;
  }
  // Each as "seconds index/count".
  std::vector<std::string> secondsOf(const std::string& category, const std::string& key) const {
    std::vector<std::string> texts;
    for (const ValueMap& summary : summaries(category)) {
      texts.push_back(summary.text(key) + " " + summary.text("msgidx") + "/" + summary.text("msgcnt"));
    }
    return texts;
  }
  std::vector<std::string> gathered() const { return secondsOf("Gather", "play_seconds"); }
  std::vector<std::string> recorded() const { return secondsOf("Input", "inputrunning_seconds"); }

  std::unique_ptr<MemoryClient> client = connect(4711);
};

const Value kNoTime(std::nan(""));

// Times that are dates.

TEST_F(SessionSummariesTest, ADateCountsAsItsSeconds) {
  send({{"session_output_running", true}, {"QMSessionVolume", 0.3}}, Date{kBegin});
  send({{"session_output_running", false}}, Date{kBegin + 42.0});
  send({{"session_input_running", true}}, Date{kBegin + 50.0});
  send({{"session_input_running", false}}, Date{kBegin + 56.5});
  stop();
  EXPECT_THAT(played(), ElementsAre("42@0.3 1/1"));
  EXPECT_EQ(summaries("Volume").at(0).text("QMSessionVolumeBucketed"), "0.3125");
  EXPECT_EQ(summaries("Volume").at(0).text("play_secondsBucketed"), "30");
  EXPECT_THAT(recorded(), ElementsAre("6.5 1/1"));
  EXPECT_EQ(summaries("Input").at(0).text("inputrunning_secondsBucketed"), "5");
}

TEST_F(SessionSummariesTest, DatesAndNumbersAreComparableTimes) {
  send({{"session_output_running", false}}, Date{kBegin + 10.0});  // the later message is sent first
  send({{"session_output_running", true}, {"QMSessionVolume", 0.5}}, kBegin);
  send({{"QMSessionVolume", 0.75}}, Date{kBegin + 4.0});
  stop();
  EXPECT_THAT(played(), ElementsAre("4@0.5 1/2", "6@0.75 2/2"));
}

// A date of more than a year ago is invalid, like such a number.
TEST_F(SessionSummariesTest, ADateThatIsTooOldIsReplacedAndKeptAsInvalid) {
  send({{"a", 1}}, Date{ManualClock::kStart - 366.0 * 86'400.0});
  const auto events = test.metricon.eventsNamed("com.orvane.longformaudio.Playback.Start");
  ASSERT_THAT(events, SizeIs(1));
  EXPECT_EQ(events[0].number("twreporting_timestamp"), test.clock.now());
  EXPECT_EQ(*events[0].find("invalid_timestamp"), Value(Date{ManualClock::kStart - 366.0 * 86'400.0}));
}

// Times that are not numbers.

TEST_F(SessionSummariesTest, AMessageWhoseTimeIsNotANumberComesFirst) {
  send({{"session_output_running", true}, {"QMSessionVolume", 0.5}}, kBegin);
  send({{"QMSessionVolume", 0.75}}, kNoTime);
  send({{"session_output_running", false}}, kBegin + 10.0);
  stop();
  EXPECT_THAT(played(), ElementsAre("10@0.5 1/1"));
}

TEST_F(SessionSummariesTest, APeriodWhoseLengthIsNotANumberIsTooShort) {
  send({{"session_output_running", true},
        {"session_input_running", true},
        {"gather_session", 1},
        {"QMSessionVolume", 0.5}},
       kNoTime);
  send({{"session_output_running", false}, {"session_input_running", false}, {"gather_session", 1}},
       kBegin + 10.0);
  stop();
  EXPECT_THAT(played(), IsEmpty());
  EXPECT_THAT(gathered(), IsEmpty());
  EXPECT_THAT(recorded(), IsEmpty());
}

TEST_F(SessionSummariesTest, AnEndWhoseTimeIsNotANumberEndsNoPeriod) {
  send({{"session_output_running", true}, {"QMSessionVolume", 0.5}}, kBegin);
  send({{"session_output_running", false}}, kNoTime);
  stop();
  EXPECT_THAT(played(), IsEmpty());
}

TEST_F(SessionSummariesTest, AnInfiniteTimeMakesAnInfinitePeriod) {
  send({{"session_output_running", true}, {"QMSessionVolume", 0.5}}, kBegin);
  send({{"session_output_running", false}}, HUGE_VAL);
  stop();
  EXPECT_THAT(played(), ElementsAre("inf@0.5 1/1"));
  EXPECT_EQ(summaries("Volume").at(0).text("play_secondsBucketed"), "18000");
}

// Several producers at one stop.

TEST_F(SessionSummariesTest, OneStopYieldsVolumeGatherAndInputSummaries) {
  send({{"session_output_running", true},
        {"session_input_running", true},
        {"gather_session", 1},
        {"QMSessionVolume", 0.5},
        {"session_selected_format", "AAC"},
        {"active_devices", "Speaker"},
        {"mFormatID", "aac"},
        {"mChannelsPerFrame", 2}},
       kBegin);
  send({{"QMSessionVolume", 0.75}}, kBegin + 12.0);
  send({{"session_output_running", false}, {"session_input_running", false}, {"gather_session", 1}},
       kBegin + 18.0);
  stop();
  context->fileSinkQueue().drain();
  EXPECT_THAT(played(), ElementsAre("12@0.5 1/2", "6@0.75 2/2"));
  EXPECT_THAT(gathered(), ElementsAre("18 1/1"));
  EXPECT_THAT(recorded(), ElementsAre("18 1/1"));
  const ValueMap gather = summaries("Gather").at(0);
  EXPECT_EQ(gather.text("play_secondsBucketed"), "10");
  EXPECT_EQ(gather.text("session_selected_format"), "AAC");
  EXPECT_EQ(gather.text("active_devices"), "Speaker");
  EXPECT_EQ(gather.text("mFormatID"), "aac");
  EXPECT_EQ(gather.integer("mChannelsPerFrame"), 2);
  EXPECT_FALSE(gather.contains("QMSessionVolume"));

  // In the order in which the producers stop.
  std::vector<std::string> derived;
  ASSERT_THAT(test.files.files(), SizeIs(1));
  const std::string file = test.files.contents(test.files.files().front()).value();
  for (const auto& entry : nlohmann::json::parse(file)) {
    const std::string& name = entry.begin().key();
    if (name.find("_Summary_") != std::string::npos) derived.push_back(name);
  }
  EXPECT_THAT(derived, ElementsAre("Volume_Summary_1", "Volume_Summary_2", "Gather_Summary_1",
                                   "Session_Generic_Summary_1", "Input_Summary_1"));
}

// The gather worker also goes through the volume summaries, which name devices that were active earlier.
TEST_F(SessionSummariesTest, VolumeSummariesDoNotDisturbTheGatherSummary) {
  send({{"session_output_running", true},
        {"gather_session", 1},
        {"QMSessionVolume", 0.5},
        {"active_devices", "Speaker"}},
       kBegin);
  send({{"active_devices", "Headphones"}}, kBegin + 3.0);
  send({{"session_output_running", false}, {"gather_session", 1}}, kBegin + 10.0);
  stop();
  EXPECT_THAT(played(), ElementsAre("3@0.5 1/2", "7@0.5 2/2"));
  EXPECT_THAT(gathered(), ElementsAre("3 1/2", "7 2/2"));
  EXPECT_EQ(summaries("Gather").at(0).text("active_devices"), "Speaker");
  EXPECT_EQ(summaries("Gather").at(1).text("active_devices"), "Headphones");
}

// A second start and stop.

TEST_F(SessionSummariesTest, ASecondRunIsSummarisedAloneWithTheStateOfTheFirst) {
  send({{"session_output_running", true}, {"QMSessionVolume", 0.25}, {"active_devices", "Speaker"}}, kBegin);
  send({{"session_output_running", false}}, kBegin + 10.0);
  stop();
  EXPECT_THAT(played(), ElementsAre("10@0.25 1/1"));
  test.metricon.clear();

  startAgain();
  send({{"session_output_running", true}}, kBegin + 100.0);
  send({{"session_output_running", false}}, kBegin + 107.0);
  stop();
  EXPECT_THAT(played(), ElementsAre("7@0.25 1/1"));
  EXPECT_EQ(summaries("Volume").at(0).text("active_devices"), "Speaker");
}

// A summary begins with the session's previous values, which include the messages of the run itself.
TEST_F(SessionSummariesTest, ASummaryBeginsWithTheSessionsLastState) {
  send({{"session_output_running", true}}, kBegin);
  send({{"QMSessionVolume", 0.75}, {"mFormatID", "aac"}}, kBegin + 4.0);
  send({{"session_output_running", false}}, kBegin + 9.0);
  stop();
  EXPECT_THAT(played(), ElementsAre("9@0.75 1/1"));  // the volume counts as 0.75 from the start
  EXPECT_EQ(summaries("Volume").at(0).text("mFormatID"), "aac");
}

TEST_F(SessionSummariesTest, OutputLeftRunningInTheFirstRunDoesNotCountInTheSecond) {
  send({{"session_output_running", true}, {"gather_session", 1}, {"QMSessionVolume", 0.5}}, kBegin);
  stop();
  EXPECT_THAT(played(), IsEmpty());
  startAgain();
  send({{"session_output_running", false}, {"gather_session", 1}}, kBegin + 30.0);
  stop();
  EXPECT_THAT(played(), IsEmpty());
  EXPECT_THAT(gathered(), IsEmpty());
}

// By the time of the stop, the previous values are those of the period's end, not of its beginning.
TEST_F(SessionSummariesTest, TheFinalMessageOfASecondRunEndsNoPeriodOfTheFirst) {
  send({{"session_output_running", true}, {"gather_session", 1}, {"QMSessionVolume", 0.5}}, kBegin);
  stop();
  startAgain();
  send({{"session_duration", 30.0}}, kBegin + 30.0);
  stop();
  EXPECT_THAT(played(), IsEmpty());
  EXPECT_THAT(gathered(), IsEmpty());
}

TEST_F(SessionSummariesTest, InputLeftRunningInTheFirstRunStartsAgainInTheSecond) {
  send({{"session_input_running", true}, {"vp_config_operation_mode", "voice"}, {"active_devices", "Mic"}},
       kBegin);
  stop();
  EXPECT_THAT(recorded(), IsEmpty());
  startAgain();
  send({{"session_input_running", false}}, kBegin + 60.0);
  send({{"session_input_running", true}}, kBegin + 70.0);
  send({{"session_input_running", false}}, kBegin + 75.0);
  stop();
  EXPECT_THAT(recorded(), ElementsAre("5 1/1"));
  EXPECT_EQ(summaries("Input").at(0).text("vp_config_operation_mode"), "voice");
  EXPECT_EQ(summaries("Input").at(0).text("active_devices"), "Mic");
}

TEST_F(SessionSummariesTest, SummariesOfTheFirstRunDoNotCountInTheSecond) {
  for (const double begin : {kBegin, kBegin + 100.0, kBegin + 200.0}) {
    test.metricon.clear();
    send({{"session_output_running", true}, {"gather_session", 1}, {"QMSessionVolume", 0.5}}, begin);
    send({{"QMSessionVolume", 0.75}}, begin + 2.0);
    send({{"session_output_running", false}, {"gather_session", 1}}, begin + 5.0);
    stop();
    EXPECT_THAT(played(), ElementsAre("2@0.5 1/2", "3@0.75 2/2"));
    EXPECT_THAT(gathered(), ElementsAre("5 1/1"));
    startAgain();
  }
}

}  // namespace
}  // namespace tonewerk
