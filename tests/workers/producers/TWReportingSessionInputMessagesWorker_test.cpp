// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionInputMessagesWorker.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <string>
#include <vector>

#include "workers/producers/ProducerTest.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

const char kRunning[] = "session_input_running";
const char kDevices[] = "active_devices";
const char kVocoder[] = "vp_config_primary_vocoder";
const char kRate[] = "vp_config_primary_vocoderFs";

class InputMessagesTest : public ProducerTest {
 protected:
  InputMessagesTest()
      : ProducerTest({&TWReportingSessionInputMessagesWorker::kWorkerClass,
                      &TWReportingSessionMetriconWorker::kWorkerClass}) {}

  TWReportingSessionMessages summariesOf(const TWReportingSessionMessages& messages) override {
    const TWReportingSessionInputMessagesWorker worker(session);
    const SharedString process("com.orvane.recorder");
    return worker.createInputMessages(messages, &process, 0.5);
  }

  // The vocoders come after a space.
  std::string shortFormOf(const ValueMap& summary) const override {
    const std::string text = summary.text("inputrunning_seconds") + "@" + summary.text("active_devices");
    return summary.contains("vocoders") ? text + " " + summary.text("vocoders") : text;
  }
};

// Streams and the summaries expected of them, each as "seconds@devices vocoders".

class InputStreamTest : public InputMessagesTest, public ::testing::WithParamInterface<StreamCase> {};

TEST_P(InputStreamTest, IsSummarised) { EXPECT_EQ(shortFormsOf(GetParam().stream), GetParam().expected); }

