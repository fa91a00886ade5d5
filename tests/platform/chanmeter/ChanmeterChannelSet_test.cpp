// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterChannelSet.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using OptionalText = std::optional<std::string>;

std::shared_ptr<const ChanmeterRecord> record(OptionalText group, OptionalText subGroup, std::string name) {
  return std::make_shared<const ChanmeterRecord>(ChanmeterRecord{
      .key = {.group = std::move(group), .subGroup = std::move(subGroup), .name = std::move(name)}});
}

std::vector<std::string> namesOf(const ChanmeterRecords& records) {
  std::vector<std::string> names;
  for (const auto& one : records) names.push_back(one->key.name.value_or("(null)"));
  return names;
}

class ChanmeterChannelSetTest : public ::testing::Test {
 protected:
  const ChanmeterRecords records = {record("Tx", "Queue", "a"), record("Tx", std::nullopt, "b"),
                                    record("Rx", "Queue", "c"), record(std::nullopt, "MCA", "d"),
                                    record("", "", "e")};
};

TEST_F(ChanmeterChannelSetTest, NoGroupAndNoSubGroupMatchesAll) {
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, {}, {})), ElementsAre("a", "b", "c", "d", "e"));
}

TEST_F(ChanmeterChannelSetTest, AGroupMatchesItsChannelsWhateverTheirSubGroup) {
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, "Tx", {})), ElementsAre("a", "b"));
}

TEST_F(ChanmeterChannelSetTest, ASubGroupMatchesItsChannelsWhateverTheirGroup) {
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, {}, "Queue")), ElementsAre("a", "c"));
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, {}, "MCA")), ElementsAre("d"));
}

TEST_F(ChanmeterChannelSetTest, GroupAndSubGroupMustBothMatch) {
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, "Tx", "Queue")), ElementsAre("a"));
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, "Tx", "MCA")), IsEmpty());
}

TEST_F(ChanmeterChannelSetTest, AnEmptyNameIsNotAnAbsentName) {
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, "", {})), ElementsAre("e"));
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, {}, "")), ElementsAre("e"));
}

TEST_F(ChanmeterChannelSetTest, NamesAreComparedExactly) {
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, "tx", {})), IsEmpty());
  EXPECT_THAT(namesOf(chanmeterRecordsIn(records, "T", {})), IsEmpty());
}

TEST_F(ChanmeterChannelSetTest, HoldsEachChannelOnce) {
  ChanmeterRecords twice = records;
  twice.insert(twice.end(), records.begin(), records.end());
  EXPECT_EQ(ChanmeterChannelSet(twice).keys().size(), records.size());
}

TEST_F(ChanmeterChannelSetTest, SelectsItsChannelsInTheOrderOfTheRecords) {
  const ChanmeterChannelSet set({records[2]->key, records[0]->key});
  EXPECT_TRUE(set.contains(records[0]->key));
  EXPECT_FALSE(set.contains(records[1]->key));
  EXPECT_THAT(namesOf(set.selectedFrom(records)), ElementsAre("a", "c"));
}

TEST_F(ChanmeterChannelSetTest, ContainsItsChannelsInSeveralGroupsAndInNone) {
  const ChanmeterChannelSet set({records[4]->key, records[3]->key, records[2]->key, records[0]->key});
  std::vector<std::string> contained;
  for (const auto& one : records) {
    if (set.contains(one->key)) contained.push_back(*one->key.name);
  }
  EXPECT_THAT(contained, ElementsAre("a", "c", "d", "e"));
  EXPECT_FALSE(ChanmeterChannelSet(ChanmeterRecords{}).contains(records[3]->key));
}

TEST_F(ChanmeterChannelSetTest, ChannelsOfDifferentDriversAreDifferentChannels) {
  ChanmeterKey key = records[0]->key;
  key.driver = "Amp";
  EXPECT_FALSE(ChanmeterChannelSet(records).contains(key));
}

}  // namespace
}  // namespace tonewerk
