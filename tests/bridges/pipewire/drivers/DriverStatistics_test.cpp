// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/DriverStatistics.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "values/Value.h"

namespace tonewerk {
namespace {

using std::chrono::microseconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class DriverStatisticsTest : public ::testing::Test {
 protected:
  DriverStatisticsTest() {
    cycle.period = microseconds(10'000);
    cycle.processing = microseconds(2'500);
  }

  ValueArray channels() const {
    const Value* list = nullptr;
    content = statistics.channelsOf("PipeWire<1>");
    list = content.find("channels");
    return list == nullptr || list->asArray() == nullptr ? ValueArray() : *list->asArray();
  }
  // Names such as "Tx//Cycles" and "Rx/microphone/Period": group, subgroup, channel.
  std::vector<std::string> names() const {
    std::vector<std::string> names;
    for (const Value& channel : channels()) names.push_back(nameOf(*channel.asMap()));
    return names;
  }
  ValueMap channel(const std::string& name) const {
    for (const Value& channel : channels()) {
      if (nameOf(*channel.asMap()) == name) return *channel.asMap();
    }
    return {};
  }
  std::int64_t value(const std::string& name) const { return channel(name).integer("value"); }
  // The buckets that have hits, such as "20-30:1 100-125:2".
  std::string hits(const std::string& name) const {
    std::string text;
    const ValueMap map = channel(name);
    if (!map.contains("buckets")) return "no buckets";
    for (const Value& bucket : *map.find("buckets")->asArray()) {
      const ValueMap& range = *bucket.asMap();
      if (range.integer("hits") == 0) continue;
      text += (text.empty() ? "" : " ") + range.text("lower") + "-" + range.text("upper") + ":" +
              range.text("hits");
    }
    return text;
  }

  void process(microseconds time) {
    cycle.processing = time;
    statistics.count(speaker, cycle, {});
  }

  static std::string nameOf(const ValueMap& channel) {
    const std::string subgroup = channel.contains("subgroup") ? channel.text("subgroup") : "";
    return channel.text("group") + "/" + subgroup + "/" + channel.text("name");
  }

  const DriverNode speaker{DriverNode::kSink, "speaker"};
  const DriverNode microphone{DriverNode::kSource, "microphone"};
  ProfiledCycle cycle;
  DriverStatistics statistics;
  mutable ValueMap content;
};

TEST_F(DriverStatisticsTest, HasTheChannelsOfBothDirectionsBeforeThereIsADriver) {
  EXPECT_THAT(names(), ElementsAre("Tx//Cycles", "Tx//Incomplete Cycles", "Tx//Xruns", "Tx//Period",
                                   "Tx//Processing Time", "Rx//Cycles", "Rx//Incomplete Cycles", "Rx//Xruns",
                                   "Rx//Period", "Rx//Processing Time"));
  EXPECT_EQ(content.text("driver"), "PipeWire<1>");
  EXPECT_FALSE(channel("Tx//Cycles").contains("subgroup"));
}

TEST_F(DriverStatisticsTest, HasTheChannelsOfADriverBeforeItRuns) {
  statistics.setPresent({speaker, microphone});
  EXPECT_EQ(channel("Tx/speaker/Cycles"), (ValueMap{{"group", "Tx"},
                                                    {"subgroup", "speaker"},
                                                    {"name", "Cycles"},
                                                    {"unit", "cycles"},
                                                    {"format", "simple"},
                                                    {"value", 0}}));
  const ValueMap period = channel("Rx/microphone/Period");
  EXPECT_EQ(period.text("format"), "histogram");
  EXPECT_EQ(period.text("unit"), "us");
  EXPECT_EQ(period.integer("min"), 0);
  EXPECT_EQ(period.integer("max"), 0);
  EXPECT_EQ(hits("Rx/microphone/Period"), "");
}

TEST_F(DriverStatisticsTest, CountsACycleForItsDriverAndItsDirection) {
  statistics.setPresent({speaker, microphone});
  statistics.count(speaker, cycle, {});
  statistics.count(speaker, cycle, {});
  EXPECT_EQ(value("Tx/speaker/Cycles"), 2);
  EXPECT_EQ(value("Tx//Cycles"), 2);
  EXPECT_EQ(value("Rx//Cycles"), 0);
  EXPECT_EQ(hits("Tx/speaker/Period"), "10000-20000:2");
  EXPECT_EQ(hits("Tx/speaker/Processing Time"), "20-30:2");
  EXPECT_EQ(channel("Tx/speaker/Processing Time").integer("max"), 25);
}

TEST_F(DriverStatisticsTest, CountsProcessingTimesAsPercentOfThePeriod) {
  statistics.setPresent({speaker});
  process(microseconds(0));
  process(microseconds(999));
  process(microseconds(1'000));
  process(microseconds(9'999));
  process(microseconds(10'000));
  process(microseconds(10'000'000));
  EXPECT_EQ(hits("Tx/speaker/Processing Time"), "0-10:2 10-20:1 90-100:1 100-125:1 200-1000:1");
  EXPECT_EQ(channel("Tx/speaker/Processing Time").text("unit"), "%");
  EXPECT_EQ(channel("Tx/speaker/Processing Time").integer("min"), 0);
  EXPECT_EQ(channel("Tx/speaker/Processing Time").integer("max"), 100'000);
}

TEST_F(DriverStatisticsTest, CountsACycleWithoutTimes) {
  statistics.setPresent({speaker});
  cycle.processing.reset();
  statistics.count(speaker, cycle, {});
  EXPECT_EQ(value("Tx/speaker/Cycles"), 1);
  EXPECT_EQ(hits("Tx/speaker/Processing Time"), "");
}

TEST_F(DriverStatisticsTest, CountsXrunsAndTheCyclesThatFollowersLeftUnfinished) {
  statistics.setPresent({speaker});
  statistics.count(speaker, cycle, {.driver = 3, .followers = {{42, 1}, {43, 1}}});
  EXPECT_EQ(value("Tx/speaker/Xruns"), 3);
  EXPECT_EQ(value("Tx/speaker/Incomplete Cycles"), 1);
  EXPECT_EQ(value("Tx/speaker/Cycles"), 1);
}

TEST_F(DriverStatisticsTest, CountsOnlyNewXrunsOfARepeatedCycle) {
  statistics.setPresent({speaker});
  statistics.count(speaker, cycle, {.isRepeat = true, .driver = 1, .followers = {}});
  EXPECT_EQ(value("Tx/speaker/Xruns"), 1);
  EXPECT_EQ(value("Tx/speaker/Cycles"), 0);
  EXPECT_EQ(hits("Tx/speaker/Period"), "");
}

TEST_F(DriverStatisticsTest, ContinuesCountingForADriverThatComesBack) {
  statistics.setPresent({speaker});
  statistics.count(speaker, cycle, {});
  statistics.setPresent({});
  EXPECT_EQ(value("Tx/speaker/Cycles"), 1);
  statistics.setPresent({speaker});
  statistics.count(speaker, cycle, {});
  EXPECT_EQ(value("Tx/speaker/Cycles"), 2);
}

TEST_F(DriverStatisticsTest, HasChannelsForAMaximumOfDriversAndCountsOthersByDirection) {
  std::set<DriverNode> drivers;
  for (std::size_t i = 0; i < DriverStatistics::kMaxDrivers; ++i) {
    drivers.insert({DriverNode::kSink, "a" + std::to_string(i)});
  }
  statistics.setPresent(drivers);
  EXPECT_EQ(names().size(), (DriverStatistics::kMaxDrivers + 2) * 5);

  drivers.insert(speaker);
  statistics.setPresent(drivers);
  statistics.count(speaker, cycle, {});
  EXPECT_EQ(names().size(), (DriverStatistics::kMaxDrivers + 2) * 5);
  EXPECT_THAT(channel("Tx/speaker/Cycles"), IsEmpty());
  EXPECT_EQ(value("Tx//Cycles"), 1);

  // A driver that left gives its place to a new one.
  drivers.erase({DriverNode::kSink, "a0"});
  statistics.setPresent(drivers);
  EXPECT_THAT(channel("Tx/a0/Cycles"), IsEmpty());
  EXPECT_EQ(value("Tx/speaker/Cycles"), 0);
  EXPECT_EQ(channel("Tx/speaker/Cycles").size(), 6U);
}

}  // namespace
}  // namespace tonewerk
