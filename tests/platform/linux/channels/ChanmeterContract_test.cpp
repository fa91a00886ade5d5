// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "platform/linux/channels/LinuxChanmeter.h"
#include "support/ChannelRecords.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryChanmeter.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using channels::histogram;
using channels::simple;
using channels::states;
using testing::ElementsAre;
using testing::IsEmpty;

// A file with the channels of one driver.
class PublishedInFiles {
 public:
  PublishedInFiles() { std::filesystem::create_directory(directory_.path("channels")); }

  Chanmeter& chanmeter() { return chanmeter_; }
  void setRecords(const std::vector<ChanmeterRecord>& records) {
    auto list = nlohmann::json::array();
    for (const ChanmeterRecord& record : records) list.push_back(jsonOf(record));
    std::ofstream(directory_.path("channels/.new")) << nlohmann::json{{"driver", "Amp"}, {"channels", list}};
    std::filesystem::rename(directory_.path("channels/.new"), directory_.path("channels/amp.json"));
  }

 private:
  static nlohmann::json jsonOf(const ChanmeterRecord& record) {
    nlohmann::json json{{"group", *record.key.group}, {"name", *record.key.name}};
    if (record.key.subGroup) json["subgroup"] = *record.key.subGroup;
    if (record.unit) json["unit"] = *record.unit;
    json["format"] = std::vector{"invalid", "simple", "state", "histogram"}.at(record.format);
    json["value"] = record.value;
    json["min"] = record.minimum;
    json["max"] = record.maximum;
    for (const ChanmeterState& state : record.states) {
      json["states"].push_back({{"name", state.name},
                                {"transitions", state.transitions},
                                {"residency", state.residency},
                                {"duty_cycle", state.dutyCycle}});
    }
    for (const ChanmeterBucket& bucket : record.buckets) {
      nlohmann::json one{{"hits", bucket.hits}};
      if (bucket.lower) one["lower"] = *bucket.lower;
      if (bucket.upper) one["upper"] = *bucket.upper;
      json["buckets"].push_back(one);
    }
    return json;
  }

  TemporaryDirectory directory_;
  MemoryLog log_;
  const LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  LinuxChanmeter chanmeter_{directory_.path("channels"), category_, directory_.path()};
};

class SetByTheTest {
 public:
  Chanmeter& chanmeter() { return chanmeter_; }
  void setRecords(std::vector<ChanmeterRecord> records) { chanmeter_.setRecords(std::move(records)); }

 private:
  MemoryChanmeter chanmeter_;
};

// The contract of all sources of channels.
template <typename Source>
class ChanmeterContract : public testing::Test {
 protected:
  Chanmeter& chanmeter() { return source_.chanmeter(); }

  Chanmeter::Channels channelsIn(const std::optional<std::string>& group,
                                 const std::optional<std::string>& subGroup) {
    std::optional<ChanmeterError> error;
    auto channels = chanmeter().copyChannelsInGroup(group, subGroup, error);
    EXPECT_TRUE(channels);
    EXPECT_FALSE(error);
    return channels;
  }
  Chanmeter::Samples samplesOf(const Chanmeter::Channels& channels) {
    std::optional<ChanmeterError> error;
    Chanmeter::Channels subscribed;
    const auto subscription = chanmeter().createSubscription(channels, subscribed, error);
    EXPECT_TRUE(subscription);
    EXPECT_TRUE(subscribed);
    auto samples = chanmeter().createSamples(subscription, subscribed, error);
    EXPECT_TRUE(samples);
    EXPECT_FALSE(error);
    return samples;
  }
  std::vector<std::string> namesOf(const Chanmeter::Samples& samples) {
    std::vector<std::string> names;
    chanmeter().iterate(*samples, [&names](const ChanmeterSample& sample) {
      names.emplace_back(*sample.channelName());
      return 0;
    });
    return names;
  }
  std::vector<std::string> namesIn(const std::optional<std::string>& group,
                                   const std::optional<std::string>& subGroup) {
    return namesOf(samplesOf(channelsIn(group, subGroup)));
  }

  Source source_;
};

using Sources = testing::Types<PublishedInFiles, SetByTheTest>;
TYPED_TEST_SUITE(ChanmeterContract, Sources);

TYPED_TEST(ChanmeterContract, HasAnEmptySetIfNoChannelMatches) {
  EXPECT_EQ(this->chanmeter().channelCount(*this->channelsIn("Speaker", std::nullopt)), 0);
  this->source_.setRecords({simple(channels::speaker("Volts"), 1)});
  EXPECT_EQ(this->chanmeter().channelCount(*this->channelsIn("Tx", std::nullopt)), 0);
  EXPECT_EQ(this->chanmeter().channelCount(*this->channelsIn("Speaker", "MCA")), 0);
}