INSTANTIATE_TEST_SUITE_P(
    Streams, InputStreamTest,
    ::testing::Values(
        StreamCase{"Nothing", {}, {}},
        StreamCase{"RanOnOneDevice",
                   {{10, {{kRunning, kOn}, {kDevices, "Mic"}}}, {52, {{kRunning, kOff}}}},
                   {"42@Mic"}},
        StreamCase{"RanForExactlyTheMinimum", {{0, {{kRunning, kOn}}}, {0.5, {{kRunning, kOff}}}}, {}},
        StreamCase{"EndedByTheSessionAfterExactlyTheMinimum",
                   {{0, {{kRunning, kOn}}}, {0.5, {{"session_duration", 0.5}}}},
                   {}},
        StreamCase{"RanForALittleMoreThanTheMinimum",
                   {{0, {{kRunning, kOn}}}, {0.625, {{kRunning, kOff}}}},
                   {"0.625@unknown"}},
        StreamCase{"DevicesChangedWhileRunning",  // the first summary has the old devices
                   {{0, {{kRunning, kOn}, {kDevices, "Mic"}}},
                    {3, {{kDevices, "Headset"}}},
                    {10, {{kRunning, kOff}}}},
                   {"3@Mic", "7@Headset"}},
        StreamCase{"DevicesBecameKnownWhileRunning",
                   {{0, {{kRunning, kOn}}}, {3, {{kDevices, "Mic"}}}, {10, {{kRunning, kOff}}}},
                   {"3@unknown", "7@Mic"}},
        StreamCase{
            "DevicesRepeated",
            {{0, {{kRunning, kOn}, {kDevices, "Mic"}}}, {3, {{kDevices, "Mic"}}}, {10, {{kRunning, kOff}}}},
            {"10@Mic"}},
        StreamCase{"DevicesRepeatedAsAnotherKindOfNumber",  // values are compared, not texts
                   {{0, {{kRunning, kOn}, {kDevices, 1}}}, {3, {{kDevices, true}}}, {10, {{kRunning, kOff}}}},
                   {"10@1"}},
        StreamCase{"DevicesChangedWhileStopped",
                   {{0, {{kRunning, kOn}, {kDevices, "Mic"}}},
                    {3, {{kRunning, kOff}}},
                    {4, {{kDevices, "Headset"}}},
                    {5, {{kRunning, kOn}}},
                    {7, {{kRunning, kOff}}}},
                   {"3@Mic", "2@Headset"}},
        StreamCase{"StoppedWithNewDevices",
                   {{0, {{kRunning, kOn}, {kDevices, "Mic"}}}, {10, {{kRunning, kOff}, {kDevices, "None"}}}},
                   {"10@Mic"}},
        StreamCase{"StartedAgainWhileRunning",
                   {{0, {{kRunning, kOn}}}, {4, {{kRunning, kOn}}}, {10, {{kRunning, kOff}}}},
                   {"10@unknown"}},
        StreamCase{"StartedAgainOnOtherDevices",
                   {{0, {{kRunning, kOn}, {kDevices, "Mic"}}},
                    {4, {{kRunning, kOn}, {kDevices, "Headset"}}},
                    {10, {{kRunning, kOff}}}},
                   {"4@Mic", "6@Headset"}},
        StreamCase{"StoppedTwice",
                   {{0, {{kRunning, kOn}}}, {4, {{kRunning, kOff}}}, {10, {{kRunning, kOff}}}},
                   {"4@unknown"}},
        StreamCase{"NeverStopped", {{0, {{kRunning, kOn}}}, {4, {{"other", 1}}}}, {}},
        StreamCase{"EndedByTheSessionsDuration",
                   {{0, {{kRunning, kOn}}}, {10, {{"session_duration", 10.0}}}, {12, {{kRunning, kOff}}}},
                   {"10@unknown"}},
        StreamCase{"DurationSaysStillRunning",  // one interval ends and the next one begins
                   {{0, {{kRunning, kOn}}},
                    {10, {{"session_duration", 10.0}, {kRunning, kOn}}},
                    {12, {{kRunning, kOff}}}},
                   {"10@unknown", "2@unknown"}},
        StreamCase{"OnlyOtherContextChanged",
                   {{0, {{kRunning, kOn}}},
                    {2, {{"vp_config_operation_mode", "B"}, {"vp_config_input_port", "C"}}},
                    {4, {{"session_selected_format", "D"}, {"mFormatID", "E"}}},
                    {10, {{kRunning, kOff}}}},
                   {"10@unknown"}},
        StreamCase{"VocoderChanged",  // ends nothing
                   {{0, {{kRunning, kOn}}},
                    {4, {{kVocoder, "Opus"}, {kRate, "16000.000000"}}},
                    {10, {{kRunning, kOff}}}},
                   {"10@unknown Opus:16000.000000"}},
        StreamCase{"VocoderWithoutARunningRate",
                   {{0, {{kRunning, kOn}}},
                    {4, {{kVocoder, "Opus"}, {kRate, "0.000000"}}},
                    {10, {{kRunning, kOff}}}},
                   {"10@unknown"}},
        StreamCase{"VocoderWithoutAnyRate",
                   {{0, {{kRunning, kOn}}}, {4, {{kVocoder, "Opus"}}}, {10, {{kRunning, kOff}}}},
                   {"10@unknown Opus:(null)"}},
        StreamCase{"VocoderRateIsNotTheStates",
                   {{0, {{kRunning, kOn}}},
                    {3, {{kRate, "8000"}}},
                    {4, {{kVocoder, "Opus"}}},
                    {10, {{kRunning, kOff}}}},
                   {"10@unknown Opus:(null)"}},
        StreamCase{"VocodersAreSorted",
                   {{0, {{kRunning, kOn}}},
                    {2, {{kVocoder, "B"}, {kRate, 8000}}},
                    {4, {{kVocoder, "A"}, {kRate, 16000}}},
                    {10, {{kRunning, kOff}}}},
                   {"10@unknown A:16000,B:8000"}},
        StreamCase{"VocodersAreListedOnce",
                   {{0, {{kRunning, kOn}}},
                    {2, {{kVocoder, "B"}, {kRate, "8000"}}},
                    {3, {{kVocoder, "A"}, {kRate, "8000"}}},
                    {4, {{kVocoder, "B"}, {kRate, "8000"}}},
                    {10, {{kRunning, kOff}}}},
                   {"10@unknown A:8000,B:8000"}},
        StreamCase{"VocoderRepeated",
                   {{0, {{kRunning, kOn}, {kVocoder, "A"}, {kRate, "8000"}}},
                    {3, {{kVocoder, "A"}, {kRate, "16000"}}},  // another rate is no change
                    {10, {{kRunning, kOff}}}},
                   {"10@unknown A:8000"}},
        StreamCase{"VocoderBeforeTheStart",
                   {{0, {{kVocoder, "A"}, {kRate, "8000"}}}, {1, {{kRunning, kOn}}}, {9, {{kRunning, kOff}}}},
                   {"8@unknown"}},
        StreamCase{"VocoderWithTheStop",
                   {{0, {{kRunning, kOn}}}, {9, {{kRunning, kOff}, {kVocoder, "A"}, {kRate, "8000"}}}},
                   {"9@unknown"}},
        StreamCase{"VocodersOfTwoIntervals",
                   {{0, {{kRunning, kOn}}},
                    {1, {{kVocoder, "A"}, {kRate, "8000"}}},
                    {4, {{kRunning, kOff}}},
                    {5, {{kRunning, kOn}}},
                    {6, {{kVocoder, "B"}, {kRate, "8000"}}},
                    {7, {{kRunning, kOff}}}},
                   {"4@unknown A:8000", "2@unknown B:8000"}},
        StreamCase{"VocodersOfASkippedIntervalAreInTheNextSummary",
                   {{0, {{kRunning, kOn}}},
                    {0.25, {{kVocoder, "A"}, {kRate, "8000"}}},
                    {0.5, {{kRunning, kOff}}},
                    {5, {{kRunning, kOn}}},
                    {7, {{kRunning, kOff}}},
                    {8, {{kRunning, kOn}}},
                    {9, {{kRunning, kOff}}}},
                   {"2@unknown A:8000", "1@unknown"}},
        StreamCase{"VocoderWithNewDevices",  // is listed in the interval that the message ends
                   {{0, {{kRunning, kOn}}},
                    {4, {{kDevices, "Mic"}, {kVocoder, "A"}, {kRate, "8000"}}},
                    {10, {{kRunning, kOff}}}},
                   {"4@unknown A:8000", "6@Mic"}},
        StreamCase{"TimesGoBack", {{10, {{kRunning, kOn}}}, {2, {{kRunning, kOff}}}}, {}}),
    [](const auto& tested) { return tested.param.name; });

