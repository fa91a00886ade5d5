// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/RecordChanmeter.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/ChannelRecords.h"
#include "support/memory/MemoryChanmeter.h"

namespace tonewerk {
namespace {

using namespace channels;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class RecordChanmeterTest : public ::testing::Test {
 protected:
  RecordChanmeterTest() {
    chanmeter.setRecords({simple(speaker("a"), 1), simple(speaker("b"), 2), simple(keyIn("Tx", "c"), 3)});
  }

  Chanmeter::Samples sample() {
    const Chanmeter::Channels channels = chanmeter.copyChannelsInGroup({}, {}, error);
    Chanmeter::Channels subscribed;
    const Chanmeter::Subscription subscription = chanmeter.createSubscription(channels, subscribed, error);
    return chanmeter.createSamples(subscription, subscribed, error);
  }

  std::vector<std::int64_t> valuesOf(const ChanmeterSamples& samples, int result = 0) {
    std::vector<std::int64_t> values;
    chanmeter.iterate(samples, [&](const ChanmeterSample& one) {
      values.push_back(one.simpleIntegerValue());
      return result;
    });
    return values;
  }

  MemoryChanmeter chanmeter;
  std::optional<ChanmeterError> error;
};

TEST_F(RecordChanmeterTest, CountsTheChannelsOfASet) {
  EXPECT_EQ(chanmeter.channelCount(*chanmeter.copyChannelsInGroup("Speaker", {}, error)), 2);
  EXPECT_EQ(chanmeter.channelCount(*chanmeter.copyChannelsInGroup("Rx", {}, error)), 0);
  EXPECT_FALSE(error);
}

TEST_F(RecordChanmeterTest, IteratesInTheOrderOfTheSamples) {
  EXPECT_THAT(valuesOf(*sample()), ElementsAre(1, 2, 3));
}

TEST_F(RecordChanmeterTest, ACallbacksResultOtherThanZeroEndsTheIteration) {
  EXPECT_THAT(valuesOf(*sample(), 1), ElementsAre(1));
  EXPECT_THAT(valuesOf(*sample(), -1), ElementsAre(1));
}

TEST_F(RecordChanmeterTest, SamplesDoNotChangeWithTheChannels) {
  const Chanmeter::Samples before = sample();
  chanmeter.setRecords({simple(speaker("a"), 10)});
  EXPECT_THAT(valuesOf(*before), ElementsAre(1, 2, 3));
  EXPECT_THAT(valuesOf(*sample()), ElementsAre(10));
}

TEST_F(RecordChanmeterTest, ADeltaHoldsWhatChanged) {
  const Chanmeter::Samples before = sample();
  chanmeter.setRecords({simple(speaker("a"), 10), simple(keyIn("Tx", "c"), 3)});
  const Chanmeter::Samples delta = chanmeter.createSamplesDelta(before, sample(), error);
  ASSERT_NE(delta, nullptr);
  EXPECT_THAT(valuesOf(*delta), ElementsAre(9, 0));
  EXPECT_FALSE(error);
}

TEST_F(RecordChanmeterTest, ADeltaWithoutEarlierSamplesFailsWithACode) {
  EXPECT_EQ(chanmeter.createSamplesDelta(nullptr, sample(), error), nullptr);
  ASSERT_TRUE(error);
  EXPECT_EQ(error->code, 1);
}

}  // namespace
}  // namespace tonewerk
