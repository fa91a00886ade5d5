// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <limits>

#include "driver/DriverTest.h"
#include "platform/chanmeter/ChanmeterRecordSample.h"

// These tests show how one channel becomes one entry.

namespace tonewerk {
namespace {

using namespace channels;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using DriverStatsMap = TWReportingDriverUtility::DriverStatsMap;

ChanmeterRecordSample sampleOf(const ChanmeterRecord& record) {
  return ChanmeterRecordSample(std::make_shared<const ChanmeterRecord>(record));
}

std::string keyOf(const ChanmeterKey& key, std::string_view type = "Simple") {
  return TWReportingDriverUtility::getDriverStatsKey(sampleOf({.key = key}), type);
}

// Needs the fixture because the functions log in the sampler's category.
class TWReportingDriverUtilityFormatsTest : public DriverTest {
 protected:
  static DriverStatsMap simpleOf(std::int64_t value) {
    DriverStatsMap stats;
    TWReportingDriverUtility::processSimpleData(sampleOf(simple(speaker("a"), value)), stats);
    return stats;
  }

  static DriverStatsMap histogramOf(const ChanmeterRecord& record) {
    DriverStatsMap stats;
    TWReportingDriverUtility::processHistogramData(sampleOf(record), stats);
    return stats;
  }

  static std::string bucketsText(std::vector<ChanmeterBucket> buckets) {
    return histogramOf(histogram(speaker("a"), std::move(buckets))).text("Amp_Speaker_Histogram_a");
  }

