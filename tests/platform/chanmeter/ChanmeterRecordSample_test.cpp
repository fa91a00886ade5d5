// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterRecordSample.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace tonewerk {
namespace {

ChanmeterRecordSample sampleOf(ChanmeterRecord record) {
  return ChanmeterRecordSample(std::make_shared<const ChanmeterRecord>(std::move(record)));
}

// Returns a record with values of every kind, so that only the format decides which are visible.
ChanmeterRecord fullRecord(ChanmeterFormat format) {
  return {.key = {.driver = "Amp Drv<0x1>", .group = "Speaker", .subGroup = "Queue", .name = "Rail Volts"},
          .unit = "mV",
          .format = format,
          .value = 12,
          .states = {{.name = "on", .transitions = 1, .residency = 200, .dutyCycle = 0.5}},
          .minimum = -3,
          .maximum = 90,
          .buckets = {{.lower = 1, .upper = 10, .hits = 5}}};
}

TEST(ChanmeterRecordSampleTest, GivesNamesAndUnit) {
  const ChanmeterRecordSample sample = sampleOf(fullRecord(1));
  EXPECT_EQ(sample.format(), 1);
  EXPECT_EQ(sample.driverName(), "Amp Drv<0x1>");
  EXPECT_EQ(sample.group(), "Speaker");
  EXPECT_EQ(sample.subGroup(), "Queue");
  EXPECT_EQ(sample.channelName(), "Rail Volts");
  EXPECT_EQ(sample.unitLabel(), "mV");
}

TEST(ChanmeterRecordSampleTest, MissingTextsAreAbsentAndNotEmpty) {
  const ChanmeterRecordSample sample = sampleOf({});
  EXPECT_EQ(sample.format(), kChanmeterFormatInvalid);
  EXPECT_EQ(sample.driverName(), std::nullopt);
  EXPECT_EQ(sample.group(), std::nullopt);
  EXPECT_EQ(sample.subGroup(), std::nullopt);
  EXPECT_EQ(sample.channelName(), std::nullopt);
  EXPECT_EQ(sample.unitLabel(), std::nullopt);
}

TEST(ChanmeterRecordSampleTest, ASimpleSampleHasOnlyItsValue) {
  const ChanmeterRecordSample sample = sampleOf(fullRecord(kChanmeterFormatSimple));
  EXPECT_EQ(sample.simpleIntegerValue(), 12);
  EXPECT_EQ(sample.stateCount(), 0);
  EXPECT_EQ(sample.stateName(0), "");
  EXPECT_EQ(sample.stateInTransitions(0), 0U);
  EXPECT_EQ(sample.stateResidency(0), 0U);
  EXPECT_EQ(sample.stateDutyCycle(0), 0.0);
  EXPECT_EQ(sample.histogramBucketCount(), 0);
  EXPECT_EQ(sample.histogramBucketHits(0), 0);
  EXPECT_EQ(sample.histogramMinValue(), 0);
  EXPECT_EQ(sample.histogramMaxValue(), 0);
}

TEST(ChanmeterRecordSampleTest, AStateSampleHasOnlyItsStates) {
  const ChanmeterRecordSample sample = sampleOf(fullRecord(kChanmeterFormatState));
  EXPECT_EQ(sample.stateCount(), 1);
  EXPECT_EQ(sample.stateName(0), "on");
  EXPECT_EQ(sample.stateInTransitions(0), 1U);
  EXPECT_EQ(sample.stateResidency(0), 200U);
  EXPECT_EQ(sample.stateDutyCycle(0), 0.5);
  EXPECT_EQ(sample.simpleIntegerValue(), 0);
  EXPECT_EQ(sample.histogramBucketCount(), 0);
}

TEST(ChanmeterRecordSampleTest, AHistogramSampleHasOnlyItsBuckets) {
  const ChanmeterRecordSample sample = sampleOf(fullRecord(kChanmeterFormatHistogram));
  EXPECT_EQ(sample.histogramBucketCount(), 1);
  EXPECT_EQ(sample.histogramBucketHits(0), 5);
  EXPECT_EQ(sample.histogramMinValue(), -3);
  EXPECT_EQ(sample.histogramMaxValue(), 90);
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  EXPECT_EQ(sample.histogramBucketBounds(0, lower, upper), 0);
  EXPECT_EQ(lower, 1);
  EXPECT_EQ(upper, 10);
  EXPECT_EQ(sample.simpleIntegerValue(), 0);
  EXPECT_EQ(sample.stateCount(), 0);
}

TEST(ChanmeterRecordSampleTest, AnUnknownFormatHasNoValues) {
  const ChanmeterRecordSample sample = sampleOf(fullRecord(7));
  EXPECT_EQ(sample.format(), 7);
  EXPECT_EQ(sample.simpleIntegerValue(), 0);
  EXPECT_EQ(sample.stateCount(), 0);
  EXPECT_EQ(sample.histogramBucketCount(), 0);
}

TEST(ChanmeterRecordSampleTest, IndexesOutOfRangeAreZeroAndEmpty) {
  const ChanmeterRecordSample states = sampleOf(fullRecord(kChanmeterFormatState));
  const ChanmeterRecordSample histogram = sampleOf(fullRecord(kChanmeterFormatHistogram));
  for (const std::int32_t index : {-1, 1, 2147483647}) {
    EXPECT_EQ(states.stateName(index), "");
    EXPECT_EQ(states.stateResidency(index), 0U);
    EXPECT_EQ(histogram.histogramBucketHits(index), 0);
    std::int64_t lower = 7;
    std::int64_t upper = 8;
    EXPECT_EQ(histogram.histogramBucketBounds(index, lower, upper), ChanmeterRecordSample::kErrorNoBucket);
    EXPECT_EQ(lower, 7);
    EXPECT_EQ(upper, 8);
  }
}

TEST(ChanmeterRecordSampleTest, ABucketWithoutABoundLeavesBothUnchanged) {
  ChanmeterRecord record = fullRecord(kChanmeterFormatHistogram);
  record.buckets = {{.upper = 10, .hits = 1}, {.lower = 1, .hits = 1}, {.hits = 1}};
  const ChanmeterRecordSample sample = sampleOf(record);
  for (const std::int32_t index : {0, 1, 2}) {
    std::int64_t lower = 7;
    std::int64_t upper = 8;
    EXPECT_EQ(sample.histogramBucketBounds(index, lower, upper), ChanmeterRecordSample::kErrorNoBounds);
    EXPECT_EQ(lower, 7);
    EXPECT_EQ(upper, 8);
  }
}

TEST(ChanmeterRecordSampleTest, ACopySharesTheRecord) {
  const auto record = std::make_shared<const ChanmeterRecord>(fullRecord(1));
  const ChanmeterRecordSample sample(record);
  const ChanmeterRecordSample copy = sample;
  EXPECT_EQ(copy.group()->data(), record->key.group->data());
  EXPECT_EQ(record.use_count(), 3);
}

}  // namespace
}  // namespace tonewerk
