// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionGatherMessagesWorker.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <string>
#include <vector>

#include "workers/producers/ProducerTest.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

const char kRunning[] = "session_output_running";
const char kGather[] = "gather_session";
const char kDevices[] = "active_devices";
const char kFormat[] = "session_selected_format";

class GatherMessagesTest : public ProducerTest {
 protected:
  GatherMessagesTest()
      : ProducerTest({&TWReportingSessionGatherMessagesWorker::kWorkerClass,
                      &TWReportingSessionMetriconWorker::kWorkerClass}) {}

  TWReportingSessionMessages summariesOf(const TWReportingSessionMessages& messages) override {
    const TWReportingSessionGatherMessagesWorker worker(session);
    return worker.createGatherMessages(messages, 0.5);
  }

  std::string shortFormOf(const ValueMap& summary) const override {
    return summary.text("play_seconds") + "@" + summary.text("active_devices");
  }
};

// Streams and the summaries expected of them, each as "seconds@devices".

class GatherStreamTest : public GatherMessagesTest, public ::testing::WithParamInterface<StreamCase> {};

TEST_P(GatherStreamTest, IsSummarised) { EXPECT_EQ(shortFormsOf(GetParam().stream), GetParam().expected); }

INSTANTIATE_TEST_SUITE_P(
    Streams, GatherStreamTest,
    ::testing::Values(
        StreamCase{"Nothing", {}, {}},
        StreamCase{"PlayedInAGatherSession",
                   {{0, {{kRunning, kOn}, {kGather, 1}}}, {12, {{kRunning, kOff}}}},
                   {"12@unknown"}},
        StreamCase{"PlayedForExactlyTheMinimum",
                   {{0, {{kRunning, kOn}, {kGather, 1}}}, {0.5, {{kRunning, kOff}}}},
                   {}},
        StreamCase{"PlayedForALittleMoreThanTheMinimum",
                   {{0, {{kRunning, kOn}, {kGather, 1}}}, {0.625, {{kRunning, kOff}}}},
                   {"0.625@unknown"}},
        StreamCase{"PlayedOutsideGather", {{0, {{kRunning, kOn}}}, {12, {{kRunning, kOff}}}}, {}},
        StreamCase{"GatherIsNotOne",  // only 1 begins an interval
                   {{0, {{kRunning, kOn}, {kGather, 2}}}, {12, {{kRunning, kOff}}}},
                   {}},
        StreamCase{"GatherIsOneAsText",  // a text counts as its number
                   {{0, {{kRunning, kOn}, {kGather, "1"}}}, {12, {{kRunning, kOff}}}},
                   {"12@unknown"}},
        StreamCase{"JoinedBeforeTheStart",  // the start itself must say 1
                   {{0, {{kGather, 1}}}, {1, {{kRunning, kOn}}}, {12, {{kRunning, kOff}}}},
                   {}},
        StreamCase{"JoinedWhilePlaying",  // begins no interval
                   {{0, {{kRunning, kOn}}}, {4, {{kGather, 1}}}, {12, {{kRunning, kOff}}}},
                   {}},
        StreamCase{"JoinedWhilePlayingAndTheStopSaysSo",
                   {{0, {{kRunning, kOn}}}, {4, {{kGather, 1}}}, {12, {{kRunning, kOff}, {kGather, 1}}}},
                   {}},
        StreamCase{"JoinedWhilePlayingThenChangedDevices",  // the change begins an interval
                   {{0, {{kRunning, kOn}}},
                    {4, {{kGather, 1}}},
                    {6, {{kDevices, "Speaker"}}},
                    {12, {{kRunning, kOff}}}},
                   {"6@Speaker"}},
        StreamCase{"DevicesChanged",
                   {{0, {{kRunning, kOn}, {kGather, 1}, {kDevices, "Speaker"}}},
                    {4, {{kDevices, "Headphones"}}},
                    {12, {{kRunning, kOff}}}},
                   {"4@Speaker", "8@Headphones"}},
        StreamCase{"SelectedFormatChanged",  // also from the default
                   {{0, {{kRunning, kOn}, {kGather, 1}}}, {4, {{kFormat, "A"}}}, {12, {{kRunning, kOff}}}},
                   {"4@unknown", "8@unknown"}},
        StreamCase{"SelectedFormatRepeated",
                   {{0, {{kRunning, kOn}, {kGather, 1}, {kFormat, "A"}}},
                    {4, {{kFormat, "A"}}},
                    {12, {{kRunning, kOff}}}},
                   {"12@unknown"}},
        StreamCase{"OnlyCarriedContextChanged",
                   {{0, {{kRunning, kOn}, {kGather, 1}}},
                    {2, {{"mFormatID", "aac"}}},
                    {4, {{"mChannelsPerFrame", 2}}},
                    {12, {{kRunning, kOff}}}},
                   {"12@unknown"}},
        StreamCase{"DevicesChangedWhileSilent",
                   {{0, {{kRunning, kOn}, {kGather, 1}}},
                    {3, {{kRunning, kOff}}},
                    {4, {{kDevices, "Speaker"}}},
                    {5, {{kRunning, kOn}, {kGather, 1}}},
                    {7, {{kRunning, kOff}}}},
                   {"3@unknown", "2@Speaker"}},
        StreamCase{"LeftInAMessageThatDoesNotMentionOutput",  // ends nothing
                   {{0, {{kRunning, kOn}, {kGather, 1}}}, {4, {{kGather, 0}}}, {12, {{kRunning, kOff}}}},
                   {"12@unknown"}},
        StreamCase{"LeftTwice",  // the second time the interval is no longer in a Gather session
                   {{0, {{kRunning, kOn}, {kGather, 1}}},
                    {4, {{kGather, 0}}},
                    {6, {{kGather, 0}}},
                    {12, {{kRunning, kOff}}}},
                   {"6@unknown", "6@unknown"}},
        StreamCase{"AnotherNumberAndThenLeft",
                   {{0, {{kRunning, kOn}, {kGather, 1}}},
                    {4, {{kGather, 2}}},
                    {6, {{kGather, 0}}},
                    {12, {{kRunning, kOff}}}},
                   {"6@unknown", "6@unknown"}},
        StreamCase{"LeftWithAnotherStart",
                   {{0, {{kRunning, kOn}, {kGather, 1}}},
                    {4, {{kRunning, kOn}, {kGather, 0}}},
                    {12, {{kRunning, kOff}}}},
                   {"4@unknown", "8@unknown"}},
        StreamCase{"StartedAgainInAMessageThatDoesNotMentionGather",
                   {{0, {{kRunning, kOn}, {kGather, 1}}}, {4, {{kRunning, kOn}}}, {12, {{kRunning, kOff}}}},
                   {"4@unknown", "8@unknown"}},
        StreamCase{"StartedAgainInGather",
                   {{0, {{kRunning, kOn}, {kGather, 1}}},
                    {4, {{kRunning, kOn}, {kGather, 1}}},
                    {12, {{kRunning, kOff}}}},
                   {"12@unknown"}},
        StreamCase{"StoppedTwice",
                   {{0, {{kRunning, kOn}, {kGather, 1}}}, {4, {{kRunning, kOff}}}, {12, {{kRunning, kOff}}}},
                   {"4@unknown"}},
        StreamCase{"EndedByTheSessionsDuration",
                   {{0, {{kRunning, kOn}, {kGather, 1}}}, {10, {{"session_duration", 10.0}}}},
                   {"10@unknown"}},
        StreamCase{"DurationSaysStillRunning",  // one interval ends and the next one begins
                   {{0, {{kRunning, kOn}, {kGather, 1}}},
                    {10, {{"session_duration", 10.0}, {kRunning, kOn}, {kGather, 1}}},
                    {12, {{kRunning, kOff}}}},
                   {"10@unknown", "2@unknown"}},
        StreamCase{"NeverStopped", {{0, {{kRunning, kOn}, {kGather, 1}}}, {4, {{"other", 1}}}}, {}},
        StreamCase{"ShortIntervalsInBetween",
                   {{0, {{kRunning, kOn}, {kGather, 1}, {kDevices, "A"}}},
                    {2, {{kDevices, "B"}}},
                    {2.25, {{kDevices, "C"}}},
                    {5.25, {{kRunning, kOff}}}},
                   {"2@A", "3@C"}},
        StreamCase{"TimesGoBack", {{10, {{kRunning, kOn}, {kGather, 1}}}, {2, {{kRunning, kOff}}}}, {}}),
    [](const auto& tested) { return tested.param.name; });