  static DriverStatsMap stateOf(std::vector<ChanmeterState> held) {
    DriverStatsMap stats;
    TWReportingDriverUtility::processStateData(sampleOf(states(speaker("a"), std::move(held))), stats);
    return stats;
  }
};

TEST_F(TWReportingDriverUtilityFormatsTest, AKeyIsDriverGroupTypeAndChannel) {
  EXPECT_EQ(keyOf({.driver = "Amp Drv<0x1>", .group = "Speaker", .name = "Rail Volts"}),
            "AmpDrv_Speaker_Simple_RailVolts");
}

TEST_F(TWReportingDriverUtilityFormatsTest, AKeyWithEveryPartHasTheSubGroupAfterTheGroup) {
  EXPECT_EQ(keyOf({.driver = "d", .group = "g", .subGroup = "s", .name = "n"}, "State"), "d_g_s_State_n");
}

TEST_F(TWReportingDriverUtilityFormatsTest, AKeyOfAChannelWithoutNamesIsTheTypeAndAnUnderscore) {
  EXPECT_EQ(keyOf({}), "Simple_");
  EXPECT_EQ(keyOf({}, "Histogram"), "Histogram_");
}

TEST_F(TWReportingDriverUtilityFormatsTest, AnAbsentPartHasNoUnderscoreEither) {
  EXPECT_EQ(keyOf({.group = "g", .subGroup = "s", .name = "n"}), "g_s_Simple_n");
  EXPECT_EQ(keyOf({.driver = "d", .subGroup = "s", .name = "n"}), "d_s_Simple_n");
  EXPECT_EQ(keyOf({.driver = "d", .group = "g", .name = "n"}), "d_g_Simple_n");
  EXPECT_EQ(keyOf({.driver = "d", .group = "g", .subGroup = "s"}), "d_g_s_Simple_");
}

TEST_F(TWReportingDriverUtilityFormatsTest, AnEmptyPartKeepsItsUnderscore) {
  EXPECT_EQ(keyOf({.driver = "", .group = "", .subGroup = "", .name = ""}), "___Simple_");
}

TEST_F(TWReportingDriverUtilityFormatsTest, NamesLoseTheirBlanksAndUnderscores) {
  EXPECT_EQ(keyOf({.driver = " a_b ", .group = "_c d_", .subGroup = "e__f", .name = "g  h_ "}),
            "ab_cd_ef_Simple_gh");
}

TEST_F(TWReportingDriverUtilityFormatsTest, NamesKeepEveryOtherCharacter) {
  EXPECT_EQ(keyOf({.driver = "d\t-", .group = "g>", .subGroup = "s<1>", .name = "n<2>.\xC3\xA4"}),
            "d\t-_g>_s<1>_Simple_n<2>.\xC3\xA4");
}

TEST_F(TWReportingDriverUtilityFormatsTest, TheTypeKeepsItsBlanksAndUnderscores) {
  EXPECT_EQ(keyOf({.name = "n"}, "A type_"), "A type__n");
}

TEST_F(TWReportingDriverUtilityFormatsTest, ADriversNameEndsAtItsFirstAngleBracket) {
  EXPECT_EQ(keyOf({.driver = "Amp<1><2>", .name = "n"}), "Amp_Simple_n");
  EXPECT_EQ(keyOf({.driver = "<1>", .name = "n"}), "_Simple_n");
}

TEST_F(TWReportingDriverUtilityFormatsTest, ADriversNameWithoutOpeningAngleBracketIsKeptWhole) {
  EXPECT_EQ(keyOf({.driver = "Amp>1", .name = "n"}), "Amp>1_Simple_n");
}

TEST_F(TWReportingDriverUtilityFormatsTest, ASimpleChannelWithoutChangeAddsNothing) {
  EXPECT_THAT(simpleOf(0), IsEmpty());
}

TEST_F(TWReportingDriverUtilityFormatsTest, ASimpleChannelThatWentDownAddsNothing) {
  EXPECT_THAT(simpleOf(-1), IsEmpty());
  EXPECT_THAT(simpleOf(std::numeric_limits<std::int64_t>::min()), IsEmpty());
}

TEST_F(TWReportingDriverUtilityFormatsTest, ASimpleChannelThatWentUpAddsItsChangeAsAnInteger) {
  constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();
  EXPECT_EQ(simpleOf(1), (DriverStatsMap{{"Amp_Speaker_Simple_a", std::int64_t{1}}}));
  const DriverStatsMap most = simpleOf(kMax);
  ASSERT_NE(most.find("Amp_Speaker_Simple_a"), nullptr);
  EXPECT_EQ(most.find("Amp_Speaker_Simple_a")->kind(), Value::Kind::kInteger);
  EXPECT_EQ(most.integer("Amp_Speaker_Simple_a"), kMax);
}

TEST_F(TWReportingDriverUtilityFormatsTest, AHistogramGivesTheNumberOfBucketsAndListsThoseWithHits) {
  ChanmeterRecord record =
      histogram(speaker("Queue Delay"), {{0, 10, 0}, {10, 20, 5}, {20, 30, 1}, {30, 40, 0}});
  record.minimum = 11;
  record.maximum = 29;
  record.unit = "us";
  EXPECT_EQ(histogramOf(record),
            (DriverStatsMap{{"Amp_Speaker_Histogram_QueueDelay",
                             "count=4,lower=0,upper=40,min=11,max=29,unit=us::10-20:5;20-30:1"}}));
}

TEST_F(TWReportingDriverUtilityFormatsTest, HitsInBucketTwoOfFourGiveOneBucketWithoutTrailingSemicolon) {
  EXPECT_EQ(bucketsText({{0, 10, 0}, {10, 20, 7}, {20, 30, 0}, {30, 40, 0}}),
            "count=4,lower=0,upper=40,min=0,max=0,unit=(null)::10-20:7");
}

TEST_F(TWReportingDriverUtilityFormatsTest, AHistogramWithoutHitsAddsNothing) {
  EXPECT_THAT(histogramOf(histogram(speaker("a"), {{0, 10, 0}, {10, 20, 0}})), IsEmpty());
  EXPECT_THAT(histogramOf(histogram(speaker("a"), {})), IsEmpty());
}

TEST_F(TWReportingDriverUtilityFormatsTest, NegativeHitsCountAsHits) {
  EXPECT_EQ(bucketsText({{0, 10, -2}}), "count=1,lower=0,upper=10,min=0,max=0,unit=(null)::0-10:-2");
}

TEST_F(TWReportingDriverUtilityFormatsTest, BoundsThatAreAllPositiveStillReportLowerZero) {
  EXPECT_EQ(bucketsText({{5, 10, 1}, {10, 20, 0}}),
            "count=2,lower=0,upper=20,min=0,max=0,unit=(null)::5-10:1");
}

TEST_F(TWReportingDriverUtilityFormatsTest, BoundsThatAreAllNegativeStillReportUpperZero) {
  EXPECT_EQ(bucketsText({{-20, -10, 1}, {-10, -5, 0}}),
            "count=2,lower=-20,upper=0,min=0,max=0,unit=(null)::-20--10:1");
}

TEST_F(TWReportingDriverUtilityFormatsTest, NumbersKeepAll64Bits) {
  constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
  constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();
  ChanmeterRecord record = histogram(speaker("a"), {{kLeast, kMax, kMax}});
  record.minimum = kLeast;
  record.maximum = kMax;
  EXPECT_EQ(
      histogramOf(record).text("Amp_Speaker_Histogram_a"),
      "count=1,lower=-9223372036854775808,upper=9223372036854775807,min=-9223372036854775808,"
      "max=9223372036854775807,unit=(null)::-9223372036854775808-9223372036854775807:9223372036854775807");
}

TEST_F(TWReportingDriverUtilityFormatsTest, ABucketWithUnreadableBoundsHasThoseOfTheBucketBeforeIt) {
  EXPECT_EQ(bucketsText({{10, 20, 1}, {{}, {}, 2}, {{}, 90, 3}, {30, 40, 0}}),
            "count=4,lower=0,upper=40,min=0,max=0,unit=(null)::10-20:1;10-20:2;10-20:3");
  EXPECT_THAT(logged(LogLevel::kInfo), ElementsAre("Error in getting the bucket bounds : 1",
                                                   "Error in getting the bucket bounds : 1"));
}

TEST_F(TWReportingDriverUtilityFormatsTest, AFirstBucketWithUnreadableBoundsHasZeros) {
  EXPECT_EQ(bucketsText({{{}, {}, 2}, {10, 20, 1}}),
            "count=2,lower=0,upper=20,min=0,max=0,unit=(null)::0-0:2;10-20:1");
}

TEST_F(TWReportingDriverUtilityFormatsTest, UnreadableBoundsAreLoggedAlsoWithoutHits) {
  EXPECT_THAT(histogramOf(histogram(speaker("a"), {{{}, {}, 0}})), IsEmpty());
  EXPECT_THAT(logged(LogLevel::kInfo), ElementsAre("Error in getting the bucket bounds : 1"));
}

TEST_F(TWReportingDriverUtilityFormatsTest,
       AStateChannelGivesTheStatesWithResidencyAndKeepsTheLastSemicolon) {
  EXPECT_EQ(stateOf({{"on", 1, 200, 0.5}, {"idle", 9, 0, 0.25}, {"off state", 2, 100, 1.0 / 3}}),
            (DriverStatsMap{{"Amp_Speaker_State_a",
                             "name:on,transition:1,residency:200,duty_cycle:0.500000;"
                             "name:off state,transition:2,residency:100,duty_cycle:0.333333;"}}));
}

TEST_F(TWReportingDriverUtilityFormatsTest, AStateChannelWithoutAnyResidencyIsReportedWithAnEmptyText) {
  EXPECT_EQ(stateOf({{"on", 5, 0, 0}, {"off", 1, 0, 0}}), (DriverStatsMap{{"Amp_Speaker_State_a", ""}}));
  EXPECT_EQ(stateOf({}), (DriverStatsMap{{"Amp_Speaker_State_a", ""}}));
}

TEST_F(TWReportingDriverUtilityFormatsTest, CountsOfStatesAreUnsigned) {
  constexpr std::uint64_t kMax = std::numeric_limits<std::uint64_t>::max();
  EXPECT_EQ(stateOf({{"", kMax, kMax, 1}}).text("Amp_Speaker_State_a"),
            "name:,transition:18446744073709551615,residency:18446744073709551615,duty_cycle:1.000000;");
}

TEST_F(TWReportingDriverUtilityFormatsTest, AStatesTextIsLogged) {
  stateOf({{"on", 1, 200, 0.5}});
  stateOf({});
  EXPECT_THAT(
      logged(LogLevel::kDebug),
      ElementsAre("the current reported data is : name:on,transition:1,residency:200,duty_cycle:0.500000;",
                  "the current reported data is : "));
}

TEST_F(TWReportingDriverUtilityFormatsTest, OfChannelsThatShareAKeyTheLastOneIsKept) {
  DriverStatsMap stats;
  TWReportingDriverUtility::processSimpleData(sampleOf(simple(speaker("a b"), 1)), stats);
  TWReportingDriverUtility::processSimpleData(sampleOf(simple(speaker("a_b"), 2)), stats);
  EXPECT_EQ(stats, (DriverStatsMap{{"Amp_Speaker_Simple_ab", 2}}));
}

}  // namespace
}  // namespace tonewerk
