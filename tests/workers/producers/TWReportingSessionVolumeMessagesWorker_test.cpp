// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionVolumeMessagesWorker.h"

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

class VolumeMessagesTest : public ProducerTest {
 protected:
  VolumeMessagesTest()
      : ProducerTest({&TWReportingSessionVolumeMessagesWorker::kWorkerClass,
                      &TWReportingSessionMetriconWorker::kWorkerClass}) {}

  TWReportingSessionMessages summariesOf(const TWReportingSessionMessages& messages) override {
    const TWReportingSessionVolumeMessagesWorker worker(session);
    const SharedString process("com.orvane.player");
    return worker.createVolumeMessages(messages, &process, 0.5);
  }

  std::string shortFormOf(const ValueMap& summary) const override {
    return summary.text("play_seconds") + "@" + summary.text("QMSessionVolume");
  }
};

// Streams and the summaries expected of them, each as "seconds@volume".

class VolumeStreamTest : public VolumeMessagesTest, public ::testing::WithParamInterface<StreamCase> {};

TEST_P(VolumeStreamTest, IsSummarised) { EXPECT_EQ(shortFormsOf(GetParam().stream), GetParam().expected); }

const char kRunning[] = "session_output_running";
const char kVolume[] = "QMSessionVolume";

INSTANTIATE_TEST_SUITE_P(
    Streams, VolumeStreamTest,
    ::testing::Values(
        StreamCase{"Nothing", {}, {}},
        StreamCase{"PlayedAtOneVolume",
                   {{10, {{kRunning, kOn}, {kVolume, 0.5}}}, {52, {{kRunning, kOff}}}},
                   {"42@0.5"}},
        StreamCase{"PlayedForExactlyTheMinimum",
                   {{10, {{kRunning, kOn}, {kVolume, 0.5}}}, {10.5, {{kRunning, kOff}}}},
                   {}},
        StreamCase{"PlayedForALittleMoreThanTheMinimum",
                   {{10, {{kRunning, kOn}, {kVolume, 0.5}}}, {10.625, {{kRunning, kOff}}}},
                   {"0.625@0.5"}},
        StreamCase{"VolumeChangedWhilePlaying",
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {3, {{kVolume, 0.8}}}, {10, {{kRunning, kOff}}}},
                   {"3@0.5", "7@0.8"}},
        StreamCase{
            "VolumeChangedToTheSameNumberAsText",
            {{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {3, {{kVolume, "0.50"}}}, {10, {{kRunning, kOff}}}},
            {"10@0.50"}},
        StreamCase{"VolumeChangedWhileSilent",
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}}},
                    {3, {{kRunning, kOff}}},
                    {4, {{kVolume, 0.8}}},
                    {5, {{kRunning, kOn}}},
                    {7, {{kRunning, kOff}}}},
                   {"3@0.5", "2@0.8"}},
        StreamCase{"VolumeCameAfterTheStart",  // until then the interval has no volume, so it continues
                   {{0, {{kRunning, kOn}}}, {3, {{kVolume, 0.5}}}, {10, {{kRunning, kOff}}}},
                   {"10@0.5"}},
        StreamCase{"WithoutAVolume", {{0, {{kRunning, kOn}}}, {10, {{kRunning, kOff}}}}, {}},
        StreamCase{"StoppedWithANewVolume",  // the ending message's values belong to the next interval
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {10, {{kRunning, kOff}, {kVolume, 0.9}}}},
                   {"10@0.5"}},
        StreamCase{"StartedAgainWhilePlaying",
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {4, {{kRunning, kOn}}}, {10, {{kRunning, kOff}}}},
                   {"10@0.5"}},
        StreamCase{"EndedByTheSessionsDuration",
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {10, {{"session_duration", 10.0}}}},
                   {"10@0.5"}},
        StreamCase{"DurationSaysStillRunning",  // one interval ends and the next one begins
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}}},
                    {10, {{"session_duration", 10.0}, {kRunning, kOn}}},
                    {12, {{kRunning, kOff}}}},
                   {"10@0.5", "2@0.5"}},
        StreamCase{"DevicesChanged",
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}, {"active_devices", "Speaker"}}},
                    {4, {{"active_devices", "Headphones"}}},
                    {10, {{kRunning, kOff}}}},
                   {"4@0.5", "6@0.5"}},
        StreamCase{"SelectedFormatChanged",
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}, {"session_selected_format", "A"}}},
                    {4, {{"session_selected_format", "B"}}},
                    {10, {{kRunning, kOff}}}},
                   {"4@0.5", "6@0.5"}},
        StreamCase{"SpatialisationChanged",
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}}},
                    {4, {{"spatializationEnabled", true}}},
                    {10, {{kRunning, kOff}}}},
                   {"4@0.5", "6@0.5"}},
        StreamCase{
            "RingerChanged",
            {{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {4, {{"ringerstate", 1}}}, {10, {{kRunning, kOff}}}},
            {"4@0.5", "6@0.5"}},
        StreamCase{"OnlyCarriedContextChanged",
                   {{0, {{kRunning, kOn}, {kVolume, 0.5}}},
                    {2, {{"mFormatID", "aac"}}},
                    {4, {{"mChannelsPerFrame", 2}}},
                    {6, {{"spatial-audio-accessory-feature", true}}},
                    {10, {{kRunning, kOff}}}},
                   {"10@0.5"}},
        StreamCase{"ShortIntervalsInBetween",
                   {{0, {{kRunning, kOn}, {kVolume, 0.1}}},
                    {2, {{kVolume, 0.2}}},
                    {2.25, {{kVolume, 0.3}}},
                    {5.25, {{kRunning, kOff}}}},
                   {"2@0.1", "3@0.3"}},
        StreamCase{"TimesGoBack", {{10, {{kRunning, kOn}, {kVolume, 0.5}}}, {2, {{kRunning, kOff}}}}, {}}),
    [](const auto& tested) { return tested.param.name; });

