// SPDX-License-Identifier: Apache-2.0
#include "driver/TWReportingDriverUtility.h"

#include <gtest/gtest.h>

#include "driver/DriverTest.h"

namespace tonewerk {
namespace {

using namespace channels;
using ::testing::AllOf;
using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

const MemoryChanmeter::Group kSpeaker{.group = "Speaker"};
const MemoryChanmeter::Group kTx{.group = "Tx"};

class TWReportingDriverUtilityTest : public DriverTest {
 protected:
  TWReportingDriverUtilityTest() {
    chanmeter.setRecords({simple(speaker("volts"), 10), simple(keyIn("Tx", "frames"), 100)});
  }

  // One channel for each of the nine subscriptions. Two of them are found by their subgroup only.
  static std::vector<ChanmeterRecord> oneOfEach(std::int64_t value) {
    std::vector<ChanmeterRecord> records;
    for (const char* group : {"OrvaneAE2MCA", "Speaker", "StateTransitionTimes_ms", "Rx", "Tx", "pdm"}) {
      records.push_back(simple(keyIn(group, "n"), value));
    }
    for (const char* subGroup : {"MCA", "Pellan2"}) {
      records.push_back(
          simple({.driver = "Amp", .group = "other", .subGroup = subGroup, .name = "n"}, value));
    }
    records.push_back(simple({.driver = "Amp", .group = "Haptics", .subGroup = "Stats", .name = "n"}, value));
    return records;
  }

  // Returns what a report sends when the channels change to `later` after the snapshot.
  std::vector<Sent> report(const std::vector<ChanmeterRecord>& later) {
    const TWReportingDriverUtility utility;
    const auto snapshot = utility.getSnapShot();
    test.log.clear();
    chanmeter.setRecords(later);
    const auto session = makeSession();
    utility.sendDriverLogsForSession(session.get(), &snapshot);
    return sentTo(*session);
  }

