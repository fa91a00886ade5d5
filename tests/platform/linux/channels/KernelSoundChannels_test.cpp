// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/KernelSoundChannels.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "platform/chanmeter/ChanmeterChannelSet.h"
#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/channels/SoundTree.h"
#include "support/ChannelRecords.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

class KernelSoundChannelsTest : public testing::Test {
 protected:
  ChanmeterRecords readShared(const ChannelChoice& choice) {
    ChanmeterRecords records;
    error_.reset();
    channels_.read(choice, records, error_);
    return records;
  }
  std::vector<ChanmeterRecord> read(const ChannelChoice& choice) {
    return channels::plain(readShared(choice));
  }
  std::vector<ChanmeterRecord> readGroup(const std::string& name) {
    const std::optional<std::string> group = name;
    const std::optional<std::string> subGroup;
    return read(ChannelChoice(group, subGroup));
  }
  // For example "PCH Tx pcm0 sub0 Delay".
  static std::vector<std::string> namesOf(const std::vector<ChanmeterRecord>& records) {
    std::vector<std::string> names;
    for (const ChanmeterRecord& record : records) {
      names.push_back(*record.key.driver + " " + *record.key.group + " " +
                      (record.key.subGroup ? *record.key.subGroup + " " : "") + *record.key.name);
    }
    return names;
  }
  std::vector<std::string> errors() const { return log_.textsOf("twrs", LogLevel::kError); }

  SoundTree tree_;
  MemoryLog log_;
  const LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  KernelSoundChannels channels_{tree_.root(), category_};
  std::optional<ChanmeterError> error_;
};

TEST_F(KernelSoundChannelsTest, GivesPlaybackAsTx) {
  const auto records = readGroup("Tx");
  EXPECT_THAT(namesOf(records), ElementsAre("PCH Tx pcm0 sub0 Hardware Position", "PCH Tx pcm0 sub0 Delay",
                                            "PCH Tx pcm0 sub0 State", "PCH Tx pcm3 sub0 Hardware Position",
                                            "PCH Tx pcm3 sub0 Delay", "PCH Tx pcm3 sub0 State",
                                            "Headset Tx pcm0 sub0 Hardware Position",
                                            "Headset Tx pcm0 sub0 Delay", "Headset Tx pcm0 sub0 State"));
  EXPECT_EQ(records[0].format, kChanmeterFormatSimple);
  EXPECT_EQ(records[0].unit, "frames");
  EXPECT_EQ(records[0].value, 1336652);
  EXPECT_EQ(records[1].value, 3540);
  EXPECT_EQ(records[2].format, kChanmeterFormatState);
  EXPECT_EQ(records[2].unit, "ms");
  EXPECT_FALSE(error_);
}

TEST_F(KernelSoundChannelsTest, ACardsNameIsTextWhateverBytesItHas) {
  tree_.write("proc/asound/card0/id", "Casque\xE9\n");
  EXPECT_THAT(namesOf(readGroup("Speaker")),
              ElementsAre("Casque\uFFFD Speaker Power", "Headset Speaker Power"));
}

TEST_F(KernelSoundChannelsTest, GivesCaptureAsRx) {
  EXPECT_THAT(namesOf(readGroup("Rx")), ElementsAre("PCH Rx pcm0 sub0 Hardware Position",
                                                    "PCH Rx pcm0 sub0 Delay", "PCH Rx pcm0 sub0 State"));
}

TEST_F(KernelSoundChannelsTest, GivesPowerAsSpeaker) {
  const auto records = readGroup("Speaker");
  ASSERT_THAT(namesOf(records), ElementsAre("PCH Speaker Power", "Headset Speaker Power"));
  EXPECT_THAT(records[0].states, ElementsAre(ChanmeterState{"active", 0, 61234, 61234.0 / 5382234},
                                             ChanmeterState{"suspended", 0, 5321000, 5321000.0 / 5382234}));
  EXPECT_THAT(records[1].states,
              ElementsAre(ChanmeterState{"active", 0, 300, 0.25}, ChanmeterState{"suspended", 0, 900, 0.75}));
}

