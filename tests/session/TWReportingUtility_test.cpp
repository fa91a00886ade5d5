// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingUtility.h"

#include <gtest/gtest.h>
#include <limits>
#include <set>
#include <thread>
#include <vector>

#include "platform/SerialQueue.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class TWReportingUtilityTest : public ReportingTest {};

// The work queue.

TEST_F(TWReportingUtilityTest, OtherThreadsAreNotOnTheWorkQueueOnceItExists) {
  const auto isOnQueueElsewhere = [] {
    bool is = false;
    std::thread([&] { is = TWReportingUtilityIsOnReportingServerQueue(); }).join();
    return is;
  };
  EXPECT_TRUE(isOnQueueElsewhere());
  TWReportingUtilityGetReportingServerQueue();
  EXPECT_FALSE(isOnQueueElsewhere());
  EXPECT_TRUE(TWReportingUtilityIsOnReportingServerQueue());
}

// Names of categories.

TEST_F(TWReportingUtilityTest, NamesEveryBaseCategory) {
  const std::vector<std::string> texts{
      "Generic",     "Record", "Input",         "Playback",     "Output", "PlaybackAndRecord",
      "IO",          "Setup",  "ClientRequest", "RouteChange",  "Error",  "Chanmetering",
      "Performance", "Volume", "Gather",        "HearingHealth"};
  for (AudioEventCategory category = 1; category <= 16; ++category) {
    EXPECT_EQ(TWReportingUtilityCategoryString(category), texts[category - 1]);
    EXPECT_EQ(TWReportingUtilityCategoryFromString(texts[category - 1]), category);
  }
}

TEST_F(TWReportingUtilityTest, PutsTheEventDomainBeforeTheBaseCategory) {
  EXPECT_EQ(TWReportingUtilityCategoryString(0x04000001), "MIDI_Generic");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x08000002), "Session_Record");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x10000003), "DSP_Input");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x20000004), "HAL_Playback");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x40000005), "Routing_Output");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x80000010), "Toolbox_HearingHealth");
}

TEST_F(TWReportingUtilityTest, ADomainWithoutANameGivesOnlyAnUnderscore) {
  EXPECT_EQ(TWReportingUtilityCategoryString(0x00030001), "_Generic");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x01000003), "_Input");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x0C000003), "_Input");  // two domains at once have no name
  EXPECT_EQ(TWReportingUtilityCategoryString(0xFFFFFFFE), "_Undefined");
}

TEST_F(TWReportingUtilityTest, CallsABaseOutsideTheTableUndefined) {
  EXPECT_EQ(TWReportingUtilityCategoryString(0x00000000), "Undefined");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x00000011), "Undefined");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x0000FFFF), "Undefined");
  EXPECT_EQ(TWReportingUtilityCategoryString(0x40000000), "Routing_Undefined");
  EXPECT_EQ(TWReportingUtilityCategoryString(0xFFFFFFFF), "Undefined");
}

TEST_F(TWReportingUtilityTest, DoesNotReadDomainsOrOtherLetterCase) {
  EXPECT_EQ(TWReportingUtilityCategoryFromString("HAL_Playback"), 0xFFFFFFFF);
  EXPECT_EQ(TWReportingUtilityCategoryFromString("Playback"), 4U);
  EXPECT_EQ(TWReportingUtilityCategoryFromString("playback"), 0xFFFFFFFF);
  EXPECT_EQ(TWReportingUtilityCategoryFromString("Undefined"), 0xFFFFFFFF);
  EXPECT_EQ(TWReportingUtilityCategoryFromString("Unknown"), 0xFFFFFFFF);
  EXPECT_EQ(TWReportingUtilityCategoryFromString(""), 0xFFFFFFFF);
}

// Names of types.