  static std::vector<std::string> descriptionsOf(const TWReportingDriverUtility& utility) {
    std::vector<std::string> descriptions;
    for (const auto& one : utility.ioChannelSubscriptions()) descriptions.push_back(one.driver.description());
    return descriptions;
  }
};

// Subscribing to channels.

TEST_F(TWReportingDriverUtilityTest, SubscribesToNineDriversInOrder) {
  chanmeter.setRecords(oneOfEach(1));
  const TWReportingDriverUtility utility;
  EXPECT_THAT(descriptionsOf(utility), ElementsAre("OrvaneAE2MCA-(null)", "Speaker-(null)", "(null)-MCA",
                                                   "Haptics-Stats", "StateTransitionTimes_ms-(null)",
                                                   "Rx-(null)", "Tx-(null)", "(null)-Pellan2", "pdm-(null)"));
  for (const auto& one : utility.ioChannelSubscriptions()) {
    EXPECT_NE(one.subscription, nullptr);
    EXPECT_EQ(chanmeter.channelCount(*one.subscribedChannels), 1);
  }
}

TEST_F(TWReportingDriverUtilityTest, LogsItsSubscriptionsAndTheGroupsWithoutChannels) {
  const TWReportingDriverUtility utility;
  EXPECT_THAT(logged(LogLevel::kInfo),
              ElementsAre("creating chanmetering driver utility",
                          "couldn't find any channels for driver group OrvaneAE2MCA-(null)",
                          "subscribed to group group Speaker-(null)",
                          "couldn't find any channels for driver group (null)-MCA",
                          "couldn't find any channels for driver group Haptics-Stats",
                          "couldn't find any channels for driver group StateTransitionTimes_ms-(null)",
                          "couldn't find any channels for driver group Rx-(null)",
                          "subscribed to group group Tx-(null)",
                          "couldn't find any channels for driver group (null)-Pellan2",
                          "couldn't find any channels for driver group pdm-(null)"));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
  EXPECT_THAT(test.log.linesOf("twrd").front().message, StartsWith(" TWReportingDriverUtility:"));
}

TEST_F(TWReportingDriverUtilityTest, AnEmptyGroupIsNotSubscribedTo) {
  const TWReportingDriverUtility utility;
  EXPECT_THAT(chanmeter.calls(), Not(Contains("createSubscription Rx-(null)")));
}

TEST_F(TWReportingDriverUtilityTest, ADriverWhoseChannelsCannotBeCopiedIsLoggedAndLeftOut) {
  chanmeter.fail(Operation::kCopyChannels, {.code = -536870206}, kSpeaker);
  const TWReportingDriverUtility utility;
  EXPECT_THAT(descriptionsOf(utility), ElementsAre("Tx-(null)"));
  EXPECT_THAT(logged(LogLevel::kError),
              ElementsAre("error -536870206 getting channels for driver Speaker-(null)"));
  EXPECT_THAT(logged(LogLevel::kInfo),
              Not(Contains("couldn't find any channels for driver group Speaker-(null)")));
}

TEST_F(TWReportingDriverUtilityTest, ADriverWithoutChannelSetAndWithoutErrorIsLeftOutSilently) {
  chanmeter.fail(Operation::kCopyChannels, {}, kSpeaker);
  const TWReportingDriverUtility utility;
  EXPECT_THAT(descriptionsOf(utility), ElementsAre("Tx-(null)"));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, AnErrorThatComesWithAChannelSetIsLoggedAndTheDriverSubscribed) {
  chanmeter.fail(Operation::kCopyChannels, {.code = 7, .returnsResult = true}, kSpeaker);
  const TWReportingDriverUtility utility;
  EXPECT_THAT(descriptionsOf(utility), ElementsAre("Speaker-(null)", "Tx-(null)"));
  EXPECT_THAT(logged(LogLevel::kError), ElementsAre("error 7 getting channels for driver Speaker-(null)"));
}

TEST_F(TWReportingDriverUtilityTest, ASubscriptionFailureDoesNotLogTheChannelSetsError) {
  chanmeter.fail(Operation::kCopyChannels, {.code = 7, .returnsResult = true}, kSpeaker);
  chanmeter.fail(Operation::kCreateSubscription, {}, kSpeaker);
  const TWReportingDriverUtility utility;
  EXPECT_THAT(logged(LogLevel::kError), ElementsAre("error 7 getting channels for driver Speaker-(null)"));
}

TEST_F(TWReportingDriverUtilityTest, ASubscriptionThatFailsIsLoggedAndDropped) {
  chanmeter.fail(Operation::kCreateSubscription, {.code = 9}, kTx);
  const TWReportingDriverUtility utility;
  EXPECT_THAT(descriptionsOf(utility), ElementsAre("Speaker-(null)"));
  EXPECT_THAT(logged(LogLevel::kError), ElementsAre("error 9 creating subscription for Tx-(null)"));
  EXPECT_THAT(logged(LogLevel::kInfo), Not(Contains("subscribed to group group Tx-(null)")));
}

TEST_F(TWReportingDriverUtilityTest, ASubscriptionThatFailsWithoutErrorIsDroppedSilently) {
  chanmeter.fail(Operation::kCreateSubscription, {}, kTx);
  const TWReportingDriverUtility utility;
  EXPECT_THAT(descriptionsOf(utility), ElementsAre("Speaker-(null)"));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, AHandleWithoutChannelsAndChannelsWithoutHandleAreNoSubscriptions) {
  chanmeter.fail(Operation::kSubscribedChannels, {.code = 3}, kSpeaker);
  chanmeter.fail(Operation::kSubscriptionHandle, {.code = 4}, kTx);
  const TWReportingDriverUtility utility;
  EXPECT_THAT(utility.ioChannelSubscriptions(), IsEmpty());
  EXPECT_THAT(logged(LogLevel::kError), ElementsAre("error 3 creating subscription for Speaker-(null)",
                                                    "error 4 creating subscription for Tx-(null)"));
}

TEST_F(TWReportingDriverUtilityTest, AnErrorThatComesWithASubscriptionIsNotLogged) {
  chanmeter.fail(Operation::kCreateSubscription, {.code = 9, .returnsResult = true});
  const TWReportingDriverUtility utility;
  EXPECT_THAT(utility.ioChannelSubscriptions(), SizeIs(2));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, WithoutAnyDriverSnapshotsAreEmptyAndAReportSendsNothing) {
  chanmeter.setRecords({simple(keyIn("Elsewhere", "n"), 1)});
  const TWReportingDriverUtility utility;
  EXPECT_THAT(utility.ioChannelSubscriptions(), IsEmpty());
  const auto snapshot = utility.getSnapShot();
  EXPECT_THAT(snapshot, IsEmpty());
  const auto session = makeSession();
  utility.sendDriverLogsForSession(session.get(), &snapshot);
  EXPECT_THAT(sentTo(*session), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, WhenAllNineFailTheListIsEmptyAndEachIsLogged) {
  chanmeter.fail(Operation::kCopyChannels, {.code = 1});
  const TWReportingDriverUtility utility;
  EXPECT_THAT(utility.ioChannelSubscriptions(), IsEmpty());
  EXPECT_THAT(logged(LogLevel::kError),
              AllOf(SizeIs(9), Each(StartsWith("error 1 getting channels for driver "))));
}

TEST_F(TWReportingDriverUtilityTest, ADriverThatAppearsLaterIsNotSampled) {
  const TWReportingDriverUtility utility;
  chanmeter.setRecords(oneOfEach(1));
  EXPECT_THAT(utility.getSnapShot(), SizeIs(2));
}

// Taking the snapshot.

TEST_F(TWReportingDriverUtilityTest, ASnapshotHoldsEachDriversSamplesUnderItsDescription) {
  const TWReportingDriverUtility utility;
  test.log.clear();
  chanmeter.clearCalls();
  const auto snapshot = utility.getSnapShot();
  ASSERT_THAT(snapshot, SizeIs(2));
  EXPECT_TRUE(snapshot.contains("Speaker-(null)"));
  EXPECT_TRUE(snapshot.contains("Tx-(null)"));
  EXPECT_THAT(chanmeter.calls(), ElementsAre("createSamples Speaker-(null)", "createSamples Tx-(null)"));
  EXPECT_THAT(logged(LogLevel::kInfo),
              ElementsAre("sampling driver Speaker-(null)", "sampling driver Tx-(null)"));
}

TEST_F(TWReportingDriverUtilityTest, ADriverThatCannotBeSampledIsLoggedAndNotInTheSnapshot) {
  const TWReportingDriverUtility utility;
  chanmeter.fail(Operation::kCreateSamples, {.code = 5}, kSpeaker);
  const auto snapshot = utility.getSnapShot();
  ASSERT_THAT(snapshot, SizeIs(1));
  EXPECT_TRUE(snapshot.contains("Tx-(null)"));
  EXPECT_THAT(logged(LogLevel::kError), ElementsAre("ChanmeterCreateSamples error 5"));
}

TEST_F(TWReportingDriverUtilityTest, MissingSamplesWithoutAnErrorAreLeftOutSilently) {
  const TWReportingDriverUtility utility;
  chanmeter.fail(Operation::kCreateSamples, {}, kSpeaker);
  EXPECT_THAT(utility.getSnapShot(), SizeIs(1));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, AnErrorThatComesWithSamplesIsNotLogged) {
  const TWReportingDriverUtility utility;
  chanmeter.fail(Operation::kCreateSamples, {.code = 5, .returnsResult = true});
  EXPECT_THAT(utility.getSnapShot(), SizeIs(2));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, SamplesLiveAsLongAsTheirSnapshot) {
  const TWReportingDriverUtility utility;
  {
    const auto snapshot = utility.getSnapShot();
    EXPECT_EQ(chanmeter.heldSamples(), 2U);
  }
  EXPECT_EQ(chanmeter.heldSamples(), 0U);
}

// Sending the report.

TEST_F(TWReportingDriverUtilityTest, AReportSendsWhatChangedSinceTheSnapshot) {
  EXPECT_THAT(
      report({simple(speaker("volts"), 12), simple(keyIn("Tx", "frames"), 148)}),
      ElementsAre(Sent{kChanmetering, 16, {{"Amp_Speaker_Simple_volts", 2}, {"Amp_Tx_Simple_frames", 48}}}));
  EXPECT_THAT(logged(LogLevel::kInfo), ElementsAre("getting latest samples", "done getting latest samples",
                                                   "getting latest samples", "done getting latest samples"));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, AReportCoversAllNineDrivers) {
  chanmeter.setRecords(oneOfEach(1));
  EXPECT_THAT(report(oneOfEach(3)), ElementsAre(Sent{kChanmetering,
                                                     16,
                                                     {{"Amp_OrvaneAE2MCA_Simple_n", 2},
                                                      {"Amp_Speaker_Simple_n", 2},
                                                      {"Amp_other_MCA_Simple_n", 2},
                                                      {"Amp_Haptics_Stats_Simple_n", 2},
                                                      {"Amp_StateTransitionTimesms_Simple_n", 2},
                                                      {"Amp_Rx_Simple_n", 2},
                                                      {"Amp_Tx_Simple_n", 2},
                                                      {"Amp_other_Pellan2_Simple_n", 2},
                                                      {"Amp_pdm_Simple_n", 2}}}));
}

TEST_F(TWReportingDriverUtilityTest, AReportSendsSimpleHistogramAndStateInThisOrder) {
  const auto records = [](std::int64_t more) {
    return std::vector<ChanmeterRecord>{
        states(speaker("s"), {{"on", 1, static_cast<std::uint64_t>(100 + more), 1}}),
        histogram(keyIn("Rx", "h"), {{0, 10, 5 + more}}), simple(keyIn("pdm", "v"), 10 + more)};
  };
  chanmeter.setRecords(records(0));
  EXPECT_THAT(
      report(records(7)),
      ElementsAre(Sent{kChanmetering, 16, {{"Amp_pdm_Simple_v", 7}}},
                  Sent{kChanmetering,
                       17,
                       {{"Amp_Rx_Histogram_h", "count=1,lower=0,upper=10,min=0,max=0,unit=(null)::0-10:7"}}},
                  Sent{kChanmetering,
                       18,
                       {{"Amp_Speaker_State_s", "name:on,transition:0,residency:7,duty_cycle:1.000000;"}}}));
}

TEST_F(TWReportingDriverUtilityTest, EmptyMapsAreNotSent) {
  const std::vector<ChanmeterRecord> records = {simple(speaker("v"), 5),
                                                histogram(speaker("h"), {{0, 10, 5}})};
  chanmeter.setRecords(records);
  EXPECT_THAT(report(records), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, AStateChannelIsReportedAlsoWhenNothingChanged) {
  const std::vector<ChanmeterRecord> records = {states(speaker("s"), {{"on", 1, 100, 1}})};
  chanmeter.setRecords(records);
  EXPECT_THAT(report(records), ElementsAre(Sent{kChanmetering, 18, {{"Amp_Speaker_State_s", ""}}}));
}

TEST_F(TWReportingDriverUtilityTest, AReportWithoutSnapshotSendsNothingButTakesAndReleasesSamples) {
  const TWReportingDriverUtility utility;
  test.log.clear();
  chanmeter.clearCalls();
  const auto session = makeSession();
  utility.sendDriverLogsForSession(session.get(), nullptr);
  EXPECT_THAT(sentTo(*session), IsEmpty());
  EXPECT_THAT(chanmeter.calls(), ElementsAre("createSamples Speaker-(null)", "createSamples Tx-(null)"));
  EXPECT_EQ(chanmeter.heldSamples(), 0U);
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, AReportWithoutASessionSendsNothing) {
  const TWReportingDriverUtility utility;
  const auto snapshot = utility.getSnapShot();
  chanmeter.setRecords({simple(speaker("volts"), 12)});
  utility.sendDriverLogsForSession(nullptr, &snapshot);
  EXPECT_EQ(chanmeter.heldSamples(), 2U) << "the snapshot's own";
}

TEST_F(TWReportingDriverUtilityTest, AReportDoesNotChangeTheSnapshot) {
  const TWReportingDriverUtility utility;
  const auto snapshot = utility.getSnapShot();
  chanmeter.setRecords({simple(speaker("volts"), 12)});
  for (int time = 0; time < 2; ++time) {
    const auto session = makeSession();
    utility.sendDriverLogsForSession(session.get(), &snapshot);
    EXPECT_THAT(sentTo(*session), ElementsAre(Sent{kChanmetering, 16, {{"Amp_Speaker_Simple_volts", 2}}}));
  }
  EXPECT_EQ(chanmeter.heldSamples(), 2U) << "the snapshot's own";
}

TEST_F(TWReportingDriverUtilityTest, ADriverWhoseLatestSamplesFailIsLoggedAndSkippedAlone) {
  chanmeter.fail(Operation::kCreateSamples, {.code = 5}, kSpeaker);
  EXPECT_THAT(report({simple(speaker("volts"), 12), simple(keyIn("Tx", "frames"), 101)}),
              ElementsAre(Sent{kChanmetering, 16, {{"Amp_Tx_Simple_frames", 1}}}));
  EXPECT_THAT(test.log.textsOf("twrd"), ElementsAre("getting latest samples", "done getting latest samples",
                                                    "ChanmeterCreateSamples error 5",
                                                    "getting latest samples", "done getting latest samples"));
}

TEST_F(TWReportingDriverUtilityTest, MissingLatestSamplesWithoutAnErrorAreSkippedSilently) {
  chanmeter.fail(Operation::kCreateSamples, {}, kSpeaker);
  EXPECT_THAT(report({simple(speaker("volts"), 12), simple(keyIn("Tx", "frames"), 101)}), SizeIs(1));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, ADeltaThatFailsIsLoggedWithTheSamplesTextAndSkippedAlone) {
  chanmeter.fail(Operation::kCreateSamplesDelta, {.code = 6}, kSpeaker);
  EXPECT_THAT(report({simple(speaker("volts"), 12), simple(keyIn("Tx", "frames"), 101)}),
              ElementsAre(Sent{kChanmetering, 16, {{"Amp_Tx_Simple_frames", 1}}}));
  EXPECT_THAT(logged(LogLevel::kError), ElementsAre("ChanmeterCreateSamples error 6"));
}

TEST_F(TWReportingDriverUtilityTest, AMissingDeltaWithoutAnErrorIsSkippedSilently) {
  chanmeter.fail(Operation::kCreateSamplesDelta, {}, kSpeaker);
  EXPECT_THAT(report({simple(speaker("volts"), 12), simple(keyIn("Tx", "frames"), 101)}), SizeIs(1));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, ADriverThatTheSnapshotLacksGetsADeltaAgainstNothing) {
  const TWReportingDriverUtility utility;
  chanmeter.fail(Operation::kCreateSamples, {.code = 5}, kSpeaker);
  const auto snapshot = utility.getSnapShot();
  chanmeter.stopFailing();
  test.log.clear();
  chanmeter.setRecords({simple(speaker("volts"), 12), simple(keyIn("Tx", "frames"), 101)});
  const auto session = makeSession();
  utility.sendDriverLogsForSession(session.get(), &snapshot);
  EXPECT_THAT(sentTo(*session), ElementsAre(Sent{kChanmetering, 16, {{"Amp_Tx_Simple_frames", 1}}}));
  EXPECT_THAT(chanmeter.calls(), Contains("createSamplesDelta Speaker-(null)"));
  EXPECT_THAT(logged(LogLevel::kError), ElementsAre("ChanmeterCreateSamples error 1"));
}

TEST_F(TWReportingDriverUtilityTest, SamplesOfFormatsWithoutValuesAreDroppedWithADebugLine) {
  const std::vector<ChanmeterRecord> records = {
      ofFormat(speaker("a"), 4), ofFormat({.group = "Haptics", .subGroup = "Stats", .name = "b"}, 0),
      ofFormat({.subGroup = "MCA"}, 4)};
  chanmeter.setRecords(records);
  EXPECT_THAT(report(records), IsEmpty());
  EXPECT_THAT(logged(LogLevel::kDebug),
              ElementsAre("Dropping sample of type : 4 for group : Speaker subgroup : (null)",
                          "Dropping sample of type : 4 for group : (null) subgroup : MCA",
                          "Dropping sample of type : 0 for group : Haptics subgroup : Stats"));
  EXPECT_THAT(logged(LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingDriverUtilityTest, SamplesOfFormatsAboveFourAreNotSupported) {
  const std::vector<ChanmeterRecord> records = {ofFormat(speaker("a"), 7), ofFormat(speaker("b"), 5),
                                                ofFormat({.subGroup = "MCA"}, 255)};
  chanmeter.setRecords(records);
  EXPECT_THAT(report(records), IsEmpty());
  EXPECT_THAT(logged(LogLevel::kError),
              ElementsAre("The ChanmeteringFormat 7 is not supported group : Speaker subgroup : (null)",
                          "The ChanmeteringFormat 5 is not supported group : Speaker subgroup : (null)",
                          "The ChanmeteringFormat 255 is not supported group : (null) subgroup : MCA"));
}

TEST_F(TWReportingDriverUtilityTest, SamplesThatAreDroppedDoNotEndTheReport) {
  const auto records = [](std::int64_t value) {
    return std::vector<ChanmeterRecord>{ofFormat(speaker("a"), 7), ofFormat(speaker("b"), 0),
                                        simple(speaker("volts"), value)};
  };
  chanmeter.setRecords(records(1));
  EXPECT_THAT(report(records(4)), ElementsAre(Sent{kChanmetering, 16, {{"Amp_Speaker_Simple_volts", 3}}}));
}

TEST_F(TWReportingDriverUtilityTest, AChannelOfTwoSubscribedGroupsIsReportedOnceWithItsOneKey) {
  const ChanmeterKey both{.driver = "Amp", .group = "Speaker", .subGroup = "MCA", .name = "n"};
  chanmeter.setRecords({simple(both, 1)});
  EXPECT_THAT(report({simple(both, 3)}),
              ElementsAre(Sent{kChanmetering, 16, {{"Amp_Speaker_MCA_Simple_n", 2}}}));
}

}  // namespace
}  // namespace tonewerk