TEST_F(InputMessagesTest, IsAProducerFromTheSessionsStart) {
  expectAProducerFromTheSessionsStart(TWReportingSessionInputMessagesWorker::kWorkerClass);
}

TEST_F(InputMessagesTest, ASummaryHoldsTheContextOfTheEndingInterval) {
  const auto summaries =
      summariesOf(stream({{0,
                           {{kRunning, kOn},
                            {"vp_config_operation_mode", "Voice"},
                            {"vp_config_input_port", "Port"},
                            {kDevices, "Mic"},
                            {kVocoder, "Opus"},
                            {kRate, "48000.000000"}}},
                          {42, {{kRunning, kOff}, {"vp_config_operation_mode", "later"}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  EXPECT_EQ(summaries[0]->category, 3U);
  EXPECT_EQ(summaries[0]->type, 11);
  EXPECT_THAT(summaries[0]->details.destinationWorkers(), IsEmpty());
  EXPECT_EQ(
      summaries[0]->message.text(),
      R"({"HostApplicationDisplayID":"com.orvane.recorder","inputrunning_seconds":42.0,)"
      R"("inputrunning_secondsBucketed":"30","msgidx":1,"vp_config_operation_mode":"Voice",)"
      R"("vp_config_input_port":"Port","active_devices":"Mic","vocoders":"Opus:48000.000000","msgcnt":1})");
}

TEST_F(InputMessagesTest, MissingValuesAreUnknownAndWithoutVocodersThereIsNoList) {
  const auto summaries = summariesOf(stream({{0, {{kRunning, kOn}}}, {1, {{kRunning, kOff}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  EXPECT_EQ(summaries[0]->message.text(),
            R"({"HostApplicationDisplayID":"com.orvane.recorder","inputrunning_seconds":1.0,)"
            R"("inputrunning_secondsBucketed":"1","msgidx":1,"vp_config_operation_mode":"unknown",)"
            R"("vp_config_input_port":"unknown","active_devices":"unknown","msgcnt":1})");
}

TEST_F(InputMessagesTest, SummariesAreNumberedAndCounted) {
  expectNumbersAndACount({{0, {{kRunning, kOn}}}, {3, {{kDevices, "Mic"}}}, {10, {{kRunning, kOff}}}});
}

TEST_F(InputMessagesTest, RunningSecondsHaveSinglePrecision) {
  expectSinglePrecision({{kRunning, kOn}}, {{kRunning, kOff}}, "inputrunning_seconds");
}

TEST_F(InputMessagesTest, WithoutAProcessThereIsNoSummary) {
  const TWReportingSessionInputMessagesWorker worker(session);
  EXPECT_THAT(
      worker.createInputMessages(stream({{0, {{kRunning, kOn}}}, {10, {{kRunning, kOff}}}}), nullptr, 0.5),
      IsEmpty());
}

TEST_F(InputMessagesTest, WithoutTimesThereIsNoSummary) {
  expectNoSummaryWithoutTimes({{kRunning, kOn}}, {{kRunning, kOff}});
}

TEST_F(InputMessagesTest, TheWalkBeginsWithThePreviousValues) {
  session->addPreviousValues({{kDevices, "Headset"}, {"vp_config_input_port", "Port"}});
  const auto summaries = summariesOf(stream({{0, {{kRunning, kOn}}}, {5, {{kRunning, kOff}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  EXPECT_EQ(summaries[0]->message.text("active_devices"), "Headset");
  EXPECT_EQ(summaries[0]->message.text("vp_config_input_port"), "Port");
}

TEST_F(InputMessagesTest, InputThatThePreviousValuesShowRunningBeginsNoInterval) {
  session->addPreviousValues({{kRunning, kOn}, {"twreporting_timestamp", 0.0}});
  EXPECT_THAT(shortFormsOf({{10, {{kRunning, kOff}}}}), IsEmpty());
  EXPECT_THAT(shortFormsOf({{10, {{kRunning, kOn}}}, {20, {{kRunning, kOff}}}}), IsEmpty());
  EXPECT_THAT(shortFormsOf({{10, {{kRunning, kOn}}},
                            {12, {{kRunning, kOff}}},
                            {20, {{kRunning, kOn}}},
                            {23, {{kRunning, kOff}}}}),
              ElementsAre("3@unknown"));
}

TEST_F(InputMessagesTest, InputThatThePreviousValuesShowRunningIsStillChangedByNewDevices) {
  session->addPreviousValues({{kRunning, kOn}, {kDevices, "Mic"}});
  EXPECT_THAT(
      shortFormsOf({{10, {{kRunning, kOn}}}, {12, {{kDevices, "Headset"}}}, {20, {{kRunning, kOff}}}}),
      ElementsAre("8@Headset"));
}

TEST_F(InputMessagesTest, RapidSpatialMessagesAreMergedIntoTheFirst) {
  const auto messages = stream({{0, {{kRunning, kOn}}},
                                {2, {{"spatial-audio-accessory-feature", true}}},
                                {3.5, {{"spatializationEnabled", true}, {kDevices, "Mic"}}},
                                {10, {{kRunning, kOff}}}});
  const auto summaries = summariesOf(messages);
  EXPECT_THAT(textsUnder("inputrunning_seconds", summaries), ElementsAre("3.5", "6.5"));
  EXPECT_EQ(messages[1]->message.text(kDevices), "Mic");  // the session's own record
}

TEST_F(InputMessagesTest, SpatialMessagesTwoSecondsApartAreNot) {
  const auto messages = stream({{0, {{kRunning, kOn}}},
                                {2, {{"spatial-audio-accessory-feature", true}}},
                                {4, {{"spatializationEnabled", true}, {kDevices, "Mic"}}},
                                {10, {{kRunning, kOff}}}});
  const auto summaries = summariesOf(messages);
  EXPECT_THAT(textsUnder("inputrunning_seconds", summaries), ElementsAre("4", "6"));
  EXPECT_FALSE(messages[1]->message.contains(kDevices));
}

TEST_F(InputMessagesTest, StopSendsTheSummariesIntoTheSession) {
  const ValueMap configuration{{"HostApplicationDisplayID", "com.orvane.recorder"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  session->start();
  const double now = test.clock.now();
  session->sendMessage(messageAt(now, {{kRunning, kOn}}));
  session->sendMessage(messageAt(now + 3, {{kRunning, kOff}}));
  session->stop();
  const auto events = test.metricon.eventsNamed("com.orvane.tonewerk.Input.Summary");
  ASSERT_THAT(events, SizeIs(1));
  EXPECT_EQ(events[0].number("inputrunning_seconds"), 3.0);
  EXPECT_EQ(events[0].text("HostApplicationDisplayID"), "com.orvane.recorder");
  EXPECT_EQ(events[0].text("audiotag"), "InputSummary");
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDefault),
              ElementsAre("sending input summary event for reporter 77"));
}

TEST_F(InputMessagesTest, AStopWithoutSummariesSendsAndLogsNothing) {
  expectNothingOfAStopWithoutSummaries();
}

TEST_F(InputMessagesTest, LogsWhatItDoesWithEachInterval) {
  test.log.clear();
  shortFormsOf({{0, {{kRunning, kOn}}}, {2, {{kDevices, "Mic"}}}, {2.25, {{kRunning, kOff}}}});
  EXPECT_THAT(
      test.log.textsOf("twrr", LogLevel::kDebug),
      ElementsAre("entering createInputMessages createInputMessages",
                  "runningTime { func=createInputMessages, runningTime=2.000000, twTimestamp=2, "
                  "twTimestamp_double=2.000000, startTwTimestamp=0, startTwTimestamp_double=0.000000 }",
                  "added input message { func=createInputMessages, action=add, count=1 }",
                  StartsWith("runningTime { func=createInputMessages, runningTime=0.250000,"),
                  "skipped input message, too short { func=createInputMessages, action=skip, count=1 }",
                  "returning input messages { func=createInputMessages, action=return, count=1 }"));
  expectDebugLinesOf("TWReportingSessionInputMessagesWorker");
}

RC_GTEST_FIXTURE_PROP(InputMessagesTest, SurvivesAnyStream, ()) {
  checkAnyStream(
      {kRunning, kDevices, kVocoder, kRate, "session_duration", "spatializationEnabled",
       "spatial-audio-accessory-feature", "vp_config_operation_mode", "vp_config_input_port", "other"},
      "inputrunning_seconds", [](const auto& messages) { mergeRapidSpatialMessages(messages, 2.0); },
      [](const TWReportingSessionMessage& summary) {
        RC_ASSERT(summary.message.size() == (summary.message.contains("vocoders") ? 9U : 8U));
      });
}

PlainWalk plainWalk(std::set<std::string>& vocoders) {
  return {
      .runningKey = kRunning,
      .open = PlainWalk::Open::kNoBegin,
      .state = {{"active_devices", "unknown"},
                {"vp_config_operation_mode", "unknown"},
                {"vp_config_input_port", "unknown"},
                {kRate, "unknown"},
                {kVocoder, "unknown"}},
      .endsInterval =
          [](const ValueMap& state, const ValueMap& message) {
            return TWReportingUtilityKeyIsPresentAndHasChanged("active_devices", &message, &state);
          },
      .summaryOf = [&vocoders](const ValueMap& state, double seconds, int index) -> std::optional<ValueMap> {
        ValueMap summary{{"HostApplicationDisplayID", "com.orvane.recorder"},
                         {"inputrunning_seconds", PlainWalk::singlePrecision(seconds)},
                         {"inputrunning_secondsBucketed", PlainWalk::bucketed(seconds)},
                         {"msgidx", index},
                         {"vp_config_operation_mode", *state.find("vp_config_operation_mode")},
                         {"vp_config_input_port", *state.find("vp_config_input_port")},
                         {"active_devices", *state.find("active_devices")}};
        std::string names;
        for (const std::string& name : vocoders) names += (names.empty() ? "" : ",") + name;
        if (!vocoders.empty()) summary.set("vocoders", names);
        vocoders.clear();
        return summary;
      },
      .collect =
          [&vocoders](const ValueMap& state, const ValueMap& message) {
            const std::string rate = textOf(message.find(kRate));
            if (TWReportingUtilityKeyIsPresentAndHasChanged(kVocoder, &message, &state) &&
                !rate.starts_with("0.")) {
              vocoders.insert(message.text(kVocoder) + ":" + rate);
            }
          }};
}

RC_GTEST_FIXTURE_PROP(InputMessagesTest, SummarisesLikeAWalkThatMergesEveryMessage, ()) {
  std::set<std::string> vocoders;
  checkAgainst(
      plainWalk(vocoders),
      {kRunning, kRunning, kDevices, kVocoder, kRate, "session_duration", "spatializationEnabled",
       "spatial-audio-accessory-feature", "vp_config_operation_mode", "vp_config_input_port", "other"},
      2.0);
}

}  // namespace
}  // namespace tonewerk
