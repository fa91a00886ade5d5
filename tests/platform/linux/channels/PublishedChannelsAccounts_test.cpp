// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/channels/LinuxChanmeter.h"
#include "platform/linux/channels/PublishedChannels.h"
#include "platform/linux/channels/SoundTree.h"
#include "support/OtherUser.h"
#include "support/TemporaryDirectory.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

constexpr Resource kSnapshots = Resource::kSnapshotBytes;
constexpr std::size_t kChannels = 100;

// A file of kChannels channels.
std::string fileOf(const std::string& driver, int value) {
  std::string text = R"({"driver": ")" + driver + R"(", "channels": [)";
  for (std::size_t number = 0; number < kChannels; ++number) {
    text += (number == 0 ? "" : ",") + std::string(R"({"group": "Tx", "name": "n)") + std::to_string(number) +
            R"(", "format": "simple", "value": )" + std::to_string(value) + "}";
  }
  return text + "]}";
}

class PublishedChannelsAccountsTest : public testing::Test {
 protected:
  PublishedChannelsAccountsTest() { std::filesystem::create_directory(directory_.path("channels")); }

  std::string path(const std::string& name) const { return directory_.path("channels/" + name); }
  void publish(const std::string& name, const std::string& text, std::uint32_t owner = ::geteuid()) const {
    std::ofstream(directory_.path("new")) << text;
    ASSERT_EQ(::chown(directory_.path("new").c_str(), owner, ::getegid()), 0);
    std::filesystem::rename(directory_.path("new"), path(name));
  }
  // Whoever has the result holds the records, as a session's snapshot does.
  ChanmeterRecords read() {
    ChanmeterRecords records;
    error_.reset();
    published_.read(ChannelChoice(none_, none_), records, error_);
    return records;
  }
  static std::vector<std::string> driversOf(const ChanmeterRecords& records) {
    std::vector<std::string> drivers;
    for (const auto& record : records) {
      if (drivers.empty() || drivers.back() != *record->key.driver) drivers.push_back(*record->key.driver);
    }
    return drivers;
  }
  std::uint64_t held(std::uint32_t user = ::geteuid()) { return accounts_->of(user)->held(kSnapshots); }
  void setTotal(std::uint64_t bytes) { accounts_->totals().setTotal(kSnapshots, bytes); }
  // What the records of a file of kChannels channels hold.
  std::uint64_t bytesOfOne() {
    publish("one.json", fileOf("One", 1));
    read();
    const std::uint64_t bytes = held();
    EXPECT_GT(bytes, 0U);
    std::filesystem::remove(path("one.json"));
    read();
    EXPECT_EQ(held(), 0U);
    return bytes;
  }
  std::int64_t code() const { return error_.value_or(ChanmeterError{}).code; }
  std::vector<std::string> errors() const { return log_.textsOf("twrs", LogLevel::kError); }

  const std::optional<std::string> none_;
  TemporaryDirectory directory_;
  MemoryLog log_;
  const LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  TestAccounts accounts_;
  PublishedChannels published_{directory_.path("channels"), category_, &static_cast<Accounts&>(accounts_)};
  std::optional<ChanmeterError> error_;
};

TEST_F(PublishedChannelsAccountsTest, ChargesARecordWithItsTextsStatesAndBuckets) {
  EXPECT_GE(bytesOfOne(), kChannels * sizeof(ChanmeterRecord));
  const auto bytesOf = [this](const std::string& channel) {
    publish("a.json", R"({"driver": "A", "channels": [)" + channel + "]}");
    EXPECT_THAT(read(), SizeIs(1));
    return held();
  };
  const std::uint64_t plain = bytesOf(R"({"group": "Tx", "name": "n", "format": "simple", "value": 1})");
  const std::string text(1000, 'x');
  EXPECT_GE(bytesOf(R"({"group": "Tx", "name": ")" + text + R"(", "format": "simple", "value": 1})"),
            plain + 1000);
  EXPECT_GE(bytesOf(R"({"group": "Tx", "name": "n", "format": "state", "states": [{"name": ")" + text +
                    R"(", "transitions": 1, "residency": 1, "duty_cycle": 1}]})"),
            plain + 1000 + sizeof(ChanmeterState));
  EXPECT_GE(bytesOf(R"({"group": "Tx", "name": "n", "format": "histogram", "min": 1, "max": 1,
                        "buckets": [{"lower": 1, "upper": 2, "hits": 1}]})"),
            plain + sizeof(ChanmeterBucket));
}

TEST_F(PublishedChannelsAccountsTest, ChargesTheRecordsOnceHoweverManyHoldThem) {
  const std::uint64_t one = bytesOfOne();
  publish("a.json", fileOf("One", 1));
  const ChanmeterRecords first = read();
  const ChanmeterRecords second = read();
  EXPECT_EQ(first, second);
  EXPECT_EQ(held(), one);
  publish("a.json", fileOf("One", 1));  // another file with the same text
  EXPECT_EQ(read(), first);
  EXPECT_EQ(held(), one);
}