TEST_F(GatherMessagesTest, IsAProducerFromTheSessionsStart) {
  expectAProducerFromTheSessionsStart(TWReportingSessionGatherMessagesWorker::kWorkerClass);
}

TEST_F(GatherMessagesTest, ASummaryHoldsTheContextOfTheEndingInterval) {
  const auto summaries = summariesOf(stream({{0,
                                              {{kRunning, kOn},
                                               {kGather, 1},
                                               {kDevices, "Speaker"},
                                               {kFormat, "48 kHz"},
                                               {"mFormatID", "lpcm"},
                                               {"mChannelsPerFrame", 2}}},
                                             {12, {{kRunning, kOff}, {"mFormatID", "later"}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  EXPECT_EQ(summaries[0]->category, 15U);
  EXPECT_EQ(summaries[0]->type, 11);
  EXPECT_EQ(
      summaries[0]->message.text(),
      R"({"session_selected_format":"48 kHz","mFormatID":"lpcm","active_devices":"Speaker",)"
      R"("play_seconds":12.0,"mChannelsPerFrame":2,"play_secondsBucketed":"10","msgidx":1,"msgcnt":1})");
  EXPECT_EQ(summaries[0]->message.find("msgidx")->kind(), Value::Kind::kInteger);
}

TEST_F(GatherMessagesTest, UnknownValuesHaveTheirDefaults) {
  const auto summaries = summariesOf(stream({{0, {{kRunning, kOn}, {kGather, 1}}}, {1, {{kRunning, kOff}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  EXPECT_EQ(summaries[0]->message.text(),
            R"({"session_selected_format":"unknown","mFormatID":"unknown","active_devices":"unknown",)"
            R"("play_seconds":1.0,"mChannelsPerFrame":-1,"play_secondsBucketed":"1","msgidx":1,"msgcnt":1})");
}

TEST_F(GatherMessagesTest, SummariesAreForTheAnalyticsAndTheJsonFileOnly) {
  const auto summaries =
      summariesOf(stream({{0, {{kRunning, kOn}, {kGather, 1}}}, {12, {{kRunning, kOff}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  EXPECT_THAT(summaries[0]->details.destinationWorkers(),
              ElementsAre(&TWReportingSessionMetriconWorker::kWorkerClass,
                          &TWReportingSessionSummaryJsonFileWorker::kWorkerClass));
}

TEST_F(GatherMessagesTest, SummariesAreNumberedAndCounted) {
  expectNumbersAndACount(
      {{0, {{kRunning, kOn}, {kGather, 1}}}, {3, {{kDevices, "A"}}}, {10, {{kRunning, kOff}}}});
}

TEST_F(GatherMessagesTest, PlaySecondsHaveSinglePrecision) {
  expectSinglePrecision({{kRunning, kOn}, {kGather, 1}}, {{kRunning, kOff}}, "play_seconds");
}

TEST_F(GatherMessagesTest, WithoutTimesThereIsNoSummary) {
  expectNoSummaryWithoutTimes({{kRunning, kOn}, {kGather, 1}}, {{kRunning, kOff}});
}

TEST_F(GatherMessagesTest, AnOpenIntervalInThePreviousValuesContinues) {
  session->addPreviousValues(
      {{kRunning, kOn}, {kGather, 1}, {kDevices, "Speaker"}, {"twreporting_timestamp", 4.0}});
  EXPECT_THAT(shortFormsOf({{10, {{kRunning, kOff}}}}), ElementsAre("6@Speaker"));
}

TEST_F(GatherMessagesTest, AnOpenIntervalOutsideGatherInThePreviousValuesYieldsNoSummary) {
  session->addPreviousValues({{kRunning, kOn}, {"twreporting_timestamp", 4.0}});
  EXPECT_THAT(shortFormsOf({{10, {{kRunning, kOff}}}}), IsEmpty());
}

TEST_F(GatherMessagesTest, AnyValueUnderGatherSessionIsEnoughForAnOpenInterval) {
  session->addPreviousValues({{kRunning, kOn}, {kGather, 0}, {"twreporting_timestamp", 4.0}});
  EXPECT_THAT(shortFormsOf({{10, {{kRunning, kOff}}}}), ElementsAre("6@unknown"));
}

TEST_F(GatherMessagesTest, RapidSpatialMessagesAreNotMerged) {
  const auto messages = stream({{0, {{kRunning, kOn}, {kGather, 1}}},
                                {2, {{"spatial-audio-accessory-feature", true}}},
                                {2.5, {{"spatializationEnabled", true}, {kDevices, "A"}}},
                                {10, {{kRunning, kOff}}}});
  EXPECT_THAT(textsUnder("play_seconds", summariesOf(messages)), ElementsAre("2.5", "7.5"));
  EXPECT_FALSE(messages[1]->message.contains(kDevices));
}

TEST_F(GatherMessagesTest, StopSendsTheSummariesIntoTheSession) {
  session->start();
  const double now = test.clock.now();
  session->sendMessage(messageAt(now, {{kRunning, kOn}, {kGather, 1}}));
  session->sendMessage(messageAt(now + 3, {{kRunning, kOff}}));
  session->stop();
  const auto events = test.metricon.eventsNamed("com.orvane.tonewerk.Gather.Summary");
  ASSERT_THAT(events, SizeIs(1));
  EXPECT_EQ(events[0].number("play_seconds"), 3.0);
  EXPECT_EQ(events[0].text("HostApplicationDisplayID"),
            "Unknown");  // like any message without an application
  EXPECT_EQ(events[0].text("audiotag"), "GatherSummary");
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDefault),
              ElementsAre("sending gather event for reporter 77"));
}

TEST_F(GatherMessagesTest, AStopWithoutSummariesSendsAndLogsNothing) {
  expectNothingOfAStopWithoutSummaries();
}

TEST_F(GatherMessagesTest, LogsWhatItDoesWithEachInterval) {
  test.log.clear();
  shortFormsOf({{0, {{kRunning, kOn}, {kGather, 1}}}, {2, {{kDevices, "A"}}}, {2.25, {{kRunning, kOff}}}});
  EXPECT_THAT(
      test.log.textsOf("twrr", LogLevel::kDebug),
      ElementsAre("entering createGatherMessages createGatherMessages",
                  "playingTime { func=createGatherMessages, playingTime=2.000000, twTimestamp=2, "
                  "twTimestamp_double=2.000000, startTwTimestamp=0, startTwTimestamp_double=0.000000 }",
                  "added gather message { func=createGatherMessages, action=add, count=1 }",
                  StartsWith("playingTime { func=createGatherMessages, playingTime=0.250000,"),
                  "skipped gather message, too short { func=createGatherMessages, action=skip, count=1 }"));
  expectDebugLinesOf("TWReportingSessionGatherMessagesWorker");
}

RC_GTEST_FIXTURE_PROP(GatherMessagesTest, SurvivesAnyStream, ()) {
  checkAnyStream(
      {kRunning, kGather, kDevices, kFormat, "session_duration", "mFormatID", "mChannelsPerFrame",
       "spatializationEnabled", "spatial-audio-accessory-feature", "other"},
      "play_seconds", [](const TWReportingSessionMessages&) {},
      [](const TWReportingSessionMessage& summary) {
        RC_ASSERT(summary.message.size() == 8U);
        RC_ASSERT(summary.details.destinationWorkers().size() == 2U);
      });
}

PlainWalk plainWalk() {
  const auto isInGather = [](const ValueMap& map) { return map.integer(kGather) == 1; };
  return {.runningKey = kRunning,
          .open = PlainWalk::Open::kContinues,
          .state = {{kFormat, "unknown"},
                    {kDevices, "unknown"},
                    {"mFormatID", "unknown"},
                    {"mChannelsPerFrame", -1}},
          .endsInterval =
              [isInGather](const ValueMap& state, const ValueMap& message) {
                const bool leaves = message.contains(kRunning) && isInGather(state) && !isInGather(message);
                const bool says0 = message.contains(kGather) && message.integer(kGather) == 0;
                return leaves || PlainWalk::changesText(state, message, kFormat) ||
                       PlainWalk::changesText(state, message, kDevices) || (says0 && !isInGather(state));
              },
          .summaryOf = [](const ValueMap& state, double seconds, int index) -> std::optional<ValueMap> {
            if (!state.contains(kGather)) return std::nullopt;
            return ValueMap{{kFormat, *state.find(kFormat)},
                            {"mFormatID", *state.find("mFormatID")},
                            {kDevices, *state.find(kDevices)},
                            {"play_seconds", PlainWalk::singlePrecision(seconds)},
                            {"mChannelsPerFrame", *state.find("mChannelsPerFrame")},
                            {"play_secondsBucketed", PlainWalk::bucketed(seconds)},
                            {"msgidx", index}};
          },
          .begins = isInGather};
}

RC_GTEST_FIXTURE_PROP(GatherMessagesTest, SummarisesLikeAWalkThatMergesEveryMessage, ()) {
  checkAgainst(plainWalk(),
               {kRunning, kRunning, kGather, kGather, kDevices, kFormat, "session_duration", "mFormatID",
                "mChannelsPerFrame", "spatializationEnabled", "other"},
               0.0);
}

}  // namespace
}  // namespace tonewerk