TEST_F(TWReportingUtilityTest, NamesEveryTypeAndReadsItBack) {
  const std::vector<std::string> texts{"Generic",
                                       "Start",
                                       "Stop",
                                       "Activate",
                                       "Deactivate",
                                       "Setup",
                                       "Error",
                                       "IssueDetector",
                                       "Energybook",
                                       "ModulonUsage",
                                       "MIDIDriver",
                                       "Summary",
                                       "HeadphoneAudioExposure",
                                       "AudioExposure",
                                       "Listeningenhancement",
                                       "Pellix",
                                       "Simple",
                                       "Histogram",
                                       "State"};
  for (std::size_t type = 0; type < texts.size(); ++type) {
    EXPECT_EQ(TWReportingUtilityTypeString(static_cast<AudioEventType>(type)), texts[type]);
    EXPECT_EQ(TWReportingUtilityTypeFromString(texts[type]), type);
  }
}

TEST_F(TWReportingUtilityTest, NamesMemoryLogButDoesNotReadItBack) {
  EXPECT_EQ(TWReportingUtilityTypeString(19), "MemoryLog");
  EXPECT_EQ(TWReportingUtilityTypeFromString("MemoryLog"), 0);
}

TEST_F(TWReportingUtilityTest, ReadsAnUnknownTypeAsGeneric) {
  EXPECT_EQ(TWReportingUtilityTypeFromString("start"), 0);
  EXPECT_EQ(TWReportingUtilityTypeFromString("ListeningEnhancement"), 0);
  EXPECT_EQ(TWReportingUtilityTypeFromString(""), 0);
}

TEST_F(TWReportingUtilityTest, CallsATypeOutsideTheTableGenericAndTheLastUnknown) {
  EXPECT_EQ(TWReportingUtilityTypeString(20), "Generic");
  EXPECT_EQ(TWReportingUtilityTypeString(65534), "Generic");
  EXPECT_EQ(TWReportingUtilityTypeString(65535), "Unknown");
  EXPECT_EQ(TWReportingUtilityTypeFromString("Unknown"), 65535);
}

// Names of services.

TEST_F(TWReportingUtilityTest, NamesEveryServiceAndReadsItBack) {
  const std::vector<std::string> names{
      "generic",         "vocia",         "telephony",        "haptics",          "alarms", "standalone",
      "soundautoconfig", "longformaudio", "nonlongformaudio", "audiodeviceusage", "alerts", "test",
      "apiusage",        "systemsounds"};
  for (std::size_t type = 0; type < names.size(); ++type) {
    EXPECT_EQ(TWReportingUtilityGenerateServiceNameFromServiceType(static_cast<AudioServiceType>(type)),
              names[type]);
    EXPECT_EQ(TWReportingUtilityGenerateServiceTypeFromServiceName(names[type]), type);
  }
}

TEST_F(TWReportingUtilityTest, CallsAServiceOutsideTheTableUnknown) {
  EXPECT_EQ(TWReportingUtilityGenerateServiceNameFromServiceType(14), "unknown");
  EXPECT_EQ(TWReportingUtilityGenerateServiceNameFromServiceType(65535), "unknown");
  EXPECT_EQ(TWReportingUtilityGenerateServiceTypeFromServiceName("unknown"), 65535);
  EXPECT_EQ(TWReportingUtilityGenerateServiceTypeFromServiceName("Telephony"), 65535);
}

TEST_F(TWReportingUtilityTest, ABTestModeIsOnForCategoriesWithADomain) {
  EXPECT_FALSE(TWReportingUtilityIsABTestModeOn(0));
  EXPECT_FALSE(TWReportingUtilityIsABTestModeOn(0xFFFF));
  EXPECT_TRUE(TWReportingUtilityIsABTestModeOn(0x10000));
  EXPECT_TRUE(TWReportingUtilityIsABTestModeOn(0xFFFFFFFE));
  EXPECT_FALSE(TWReportingUtilityIsABTestModeOn(0xFFFFFFFF));
}

TEST_F(TWReportingUtilityTest, AReporterIdentifierIsItsSessionIdentifier) {
  for (const ReporterID identifier :
       {ReporterID{0}, ReporterID{-5}, std::numeric_limits<ReporterID>::max()}) {
    EXPECT_EQ(TWReportingUtilityExtractSessionIDFromReporterID(identifier), identifier);
  }
}

