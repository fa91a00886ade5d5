// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterDifference.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits>

#include "support/ChannelRecords.h"

namespace tonewerk {
namespace {

using namespace channels;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();

std::vector<ChanmeterRecord> difference(std::vector<ChanmeterRecord> earlier,
                                        std::vector<ChanmeterRecord> later) {
  return plain(chanmeterDifference(shared(std::move(earlier)), shared(std::move(later))));
}

std::int64_t simpleDifference(std::int64_t earlier, std::int64_t later) {
  return difference({simple(speaker("a"), earlier)}, {simple(speaker("a"), later)}).at(0).value;
}

std::vector<ChanmeterState> stateDifference(std::vector<ChanmeterState> earlier,
                                            std::vector<ChanmeterState> later) {
  return difference({states(speaker("a"), std::move(earlier))}, {states(speaker("a"), std::move(later))})
      .at(0)
      .states;
}

std::vector<ChanmeterBucket> bucketDifference(std::vector<ChanmeterBucket> earlier,
                                              std::vector<ChanmeterBucket> later) {
  return difference({histogram(speaker("a"), std::move(earlier))},
                    {histogram(speaker("a"), std::move(later))})
      .at(0)
      .buckets;
}

TEST(ChanmeterDifferenceTest, SimpleValuesSubtract) {
  EXPECT_EQ(simpleDifference(10, 12), 2);
  EXPECT_EQ(simpleDifference(12, 12), 0);
  EXPECT_EQ(simpleDifference(12, 10), -2);
  EXPECT_EQ(simpleDifference(-5, 5), 10);
}

TEST(ChanmeterDifferenceTest, AChangeThatDoesNotFitSaturates) {
  EXPECT_EQ(simpleDifference(kLeast, kMax), kMax);
  EXPECT_EQ(simpleDifference(-1, kMax), kMax);
  EXPECT_EQ(simpleDifference(0, kMax), kMax);
  EXPECT_EQ(simpleDifference(kMax, kLeast), kLeast);
  EXPECT_EQ(simpleDifference(1, kLeast), kLeast);
  EXPECT_EQ(simpleDifference(0, kLeast), kLeast);
  EXPECT_EQ(simpleDifference(kLeast, 0), kMax);
  EXPECT_EQ(simpleDifference(kLeast, kLeast), 0);
}

TEST(ChanmeterDifferenceTest, TransitionsAndResidenciesSubtractAndDutyCyclesAreRecomputed) {
  EXPECT_THAT(
      stateDifference({{"on", 1, 100, 0.9}, {"off", 2, 50, 0.1}}, {{"on", 4, 200, 1}, {"off", 2, 350, 0}}),
      ElementsAre(ChanmeterState{"on", 3, 100, 0.25}, ChanmeterState{"off", 0, 300, 0.75}));
}

TEST(ChanmeterDifferenceTest, TransitionsAndResidenciesThatWentBackCountFromZero) {
  EXPECT_THAT(stateDifference({{"on", 9, 100, 1}}, {{"on", 4, 30, 1}}),
              ElementsAre(ChanmeterState{"on", 4, 30, 1.0}));
}

TEST(ChanmeterDifferenceTest, DutyCyclesOfStatesWithoutResidencyAreZero) {
  EXPECT_THAT(stateDifference({{"on", 1, 100, 1}, {"off", 1, 5, 0}}, {{"on", 2, 100, 1}, {"off", 1, 5, 0}}),
              ElementsAre(ChanmeterState{"on", 1, 0, 0.0}, ChanmeterState{"off", 0, 0, 0.0}));
  EXPECT_THAT(stateDifference({}, {}), IsEmpty());
}

TEST(ChanmeterDifferenceTest, ResidenciesWhoseSumDoesNotFitStillGiveDutyCycles) {
  constexpr std::uint64_t kMaxTime = std::numeric_limits<std::uint64_t>::max();
  EXPECT_THAT(
      stateDifference({{"on", 0, 0, 0}, {"off", 0, 0, 0}}, {{"on", 0, kMaxTime, 0}, {"off", 0, kMaxTime, 0}}),
      ElementsAre(ChanmeterState{"on", 0, kMaxTime, 0.5}, ChanmeterState{"off", 0, kMaxTime, 0.5}));
}

TEST(ChanmeterDifferenceTest, StatesMatchByNameWhateverTheirPlace) {
  EXPECT_THAT(stateDifference({{"on", 1, 10, 0}, {"gone", 1, 10, 0}, {"off", 2, 20, 0}},
                              {{"off", 3, 40, 0}, {"new", 5, 60, 0}, {"on", 1, 30, 0}}),
              ElementsAre(ChanmeterState{"off", 1, 20, 0.2}, ChanmeterState{"new", 5, 60, 0.6},
                          ChanmeterState{"on", 0, 20, 0.2}));
}

TEST(ChanmeterDifferenceTest, HitsSubtractOrCountFromZeroWhereTheyWentBack) {
  EXPECT_THAT(bucketDifference({{0, 10, 5}, {10, 20, 5}}, {{0, 10, 8}, {10, 20, 2}}),
              ElementsAre(ChanmeterBucket{0, 10, 3}, ChanmeterBucket{10, 20, 2}));
}

TEST(ChanmeterDifferenceTest, BucketsMatchByBothBounds) {
  EXPECT_THAT(
      bucketDifference({{0, 10, 1}, {0, 20, 2}, {5, 10, 4}}, {{5, 10, 104}, {0, 30, 9}, {0, 10, 101}}),
      ElementsAre(ChanmeterBucket{5, 10, 100}, ChanmeterBucket{0, 30, 9}, ChanmeterBucket{0, 10, 100}));
}

TEST(ChanmeterDifferenceTest, BucketsWithoutABoundMatchOneAnotherInOrder) {
  EXPECT_THAT(bucketDifference({{{}, 10, 1}, {0, 10, 2}, {{}, 10, 3}, {5, {}, 4}},
                               {{5, {}, 5}, {{}, 10, 5}, {{}, 10, 5}}),
              ElementsAre(ChanmeterBucket{5, {}, 1}, ChanmeterBucket{{}, 10, 4}, ChanmeterBucket{{}, 10, 2}));
}

TEST(ChanmeterDifferenceTest, MinimumMaximumAndUnitAreTheLaterOnes) {
  ChanmeterRecord earlier = histogram(speaker("a"), {});
  earlier.unit = "us";
  earlier.minimum = 1;
  earlier.maximum = 50;
  ChanmeterRecord later = histogram(speaker("a"), {});
  later.unit = "ms";
  later.minimum = 2;
  later.maximum = 40;
  EXPECT_THAT(difference({earlier}, {later}), ElementsAre(later));
}

TEST(ChanmeterDifferenceTest, AChannelThatIsNewOrGoneGivesNothing) {
  EXPECT_THAT(difference({simple(speaker("gone"), 1), simple(speaker("stays"), 1)},
                         {simple(speaker("new"), 5), simple(speaker("stays"), 5)}),
              ElementsAre(simple(speaker("stays"), 4)));
}

TEST(ChanmeterDifferenceTest, ChannelsComeInTheLaterOrder) {
  EXPECT_THAT(difference({simple(speaker("a"), 1), simple(speaker("b"), 1), simple(speaker("c"), 1)},
                         {simple(speaker("c"), 4), simple(speaker("a"), 2), simple(speaker("b"), 3)}),
              ElementsAre(simple(speaker("c"), 3), simple(speaker("a"), 1), simple(speaker("b"), 2)));
}

TEST(ChanmeterDifferenceTest, EachPartOfAKeyDistinguishesChannels) {
  const ChanmeterKey key{.driver = "d", .group = "g", .subGroup = "s", .name = "n"};
  for (const auto part :
       {&ChanmeterKey::driver, &ChanmeterKey::group, &ChanmeterKey::subGroup, &ChanmeterKey::name}) {
    for (const std::optional<std::string>& other : {std::optional<std::string>("x"), {}}) {
      ChanmeterKey changed = key;
      changed.*part = other;
      EXPECT_THAT(difference({simple(key, 1)}, {simple(changed, 2)}), IsEmpty());
    }
  }
}

TEST(ChanmeterDifferenceTest, AChannelWhoseFormatChangedCountsAsNew) {
  EXPECT_THAT(difference({simple(speaker("a"), 1)}, {histogram(speaker("a"), {{0, 1, 5}})}), IsEmpty());
}

TEST(ChanmeterDifferenceTest, AChannelOfAFormatWithoutValuesGivesItself) {
  const std::vector<ChanmeterRecord> records = {ofFormat(speaker("a"), 0), ofFormat(speaker("b"), 4),
                                                ofFormat(speaker("c"), 7)};
  EXPECT_EQ(difference(records, records), records);
}

TEST(ChanmeterDifferenceTest, RepeatedChannelsMatchInOrder) {
  EXPECT_THAT(difference({simple(speaker("b"), 0), simple(speaker("a"), 1), simple(speaker("a"), 10)},
                         {simple(speaker("a"), 3), simple(speaker("a"), 15), simple(speaker("a"), 99)}),
              ElementsAre(simple(speaker("a"), 2), simple(speaker("a"), 5)));
}

TEST(ChanmeterDifferenceTest, NoRecordsGiveNoDifference) {
  EXPECT_THAT(difference({}, {}), IsEmpty());
  EXPECT_THAT(difference({simple(speaker("a"), 1)}, {}), IsEmpty());
  EXPECT_THAT(difference({}, {simple(speaker("a"), 1)}), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