TEST_F(KernelSoundChannelsTest, NamesEveryStateAndTimesThePresentOne) {
  const auto states = readGroup("Tx").at(2).states;
  std::vector<std::string> names;
  for (const ChanmeterState& state : states) names.push_back(state.name);
  EXPECT_THAT(names, ElementsAre("OPEN", "SETUP", "PREPARED", "RUNNING", "XRUN", "DRAINING", "PAUSED",
                                 "SUSPENDED", "DISCONNECTED", "closed"));
  EXPECT_EQ(states[3], (ChanmeterState{"RUNNING", 0, 27845, 1.0}));
  for (const std::size_t other : {0U, 1U, 2U, 4U, 5U, 6U, 7U, 8U, 9U}) EXPECT_EQ(states[other].residency, 0U);
}

TEST_F(KernelSoundChannelsTest, AddsAStateThatItDoesNotKnow) {
  tree_.setStatus("state: NAPPING\ntrigger_time: 1.0\ntstamp : 3.0\ndelay : 0\nhw_ptr : 0\n");
  EXPECT_EQ(readGroup("Tx").at(2).states.back(), (ChanmeterState{"NAPPING", 0, 2000, 1.0}));
}

TEST_F(KernelSoundChannelsTest, GivesZerosForAClosedSubstream) {
  const auto records = readGroup("Tx");
  EXPECT_EQ(records[3].value, 0);
  EXPECT_EQ(records[4].value, 0);
  for (const ChanmeterState& state : records[5].states) {
    EXPECT_EQ(state.residency, 0U);
    EXPECT_EQ(state.dutyCycle, 0.0);
  }
}

TEST_F(KernelSoundChannelsTest, GivesOnlyWhatIsSubscribed) {
  const ChanmeterChannelSet wanted(
      std::vector<ChanmeterKey>{{.driver = "PCH", .group = "Tx", .subGroup = "pcm0 sub0", .name = "Delay"},
                                {.driver = "Headset", .group = "Speaker", .name = "Power"},
                                {.driver = "Gone", .group = "Speaker", .name = "Power"}});
  EXPECT_THAT(namesOf(read(ChannelChoice(wanted))),
              ElementsAre("PCH Tx pcm0 sub0 Delay", "Headset Speaker Power"));
}

TEST_F(KernelSoundChannelsTest, FollowsTheSubstreams) {
  tree_.setStatus("closed\n");
  EXPECT_EQ(readGroup("Tx").at(0).value, 0);
  std::filesystem::remove_all(tree_.path("proc/asound/card0"));
  std::filesystem::remove_all(tree_.path("sys/class/sound/card0"));
  EXPECT_THAT(namesOf(readGroup("Tx")), SizeIs(3));
  EXPECT_FALSE(error_);
}

// Each running session keeps a snapshot. Thousands of snapshots must need little memory while nothing
// changes.
TEST_F(KernelSoundChannelsTest, SharesTheRecordsOfUnchangedChannels) {
  const std::optional<std::string> group = "Tx";
  const std::optional<std::string> subGroup;
  const ChannelChoice playback(group, subGroup);
  const ChanmeterRecords before = readShared(playback);
  ASSERT_THAT(before, SizeIs(9));
  EXPECT_EQ(readShared(playback), before);
  tree_.setStatus("state: RUNNING\ndelay : 3540\nhw_ptr : 1384652\n");
  const ChanmeterRecords after = readShared(playback);
  ASSERT_THAT(after, SizeIs(9));
  EXPECT_NE(after[0], before[0]);
  EXPECT_EQ(after[0]->value, 1384652);
  EXPECT_EQ(before[0]->value, 1336652);
  EXPECT_EQ(after[1], before[1]) << "the delay is the same";
  EXPECT_EQ(after[3], before[3]) << "nobody has the other one open";
}

