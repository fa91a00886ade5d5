// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/AudioHealth.h"

#include <gmock/gmock.h>

#include "support/ChannelRecords.h"
#include "support/memory/MemoryChanmeter.h"

namespace tonewerk {
namespace {

using channels::histogram;
using channels::simple;
using testing::IsEmpty;
using testing::SizeIs;

ChanmeterKey keyOf(const char* group, const char* subGroup, const char* name) {
  ChanmeterKey key = channels::keyIn(group, name, "PipeWire1000");
  if (*subGroup != '\0') key.subGroup = subGroup;
  return key;
}

std::vector<ChanmeterRecord> speaker(std::int64_t quick, std::int64_t slow, std::int64_t xruns) {
  return {histogram(keyOf("Tx", "speaker", "Processing Time"), {{0, 10, quick}, {80, 90, slow}}),
          simple(keyOf("Tx", "speaker", "Xruns"), xruns)};
}

class AudioHealthTest : public testing::Test {
 protected:
  AudioHealth read(std::vector<ChanmeterRecord> records) {
    chanmeter.setRecords(std::move(records));
    return reader.read();
  }

  MemoryChanmeter chanmeter;
  AudioHealthReader reader{chanmeter};
};

TEST_F(AudioHealthTest, ProcessingTimesAreThoseSinceTheLastReading) {
  const AudioHealth first = read(speaker(1000, 500, 2));
  ASSERT_THAT(first.devices, SizeIs(1));
  EXPECT_EQ(first.devices[0].device, "speaker");
  EXPECT_EQ(first.devices[0].load, std::nullopt);
  EXPECT_EQ(first.devices[0].xruns, 2);

  const AudioHealth second = read(speaker(1003, 501, 3));
  EXPECT_DOUBLE_EQ(second.devices.at(0).load.value_or(0), 0.25);  // three of 5 % and one of 85 %
  EXPECT_DOUBLE_EQ(second.devices[0].worst.value_or(0), 0.9);
  EXPECT_EQ(second.devices[0].xruns, 3);

  EXPECT_EQ(read(speaker(1003, 501, 3)).devices.at(0).load, std::nullopt) << "nothing ran";
}

TEST_F(AudioHealthTest, TotalsOfAllDevicesAndOtherChannelsAreLeftOut) {
  const AudioHealth health = read(
      {simple(keyOf("Tx", "", "Xruns"), 5), simple(keyOf("Rx", "mic", "Xruns"), 1),
       simple(keyOf("Tx", "pcm0 sub0", "Hardware Position"), 7), simple(keyOf("Speaker", "x", "Xruns"), 7)});
  ASSERT_THAT(health.devices, SizeIs(1));
  EXPECT_EQ(health.devices[0].device, "mic");
  EXPECT_TRUE(health.devices[0].isInput);
}

TEST_F(AudioHealthTest, NodesTellTheirShareOfThePeriod) {
  const AudioHealth health =
      read({simple(keyOf("Nodes", "player", "Busy"), 125), simple(keyOf("Nodes", "player", "Worst"), 1500),
            simple(keyOf("Nodes", "player", "Glitches"), 3), simple(keyOf("Nodes", "player", "PID"), 4711),
            simple(keyOf("Nodes", "filter", "Busy"), 10), simple(keyOf("Nodes", "", "Busy"), 10)});
  ASSERT_THAT(health.nodes, SizeIs(2));
  EXPECT_EQ(health.nodes[0].node, "filter");
  EXPECT_EQ(health.nodes[0].glitches, std::nullopt);
  EXPECT_EQ(health.nodes[1].node, "player");
  EXPECT_DOUBLE_EQ(health.nodes[1].busy.value_or(0), 0.125);
  EXPECT_DOUBLE_EQ(health.nodes[1].worst.value_or(0), 1.5);
  EXPECT_EQ(health.nodes[1].glitches, 3);
  EXPECT_EQ(health.nodes[1].process, 4711);
}

TEST_F(AudioHealthTest, APublisherCannotBloatIt) {
  std::vector<ChanmeterRecord> records;
  for (int at = 0; at < 2000; ++at) {
    records.push_back(simple(keyOf("Nodes", std::to_string(at).c_str(), "Busy"), 1));
    records.push_back(simple(keyOf("Tx", std::to_string(at).c_str(), "Xruns"), 1));
  }
  const AudioHealth health = read(records);
  EXPECT_THAT(health.nodes, SizeIs(AudioHealthReader::kMaxNodes));
  EXPECT_THAT(health.devices, SizeIs(AudioHealthReader::kMaxDevices));
}

TEST_F(AudioHealthTest, NothingIsKnownWhenNobodyPublishes) {
  EXPECT_THAT(read({}).devices, IsEmpty());
  EXPECT_THAT(read({}).nodes, IsEmpty());
}

}  // namespace
}  // namespace tonewerk