TYPED_TEST(ChanmeterContract, ChoosesByGroupAndSubgroupAndTakesAllForNone) {
  ChanmeterRecord queued = simple(channels::keyIn("Tx", "b"), 1);
  queued.key.subGroup = "MCA";
  this->source_.setRecords(
      {simple(channels::keyIn("Tx", "a"), 1), queued, simple(channels::keyIn("Rx", "c"), 1)});
  EXPECT_THAT(this->namesIn("Tx", std::nullopt), ElementsAre("a", "b"));
  EXPECT_THAT(this->namesIn(std::nullopt, "MCA"), ElementsAre("b"));
  EXPECT_THAT(this->namesIn("Tx", "MCA"), ElementsAre("b"));
  EXPECT_THAT(this->namesIn("Rx", "MCA"), IsEmpty());
  EXPECT_THAT(this->namesIn(std::nullopt, std::nullopt), ElementsAre("a", "b", "c"));
}

TYPED_TEST(ChanmeterContract, SamplesTheSubscribedChannelsAsTheyAreNow) {
  this->source_.setRecords({simple(channels::speaker("a"), 1), simple(channels::speaker("b"), 1)});
  const auto channels = this->channelsIn("Speaker", std::nullopt);
  this->source_.setRecords({simple(channels::speaker("b"), 7), simple(channels::speaker("new"), 1)});
  std::int64_t value = 0;
  const auto samples = this->samplesOf(channels);
  EXPECT_THAT(this->namesOf(samples), ElementsAre("b"));
  this->chanmeter().iterate(*samples, [&value](const ChanmeterSample& sample) {
    value = sample.simpleIntegerValue();
    return 0;
  });
  EXPECT_EQ(value, 7);
}

TYPED_TEST(ChanmeterContract, StopsIteratingWhenTheCallbackSaysSo) {
  this->source_.setRecords({simple(channels::speaker("a"), 1), simple(channels::speaker("b"), 1)});
  int calls = 0;
  this->chanmeter().iterate(*this->samplesOf(this->channelsIn("Speaker", std::nullopt)),
                            [&calls](const ChanmeterSample&) { return ++calls; });
  EXPECT_EQ(calls, 1);
}

TYPED_TEST(ChanmeterContract, ShowsEachFormatsValues) {
  ChanmeterRecord delays = histogram(channels::speaker("Delay"), {{0, 10, 5}, {{}, 20, 6}});
  delays.unit = "us";
  delays.minimum = 1;
  delays.maximum = 90;
  this->source_.setRecords({delays, states(channels::speaker("Mic"), {{"on", 1, 200, 0.5}})});
  this->chanmeter().iterate(*this->samplesOf(this->channelsIn("Speaker", std::nullopt)),
                            [](const ChanmeterSample& sample) {
                              if (sample.format() == kChanmeterFormatHistogram) {
                                std::int64_t lower = -1;
                                std::int64_t upper = -1;
                                EXPECT_EQ(sample.unitLabel(), "us");
                                EXPECT_EQ(sample.histogramBucketCount(), 2);
                                EXPECT_EQ(sample.histogramBucketBounds(0, lower, upper), 0);
                                EXPECT_EQ(lower, 0);
                                EXPECT_EQ(upper, 10);
                                EXPECT_NE(sample.histogramBucketBounds(1, lower, upper), 0);
                                EXPECT_EQ(upper, 10);
                                EXPECT_EQ(sample.histogramBucketHits(1), 6);
                                EXPECT_EQ(sample.histogramMinValue(), 1);
                                EXPECT_EQ(sample.histogramMaxValue(), 90);
                              } else {
                                EXPECT_EQ(sample.format(), kChanmeterFormatState);
                                EXPECT_EQ(sample.unitLabel(), std::nullopt);
                                EXPECT_EQ(sample.stateCount(), 1);
                                EXPECT_EQ(sample.stateName(0), "on");
                                EXPECT_EQ(sample.stateInTransitions(0), 1U);
                                EXPECT_EQ(sample.stateResidency(0), 200U);
                                EXPECT_EQ(sample.stateDutyCycle(0), 0.5);
                              }
                              return 0;
                            });
}

TYPED_TEST(ChanmeterContract, TakesNoDifferenceAgainstNothing) {
  std::optional<ChanmeterError> error;
  const auto later = this->samplesOf(this->channelsIn(std::nullopt, std::nullopt));
  EXPECT_FALSE(this->chanmeter().createSamplesDelta(nullptr, later, error));
  EXPECT_EQ(error.value_or(ChanmeterError{}).code, Chanmeter::kErrorNoEarlierSamples);
}

TYPED_TEST(ChanmeterContract, TakesDifferences) {
  this->source_.setRecords({simple(channels::speaker("a"), 5), simple(channels::speaker("gone"), 1)});
  const auto channels = this->channelsIn("Speaker", std::nullopt);
  const auto earlier = this->samplesOf(channels);
  this->source_.setRecords({simple(channels::speaker("a"), 12)});
  std::optional<ChanmeterError> error;
  const auto change = this->chanmeter().createSamplesDelta(earlier, this->samplesOf(channels), error);
  ASSERT_TRUE(change);
  EXPECT_FALSE(error);
  EXPECT_THAT(this->namesOf(change), ElementsAre("a"));
  this->chanmeter().iterate(*change, [](const ChanmeterSample& sample) {
    EXPECT_EQ(sample.simpleIntegerValue(), 7);
    return 0;
  });
}

}  // namespace
}  // namespace tonewerk