TEST_F(KernelSoundChannelsTest, HasNothingOnAMachineWithoutSoundCards) {
  const TemporaryDirectory empty;
  KernelSoundChannels none(empty.path(), category_);
  const std::optional<std::string> all;
  ChanmeterRecords records;
  none.read(ChannelChoice(all, all), records, error_);
  EXPECT_THAT(records, IsEmpty());
  EXPECT_FALSE(error_);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(KernelSoundChannelsTest, HasNoPowerWhereItIsNotManaged) {
  tree_.addCard(0, "PCH", "unsupported", "0", "0");
  std::filesystem::remove_all(tree_.path("sys/class/sound/card1/device"));
  EXPECT_THAT(readGroup("Speaker"), IsEmpty());
  EXPECT_FALSE(error_);
}

TEST_F(KernelSoundChannelsTest, UsesTheNumberOfACardWithoutIdentifier) {
  std::filesystem::remove(tree_.path("proc/asound/card1/id"));
  EXPECT_THAT(namesOf(readGroup("Speaker")), ElementsAre("PCH Speaker Power", "Headset Speaker Power"));
  std::filesystem::remove(tree_.path("sys/class/sound/card1/id"));
  EXPECT_THAT(namesOf(readGroup("Speaker")), ElementsAre("PCH Speaker Power", "card1 Speaker Power"));
}

TEST_F(KernelSoundChannelsTest, LogsAnUnknownFormOnceAndLeavesItOut) {
  tree_.setStatus("nonsense\n");
  tree_.addCard(1, "Headset", "active", "soon", "900");
  for (int time = 0; time < 2; ++time) {
    EXPECT_THAT(namesOf(readGroup("Tx")), SizeIs(6));
    EXPECT_EQ(error_.value_or(ChanmeterError{}).code, kChannelsNotUnderstood);
    EXPECT_THAT(namesOf(readGroup("Speaker")), ElementsAre("PCH Speaker Power"));
    EXPECT_EQ(error_.value_or(ChanmeterError{}).code, kChannelsNotUnderstood);
  }
  EXPECT_THAT(
      errors(),
      ElementsAre(tree_.path("proc/asound/card0/pcm0p/sub0/status") +
                      ": is not understood (failure 10; the channels concerned are left out)",
                  tree_.path("sys/class/sound/card1/device/power") +
                      ": has no times in milliseconds (failure 10; the channels concerned are left out)"));
}

TEST_F(KernelSoundChannelsTest, ReadsSubstreamsUpToTheLimit) {
  for (std::size_t number = 0; number < KernelSoundChannels::kMaxSubstreams - 4; ++number) {
    tree_.addSubstream("card2/pcm0c/sub" + std::to_string(number), "closed\n", "closed\n");
  }
  EXPECT_THAT(readGroup("Rx"), SizeIs(3 * (KernelSoundChannels::kMaxSubstreams - 3)));
  EXPECT_FALSE(error_);
  tree_.addSubstream("card2/pcm1c/sub0", "closed\n", "closed\n");
  EXPECT_THAT(readGroup("Rx"), SizeIs(3 * (KernelSoundChannels::kMaxSubstreams - 3)));
  EXPECT_EQ(error_.value_or(ChanmeterError{}).code, kChannelsTooMany);
  EXPECT_THAT(errors(), SizeIs(1));
}

TEST_F(KernelSoundChannelsTest, IgnoresSimilarNames) {
  for (const char* name : {"card", "cardX", "card1x", "card-1", "card99999999999"}) {
    tree_.write(std::string("proc/asound/") + name + "/pcm0p/sub0/status", "closed\n");
  }
  for (const char* name : {"pcmp", "pcm0", "pcm0x", "xpcm0p"}) {
    tree_.write(std::string("proc/asound/card0/") + name + "/sub0/status", "closed\n");
  }
  EXPECT_THAT(readGroup("Tx"), SizeIs(9));
}

}  // namespace
}  // namespace tonewerk