TEST_F(PublishedChannelsAccountsTest, GivesBackWhenNobodyHoldsARecordAnyMore) {
  publish("a.json", fileOf("One", 1));
  ChanmeterRecords first = read();
  const std::uint64_t one = held();
  EXPECT_GT(one, 0U);
  publish("a.json", fileOf("One", 2));
  ChanmeterRecords second = read();
  EXPECT_EQ(held(), 2 * one);
  first.resize(1);  // it keeps the others
  EXPECT_EQ(held(), 2 * one);
  first.clear();
  EXPECT_EQ(held(), one);
  std::filesystem::remove(path("a.json"));
  EXPECT_THAT(read(), IsEmpty());
  EXPECT_EQ(held(), one);
  second.clear();
  EXPECT_EQ(held(), 0U);
}

// A file that is published again between the starts of sessions leaves the records of each reading behind.
TEST_F(PublishedChannelsAccountsTest, WhatReadingsOfOneFileHoldIsBoundedByItsOwnersShare) {
  const std::uint64_t one = bytesOfOne();
  setTotal(20 * one);
  std::vector<ChanmeterRecords> snapshots;
  for (int value = 1; value <= 50; ++value) {
    // Every second file has other names, so that it is parsed.
    publish("a.json", fileOf(value % 2 == 0 ? "One" : "Two", value));
    snapshots.push_back(read());
    EXPECT_LE(held(), 10 * one);
  }
  EXPECT_EQ(held(), 10 * one);
  EXPECT_THAT(snapshots.at(9), SizeIs(kChannels));
  EXPECT_THAT(snapshots.at(10), IsEmpty());
  EXPECT_EQ(code(), kChannelsTooMany);
  EXPECT_THAT(errors(),
              ElementsAre(path("a.json") + ": holds more than is left of the share of user " +
                          std::to_string(::geteuid()) + " (failure 9; the channels concerned are left out)"));
  snapshots.clear();
  EXPECT_EQ(held(), 0U);
  EXPECT_THAT(read(), SizeIs(kChannels));
  EXPECT_EQ(code(), 0);
}

TEST_F(PublishedChannelsAccountsTest, AFileWhoseRecordsNobodyHoldsNeedsRoomForOneReadingOnly) {
  setTotal(2 * bytesOfOne());
  for (int value = 1; value <= 4; ++value) {
    publish("a.json", fileOf("One", value));
    EXPECT_THAT(read(), SizeIs(kChannels));
    publish("a.json", fileOf("Two", value));
    EXPECT_THAT(read(), SizeIs(kChannels));
  }
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(PublishedChannelsAccountsTest, AnUnchangedFileIsReadWhenItsOwnerHasRoomAgain) {
  // The stamp of a new file could still hide a change, so that it would be read again in any case.
  const std::string old = TONEWERK_SOURCE_DIR "/examples/driver-channels.json";
  struct stat status {};
  ASSERT_EQ(::stat(old.c_str(), &status), 0);
  std::filesystem::create_symlink(old, path("a.json"));
  setTotal(10);
  EXPECT_THAT(read(), IsEmpty());
  EXPECT_THAT(read(), IsEmpty());
  EXPECT_EQ(code(), kChannelsTooMany);
  EXPECT_THAT(errors(), SizeIs(1));
  EXPECT_EQ(held(status.st_uid), 0U);
  setTotal(kMiB);
  EXPECT_FALSE(read().empty());
  EXPECT_EQ(code(), 0);
  EXPECT_GT(held(status.st_uid), 0U);
}

TEST_F(PublishedChannelsAccountsTest, AnotherOwnersFileIsStillRead) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root may give files away";
  const std::uint64_t one = bytesOfOne();
  setTotal(4 * one);
  publish("a.json", fileOf("One", 1));
  const ChanmeterRecords first = read();
  publish("a.json", fileOf("One", 2));
  const ChanmeterRecords second = read();
  publish("a.json", fileOf("One", 3));
  publish("b.json", fileOf("Two", 1), kOtherUser);
  EXPECT_THAT(driversOf(read()), ElementsAre("Two"));
  EXPECT_EQ(held(), 2 * one);
  EXPECT_EQ(held(kOtherUser), one);
}

TEST_F(PublishedChannelsAccountsTest, ChargesTheSameTextToItsNewOwner) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root may give files away";
  publish("a.json", fileOf("One", 1));
  read();
  const std::uint64_t one = held();
  EXPECT_GT(one, 0U);
  publish("a.json", fileOf("One", 1), kOtherUser);
  EXPECT_THAT(read(), SizeIs(kChannels));
  EXPECT_EQ(held(), 0U);
  EXPECT_EQ(held(kOtherUser), one);
}

TEST_F(PublishedChannelsAccountsTest, ChargesNothingForTheKernelsChannels) {
  const SoundTree tree;
  LinuxChanmeter chanmeter(directory_.path("channels"), category_, tree.root(),
                           &static_cast<Accounts&>(accounts_));
  const auto sample = [&] {
    Chanmeter::Channels subscribed;
    const auto subscription = chanmeter.createSubscription(
        chanmeter.copyChannelsInGroup(std::nullopt, std::nullopt, error_), subscribed, error_);
    return chanmeter.createSamples(subscription, subscribed, error_);
  };
  const Chanmeter::Samples kernels = sample();
  ASSERT_TRUE(kernels);
  EXPECT_GT(kernels->ownBytes(), 0U);
  EXPECT_EQ(held(), 0U);
  publish("a.json", fileOf("One", 1));
  const Chanmeter::Samples all = sample();
  EXPECT_GT(held(), 0U);
  EXPECT_EQ(all->ownBytes(), kernels->ownBytes() + kChannels * sizeof(ChanmeterRecords::value_type));
}

}  // namespace
}  // namespace tonewerk