TEST_F(VolumeMessagesTest, ASummaryHoldsTheContextOfTheEndingInterval) {
  const auto summaries = summariesOf(stream({{0,
                                              {{kRunning, kOn},
                                               {kVolume, 0.3},
                                               {"active_devices", "Speaker"},
                                               {"session_selected_format", "48 kHz"},
                                               {"mFormatID", "lpcm"},
                                               {"mChannelsPerFrame", 2},
                                               {"ringerstate", true}}},
                                             {42, {{kRunning, kOff}, {"mFormatID", "later"}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  EXPECT_EQ(summaries[0]->category, 14U);
  EXPECT_EQ(summaries[0]->type, 11);
  EXPECT_EQ(
      summaries[0]->message.text(),
      R"({"session_selected_format":"48 kHz","mFormatID":"lpcm","active_devices":"Speaker",)"
      R"("HostApplicationDisplayID":"com.orvane.player","QMSessionVolume":0.3,)"
      R"("QMSessionVolumeBucketed":"0.3125","play_seconds":42.0,"spatial-audio-accessory-feature":false,)"
      R"("spatializationEnabled":false,"ringerstate":true,"mChannelsPerFrame":2,"play_secondsBucketed":"30",)"
      R"("msgidx":1,"msgcnt":1})");
}

TEST_F(VolumeMessagesTest, ASummaryKnowsItsStretchBesideItsPayload) {
  const auto summaries = summariesOf(
      stream({{1, {{kRunning, kOn}, {kVolume, 0.5}}}, {3, {{kVolume, 0.8}}}, {10.5, {{kRunning, kOff}}}}));
  ASSERT_THAT(summaries, SizeIs(2));
  EXPECT_EQ(summaries[0]->details.stretch(), (TimeStretch{1.0, 3.0}));
  EXPECT_EQ(summaries[1]->details.stretch(), (TimeStretch{3.0, 10.5}));
}

TEST_F(VolumeMessagesTest, UnknownValuesHaveTheirDefaults) {
  const auto summaries = summariesOf(stream({{0, {{kRunning, kOn}, {kVolume, 1}}}, {1, {{kRunning, kOff}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  const ValueMap& summary = summaries[0]->message;
  EXPECT_EQ(summary.text("session_selected_format"), "unknown");
  EXPECT_EQ(summary.text("active_devices"), "unknown");
  EXPECT_EQ(summary.text("mFormatID"), "unknown");
  EXPECT_EQ(summary.integer("mChannelsPerFrame"), -1);
  EXPECT_EQ(*summary.find("ringerstate"), Value(false));
  EXPECT_EQ(summary.text("QMSessionVolumeBucketed"), "1.0");
  EXPECT_EQ(summary.text("play_secondsBucketed"), "1");
}

TEST_F(VolumeMessagesTest, SummariesAreNumberedAndCounted) {
  expectNumbersAndACount(
      {{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {3, {{kVolume, 0.8}}}, {10, {{kRunning, kOff}}}});
}

TEST_F(VolumeMessagesTest, PlaySecondsHaveSinglePrecision) {
  expectSinglePrecision({{kRunning, kOn}, {kVolume, 0.5}}, {{kRunning, kOff}}, "play_seconds");
}

TEST_F(VolumeMessagesTest, WithoutAProcessThereIsNoSummary) {
  const TWReportingSessionVolumeMessagesWorker worker(session);
  EXPECT_THAT(worker.createVolumeMessages(
                  stream({{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {10, {{kRunning, kOff}}}}), nullptr, 0.5),
              IsEmpty());
}

TEST_F(VolumeMessagesTest, WithoutTimesThereIsNoSummary) {
  expectNoSummaryWithoutTimes({{kRunning, kOn}, {kVolume, 0.5}}, {{kRunning, kOff}});
}

TEST_F(VolumeMessagesTest, AnOpenIntervalInThePreviousValuesYieldsNoSummaryByItself) {
  session->addPreviousValues({{kRunning, kOn}, {kVolume, 0.5}, {"twreporting_timestamp", 0.0}});
  EXPECT_THAT(shortFormsOf({{10, {{kRunning, kOff}}}}), IsEmpty());
}

TEST_F(VolumeMessagesTest, TheWalkBeginsWithThePreviousValues) {
  session->addPreviousValues({{kVolume, 0.25}, {"active_devices", "Headphones"}});
  const auto summaries = summariesOf(stream({{0, {{kRunning, kOn}}}, {5, {{kRunning, kOff}}}}));
  ASSERT_THAT(summaries, SizeIs(1));
  EXPECT_EQ(summaries[0]->message.text("active_devices"), "Headphones");
  EXPECT_EQ(summaries[0]->message.number("QMSessionVolume"), 0.25);
}

TEST_F(VolumeMessagesTest, RapidSpatialMessagesAreMergedIntoTheFirst) {
  const auto messages = stream({{0, {{kRunning, kOn}, {kVolume, 0.5}}},
                                {2, {{"spatial-audio-accessory-feature", true}}},
                                {6, {{"spatializationEnabled", true}}},
                                {10, {{kRunning, kOff}}}});
  const auto summaries = summariesOf(messages);
  EXPECT_THAT(textsUnder("play_seconds", summaries), ElementsAre("6", "4"));  // at the merged message's time
  EXPECT_EQ(messages[1]->message.boolean("spatializationEnabled"), true);     // the session's own record
}

TEST_F(VolumeMessagesTest, SpatialMessagesFiveSecondsApartAreNot) {
  const auto summaries = summariesOf(stream({{0, {{kRunning, kOn}, {kVolume, 0.5}}},
                                             {2, {{"spatial-audio-accessory-feature", true}}},
                                             {7, {{"spatializationEnabled", true}}},
                                             {10, {{kRunning, kOff}}}}));
  EXPECT_THAT(textsUnder("play_seconds", summaries), ElementsAre("7", "3"));
}

TEST_F(VolumeMessagesTest, StopSendsTheSummariesIntoTheSession) {
  const ValueMap configuration{{"HostApplicationDisplayID", "com.orvane.player"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  session->start();
  const double now = test.clock.now();
  session->sendMessage(messageAt(now + 3, {{kRunning, kOff}}));
  session->sendMessage(messageAt(now, {{kRunning, kOn}, {kVolume, 0.5}}));
  session->stop();
  const auto events = test.metricon.eventsNamed("com.orvane.tonewerk.Volume.Summary");
  ASSERT_THAT(events, SizeIs(1));
  EXPECT_EQ(events[0].number("play_seconds"), 3.0);
  EXPECT_EQ(events[0].text("HostApplicationDisplayID"), "com.orvane.player");
  EXPECT_EQ(events[0].text("audiotag"), "VolumeSummary");
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDefault),
              ElementsAre("sending volume event for reporter 77"));
}

TEST_F(VolumeMessagesTest, AStopWithoutSummariesSendsAndLogsNothing) {
  expectNothingOfAStopWithoutSummaries();
}

TEST_F(VolumeMessagesTest, LogsWhatItDoesWithEachInterval) {
  test.log.clear();
  shortFormsOf({{0, {{kRunning, kOn}, {kVolume, 0.5}}}, {2, {{kVolume, 0.75}}}, {2.25, {{kRunning, kOff}}}});
  EXPECT_THAT(
      test.log.textsOf("twrr", LogLevel::kDebug),
      ElementsAre("entering createVolumeMessages createVolumeMessages",
                  "playingTime { func=createVolumeMessages, playingTime=2.000000, twTimestamp=2, "
                  "twTimestamp_double=2.000000, startTwTimestamp=0, startTwTimestamp_double=0.000000 }",
                  "added volume message { func=createVolumeMessages, action=add, count=1 }",
                  StartsWith("playingTime { func=createVolumeMessages, playingTime=0.250000,"),
                  "skipped volume message, too short { func=createVolumeMessages, action=skip, count=1 }"));
  expectDebugLinesOf("TWReportingSessionVolumeMessagesWorker");
}

RC_GTEST_FIXTURE_PROP(VolumeMessagesTest, SurvivesAnyStream, ()) {
  checkAnyStream(
      {kRunning, kVolume, "session_duration", "active_devices", "spatializationEnabled",
       "spatial-audio-accessory-feature", "ringerstate", "mFormatID", "session_selected_format", "other"},
      "play_seconds", [](const auto& messages) { mergeRapidSpatialMessages(messages, 5.0); },
      [](const TWReportingSessionMessage& summary) { RC_ASSERT(summary.message.size() == 14U); });
}

PlainWalk plainWalk() {
  return {.runningKey = kRunning,
          .open = PlainWalk::Open::kIgnored,
          .state = {{"session_selected_format", "unknown"},
                    {"active_devices", "unknown"},
                    {"mFormatID", "unknown"},
                    {"spatial-audio-accessory-feature", false},
                    {"spatializationEnabled", false},
                    {"ringerstate", false},
                    {"mChannelsPerFrame", -1}},
          .endsInterval =
              [](const ValueMap& state, const ValueMap& message) {
                return PlainWalk::changesText(state, message, "session_selected_format") ||
                       PlainWalk::changesText(state, message, "active_devices") ||
                       PlainWalk::changesNumber(state, message, "spatializationEnabled") ||
                       PlainWalk::changesNumber(state, message, "ringerstate") ||
                       PlainWalk::changesNumber(state, message, kVolume);
              },
          .summaryOf = [](const ValueMap& state, double seconds, int index) -> std::optional<ValueMap> {
            if (!state.contains(kVolume)) return std::nullopt;
            return ValueMap{
                {"session_selected_format", *state.find("session_selected_format")},
                {"mFormatID", *state.find("mFormatID")},
                {"active_devices", *state.find("active_devices")},
                {"HostApplicationDisplayID", "com.orvane.player"},
                {kVolume, *state.find(kVolume)},
                {"QMSessionVolumeBucketed",
                 *TWReportingUtilityBucketNumberToString(state.number(kVolume),
                                                         TWReportingUtilityBucketNumberToStringVolumes, 4)},
                {"play_seconds", PlainWalk::singlePrecision(seconds)},
                {"spatial-audio-accessory-feature", *state.find("spatial-audio-accessory-feature")},
                {"spatializationEnabled", *state.find("spatializationEnabled")},
                {"ringerstate", *state.find("ringerstate")},
                {"mChannelsPerFrame", *state.find("mChannelsPerFrame")},
                {"play_secondsBucketed", PlainWalk::bucketed(seconds)},
                {"msgidx", index}};
          }};
}

RC_GTEST_FIXTURE_PROP(VolumeMessagesTest, SummarisesLikeAWalkThatMergesEveryMessage, ()) {
  checkAgainst(plainWalk(),
               {kRunning, kRunning, kVolume, "session_duration", "active_devices", "spatializationEnabled",
                "spatial-audio-accessory-feature", "ringerstate", "mFormatID", "session_selected_format",
                "mChannelsPerFrame", "other"},
               5.0);
}

}  // namespace
}  // namespace tonewerk