TEST_F(TWReportingUtilityTest, TheMinimumPlayingTimeIsHalfASecondForEveryService) {
  for (const int service : {0, 7, 13, 65535}) {
    EXPECT_EQ(TWReportingUtilityVolumeMinimumPlayingTime(static_cast<AudioServiceType>(service)), 0.5);
  }
}

TEST_F(TWReportingUtilityTest, AlwaysSendsMessages) { EXPECT_TRUE(TWReportingUtilityShouldSendMessage()); }

// Dates.

TEST_F(TWReportingUtilityTest, StampsACopyWithTheThreeTimes) {
  test.clock.setNow(1'700'000'000.25);
  test.system.setUptime(1234.5);
  test.processes.setProcessorTime(1'500'600);
  const ValueMap original{{"a", 1}, {"systemuptime_sec", "old"}};

  const ValueMap stamped = TWReportingUtilityAddDates(original);

  EXPECT_EQ(*stamped.find("twreporting_timestamp")->asDouble(), 1'700'000'000.25);
  EXPECT_EQ(*stamped.find("systemuptime_sec")->asInteger(), 1235);
  EXPECT_EQ(*stamped.find("processuptime_ms")->asInteger(), 1501);
  EXPECT_EQ(stamped.integer("a"), 1);
  EXPECT_EQ(original.size(), 2U);
  EXPECT_EQ(original.text("systemuptime_sec"), "old");
}

TEST_F(TWReportingUtilityTest, StampsNoUptimesInARecovery) {
  test.clock.setNow(1'700'000'000.25);
  context->journal().play({});
  EXPECT_EQ(TWReportingUtilityAddDates({}), ValueMap({{"twreporting_timestamp", 1'700'000'000.25}}));
  context->journal().endRecovery();
  EXPECT_EQ(TWReportingUtilityAddDates({}).size(), 3U);
}

TEST_F(TWReportingUtilityTest, ProcessorTimeIsConvertedInSinglePrecision) {
  test.processes.setProcessorTime(100'000'001'000);  // a double would give 100000001
  EXPECT_EQ(TWReportingUtilityAddDates({}).integer("processuptime_ms"), 100'000'000);
}

// Numbers.

TEST_F(TWReportingUtilityTest, RoundsHalvesAwayFromZero) {
  EXPECT_EQ(TWReportingUtilityRoundWithPlaces(2.5, 0), 3.0);
  EXPECT_EQ(TWReportingUtilityRoundWithPlaces(-2.5, 0), -3.0);
  EXPECT_EQ(TWReportingUtilityRoundWithPlaces(0.125, 2), 0.13);
  EXPECT_EQ(TWReportingUtilityRoundWithPlaces(1234.0, -2), 1200.0);
  EXPECT_EQ(TWReportingUtilityRoundWithPlaces(1250.0, -2), 1300.0);
}

std::string bucket(double value, const std::vector<double>& buckets, int fractionDigits) {
  return TWReportingUtilityBucketNumberToString(value, buckets, fractionDigits).value_or("(none)");
}

TEST_F(TWReportingUtilityTest, TakesTheNearestBucket) {
  EXPECT_EQ(bucket(7, {0, 5, 10, 20}, 1), "5.0");
  EXPECT_EQ(bucket(-100, {0, 5, 10, 20}, 1), "0.0");
  EXPECT_EQ(bucket(100, {0, 5, 10, 20}, 1), "20.0");
}

TEST_F(TWReportingUtilityTest, TakesTheLaterOfTwoEquallyNearBuckets) {
  EXPECT_EQ(bucket(7.5, {5, 10}, 0), "10");
}

TEST_F(TWReportingUtilityTest, StopsAtTheFirstFartherBucketEvenWhenTheyDescend) {
  EXPECT_EQ(bucket(1, {5, 20, 1}, 0), "5");
  EXPECT_EQ(bucket(21, {20, 10, 0}, 0), "20");
}

TEST_F(TWReportingUtilityTest, GivesNoBucketWithoutBuckets) {
  EXPECT_EQ(TWReportingUtilityBucketNumberToString(1, {}, 1), std::nullopt);
}

TEST_F(TWReportingUtilityTest, WritesABucketWithOneUpToTheGivenFractionDigits) {
  EXPECT_EQ(bucket(0.3, {0.25, 0.3125}, 4), "0.3125");
  EXPECT_EQ(bucket(0.5, {0.5}, 4), "0.5");
  EXPECT_EQ(bucket(1, {1}, 4), "1.0");
  EXPECT_EQ(bucket(18000, {18000}, 0), "18000");
  EXPECT_EQ(bucket(0.125, {0.125}, 2), "0.12");  // halves to even
  EXPECT_EQ(bucket(0.375, {0.375}, 2), "0.38");
  EXPECT_EQ(bucket(2.5, {2.5}, 0), "2");
}

TEST_F(TWReportingUtilityTest, VolumeBucketsAreSixteenthsAndTimesSeconds) {
  for (std::size_t step = 0; step <= 16; ++step) {
    EXPECT_EQ(TWReportingUtilityBucketNumberToStringVolumes[step], 0.0625 * static_cast<double>(step));
  }
  EXPECT_THAT(TWReportingUtilityBucketNumberToStringTimes,
              ElementsAre(0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000));
}

TEST_F(TWReportingUtilityTest, AKeyHasChangedWhenItIsInBothAndDiffers) {
  const ValueMap one{{"a", 1}, {"b", "x"}, {"c", 1}};
  const ValueMap two{{"a", 1.0}, {"b", "y"}, {"d", 1}};
  EXPECT_FALSE(TWReportingUtilityKeyIsPresentAndHasChanged("a", &one, &two));  // 1 and 1.0 are equal
  EXPECT_TRUE(TWReportingUtilityKeyIsPresentAndHasChanged("b", &one, &two));
  EXPECT_FALSE(TWReportingUtilityKeyIsPresentAndHasChanged("c", &one, &two));
  EXPECT_FALSE(TWReportingUtilityKeyIsPresentAndHasChanged("d", &one, &two));
  EXPECT_FALSE(TWReportingUtilityKeyIsPresentAndHasChanged("b", nullptr, &two));
  EXPECT_FALSE(TWReportingUtilityKeyIsPresentAndHasChanged("b", &one, nullptr));
}

TEST_F(TWReportingUtilityTest, TheApplicationNameIsTheConfigurationsOrUnknown) {
  EXPECT_EQ(TWReportingUtilityRetrieveAppName({{"HostApplicationDisplayID", "com.orvane.player"}}),
            "com.orvane.player");
  EXPECT_EQ(TWReportingUtilityRetrieveAppName({}), "Unknown");
}

// Waiting.

TEST_F(TWReportingUtilityTest, WaitReturnsAtOnceWhenTheFlagIsSet) {
  TWReportingCondition condition;
  const bool flag = true;
  EXPECT_TRUE(
      TWReportingUtilityWait(condition, 3600.0, &flag, "waiting", "timed out", TWReportingTraceCategory()));
  EXPECT_THAT(test.log.linesOf("twrt"), IsEmpty());
}

TEST_F(TWReportingUtilityTest, WaitEndsAfterOneTimeOutWithoutASignal) {
  TWReportingCondition condition;
  const bool flag = false;
  EXPECT_FALSE(
      TWReportingUtilityWait(condition, 0.001, &flag, "waiting", "timed out", TWReportingTraceCategory()));
  EXPECT_EQ(test.log.textsOf("twrt", LogLevel::kInfo).front(), "waiting");
  EXPECT_THAT(test.log.textsOf("twrt", LogLevel::kError), ElementsAre("timed out"));
}

TEST_F(TWReportingUtilityTest, WaitEndsWithTheSignal) {
  TWReportingCondition condition;
  bool flag = false;
  std::thread signaller([&] { TWReportingUtilitySignal(condition, &flag); });
  EXPECT_TRUE(
      TWReportingUtilityWait(condition, 60.0, &flag, "waiting", "timed out", TWReportingTraceCategory()));
  signaller.join();
  EXPECT_TRUE(flag);
  EXPECT_THAT(test.log.textsOf("twrt", LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingUtilityTest, WaitContinuesAfterAWakeUpWithoutTheFlag) {
  TWReportingCondition condition;
  bool flag = false;
  std::thread waiter([&] {
    EXPECT_TRUE(
        TWReportingUtilityWait(condition, 60.0, &flag, "waiting", "timed out", TWReportingTraceCategory()));
  });
  while (test.log.textsOf("twrt").empty()) std::this_thread::yield();
  {
    const MutexLock lock(condition.mutex);  // the waiter holds it until it waits
    condition.signalled.notifyOne();
  }
  while (test.log.textsOf("twrt").size() < 2) std::this_thread::yield();
  EXPECT_EQ(test.log.textsOf("twrt")[1], "continuing");
  TWReportingUtilitySignal(condition, &flag);
  waiter.join();
}

// Process-wide values.

TEST_F(TWReportingUtilityTest, IsAnInternalBuildOnlyIfTheDeviceSaysSo) {
  EXPECT_FALSE(TWReportingUtilityIsInternalBuild());
}

TEST_F(TWReportingUtilityTest, AsksTheDeviceOnceWhetherItIsAnInternalBuild) {
  makeInternalBuild();
  EXPECT_TRUE(TWReportingUtilityIsInternalBuild());
  test.deviceFacts.set("InternalBuild", false);
  EXPECT_TRUE(TWReportingUtilityIsInternalBuild());
}

TEST_F(TWReportingUtilityTest, ThereIsOneWorkQueueOfTheHighestPriority) {
  SerialQueue& queue = TWReportingUtilityGetReportingServerQueue();
  EXPECT_EQ(&queue, &TWReportingUtilityGetReportingServerQueue());
  EXPECT_EQ(queue.name(), "com.orvane.tonewerk.reporting.server");
  EXPECT_EQ(test.queues.find(queue.name())->priority(), QueuePriority::kUserInteractive);
}

TEST_F(TWReportingUtilityTest, ManyThreadsGetTheSameWorkQueue) {
  std::vector<SerialQueue*> seen(4);
  std::vector<std::thread> threads;
  threads.reserve(seen.size());
  for (auto& queue : seen) {
    threads.emplace_back([&queue] { queue = &TWReportingUtilityGetReportingServerQueue(); });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(std::set<SerialQueue*>(seen.begin(), seen.end()).size(), 1U);
}

TEST_F(TWReportingUtilityTest, EachAreaHasItsLogCategory) {
  const std::vector<std::pair<LogCategory*, std::string>> categories{
      {TWReportingClientCategory(), "twrc"},        {TWReportingServiceDelegateCategory(), "twrs"},
      {TWReportingSessionCategory(), "twrr"},       {TWReportingSessionLinkReportCategory(), "twri"},
      {TWReportingDriverUtilityCategory(), "twrd"}, {TWReportingTraceCategory(), "twrt"},
      {TWReportingEnergybookCategory(), "twrp"},    {TWReportingDiagwireLogCategory(), "twra"},
      {TWReportingCapsaLogCategory(), "twrb"},      {TWReportingSummaryLogCategory(), "twru"},
      {TWReportingDPLogCategory(), "twrl"}};
  for (const auto& [category, code] : categories) {
    EXPECT_EQ(category->code(), code);
    EXPECT_EQ(category->subsystem(), "com.orvane.tonewerk");
    EXPECT_EQ(category->word, 0U);
  }
  EXPECT_EQ(TWReportingTraceCategory(), TWReportingTraceCategory());
}

}  // namespace
}  // namespace tonewerk
