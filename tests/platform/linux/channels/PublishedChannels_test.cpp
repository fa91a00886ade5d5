// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/PublishedChannels.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>
#include <vector>

#include "platform/chanmeter/ChanmeterChannelSet.h"
#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "support/ChannelRecords.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

constexpr char kLeftOut[] = "; the channels concerned are left out)";

std::string channelOf(const std::string& name, int value = 1) {
  return R"({"group": "Speaker", "name": ")" + name + R"(", "format": "simple", "value": )" +
         std::to_string(value) + "}";
}
std::string fileOf(const std::string& driver, const std::string& channels) {
  return R"({"driver": ")" + driver + R"(", "channels": [)" + channels + "]}";
}
std::string manyChannels(std::size_t count) {
  std::string channels;
  for (std::size_t number = 0; number < count; ++number) {
    channels.append(number == 0 ? "" : ",").append(R"({"group":"","name":"","format":"x"})");
  }
  return fileOf("d", channels);
}

class PublishedChannelsTest : public testing::Test {
 protected:
  PublishedChannelsTest() { std::filesystem::create_directory(channels()); }

  std::string channels() const { return directory_.path("channels"); }
  std::string path(const std::string& name) const { return channels() + "/" + name; }
  // Replaces a file by a new one, as publishers do.
  void publish(const std::string& name, const std::string& text) const {
    std::ofstream(directory_.path("new")) << text;
    std::filesystem::rename(directory_.path("new"), path(name));
  }

  ChanmeterRecords read(const ChannelChoice& choice) {
    ChanmeterRecords records;
    error_.reset();
    published_.read(choice, records, error_);
    return records;
  }
  ChanmeterRecords readAll() { return read(ChannelChoice(none_, none_)); }
  // For example "Amp Rail Volts=12".
  static std::vector<std::string> namesOf(const ChanmeterRecords& records) {
    std::vector<std::string> names;
    for (const auto& record : records) {
      names.push_back(*record->key.driver + " " + *record->key.name + "=" + std::to_string(record->value));
    }
    return names;
  }
  std::int64_t code() const { return error_.value_or(ChanmeterError{}).code; }
  std::vector<std::string> errors() const { return log_.textsOf("twrs", LogLevel::kError); }

  const std::optional<std::string> none_;
  TemporaryDirectory directory_;
  MemoryLog log_;
  const LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  PublishedChannels published_{channels(), category_};
  std::optional<ChanmeterError> error_;
};

TEST_F(PublishedChannelsTest, HasNothingWithoutADirectory) {
  std::filesystem::remove(channels());
  EXPECT_THAT(readAll(), IsEmpty());
  EXPECT_EQ(code(), 0);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(PublishedChannelsTest, LogsWhyTheDirectoryCannotBeRead) {
  std::filesystem::remove(channels());
  std::ofstream(channels()) << "a file";
  EXPECT_THAT(readAll(), IsEmpty());
  EXPECT_EQ(code(), kChannelsUnreadable);
  EXPECT_THAT(errors(), ElementsAre(channels() + ": Not a directory (failure 2" + kLeftOut));
}

TEST_F(PublishedChannelsTest, ReadsFilesInTheOrderOfTheirNames) {
  publish("b.json", fileOf("B", channelOf("x", 2)));
  publish("a.json", fileOf("A", channelOf("z", 1) + "," + channelOf("y", 3)));
  EXPECT_THAT(namesOf(readAll()), ElementsAre("A z=1", "A y=3", "B x=2"));
  EXPECT_EQ(code(), 0);
}

TEST_F(PublishedChannelsTest, IgnoresOtherNames) {
  for (const char* name : {"a.txt", ".a.json", ".json", "json", "a.json.new", "a.JSON"}) {
    publish(name, fileOf("A", channelOf("x")));
  }
  EXPECT_THAT(readAll(), IsEmpty());
  EXPECT_EQ(code(), 0);
}

TEST_F(PublishedChannelsTest, GivesTheChosenChannelsOnly) {
  publish("a.json", fileOf("A", channelOf("x") + "," + channelOf("y")));
  const ChanmeterChannelSet wanted(
      std::vector<ChanmeterKey>{{.driver = "A", .group = "Speaker", .name = "y"}});
  EXPECT_THAT(namesOf(read(ChannelChoice(wanted))), ElementsAre("A y=1"));
  const std::optional<std::string> group = "Tx";
  EXPECT_THAT(read(ChannelChoice(group, none_)), IsEmpty());
  EXPECT_EQ(code(), 0);
}

TEST_F(PublishedChannelsTest, NoticesNewRemovedAndChangedFiles) {
  publish("a.json", fileOf("A", channelOf("x", 1)));
  EXPECT_THAT(namesOf(readAll()), ElementsAre("A x=1"));
  publish("a.json", fileOf("A", channelOf("x", 2)));
  publish("b.json", fileOf("B", channelOf("y", 1)));
  EXPECT_THAT(namesOf(readAll()), ElementsAre("A x=2", "B y=1"));
  std::filesystem::remove(path("a.json"));
  EXPECT_THAT(namesOf(readAll()), ElementsAre("B y=1"));
  EXPECT_EQ(code(), 0);
}

TEST_F(PublishedChannelsTest, KeepsWhatItParsedAsLongAsTheTextIsTheSame) {
  publish("a.json", fileOf("A", channelOf("x")));
  const ChanmeterRecords first = readAll();
  publish("a.json", fileOf("A", channelOf("x")));
  EXPECT_EQ(readAll().at(0), first.at(0));
  publish("a.json", fileOf("A", channelOf("x", 7)));
  EXPECT_NE(readAll().at(0), first.at(0));
}

TEST_F(PublishedChannelsTest, LeavesOutTheDriverWhoseFileIsWrongAndNoOther) {
  publish("a.json", fileOf("A", channelOf("x")));
  publish("b.json", "{\"driver\": \"B\",\n \"channels\": [}");
  publish("c.json", fileOf("C", channelOf("x") + R"(,{"group": "Tx", "name": "n", "format": "simple"})"));
  publish("d.json", fileOf("D", channelOf("x")));
  EXPECT_THAT(namesOf(readAll()), ElementsAre("A x=1", "D x=1"));
  EXPECT_EQ(code(), kChannelsNotJson);
  EXPECT_THAT(
      errors(),
      ElementsAre(testing::AllOf(testing::StartsWith(path("b.json") + ": line 2, column 15: syntax error"),
                                 testing::EndsWith("(failure 4" + std::string(kLeftOut))),
                  path("c.json") + ": /channels/1/value is missing (failure 5" + kLeftOut));
}

TEST_F(PublishedChannelsTest, LogsAFailureOnceUntilItChanges) {
  publish("a.json", fileOf("A", "7"));
  readAll();
  EXPECT_THAT(readAll(), IsEmpty());
  EXPECT_EQ(code(), kChannelsWrongType);
  EXPECT_THAT(errors(), SizeIs(1));
  publish("a.json", fileOf("A", channelOf("x") + ",8"));
  readAll();
  EXPECT_THAT(errors(), SizeIs(2));
  publish("a.json", fileOf("A", channelOf("x")));
  EXPECT_THAT(readAll(), SizeIs(1));
  EXPECT_EQ(code(), 0);
  publish("a.json", fileOf("A", channelOf("x") + ",8"));
  readAll();
  EXPECT_THAT(errors(), SizeIs(3));
}

TEST_F(PublishedChannelsTest, FailsForTheSubscribersOfThatDriverOnly) {
  publish("a.json", fileOf("A", channelOf("x")));
  publish("b.json", fileOf("B", channelOf("x")));
  readAll();
  publish("b.json", "");
  publish("c.json", "");
  const auto codeFor = [this](const char* driver) {
    const ChanmeterChannelSet wanted(
        std::vector<ChanmeterKey>{{.driver = driver, .group = "Speaker", .name = "x"}});
    read(ChannelChoice(wanted));
    return code();
  };
  EXPECT_EQ(codeFor("A"), 0);
  EXPECT_EQ(codeFor("B"), kChannelsNotJson);
  EXPECT_EQ(codeFor("C"), 0);
}

TEST_F(PublishedChannelsTest, ReadsAFileOfOneMebibyteAndNoneLarger) {
  std::string text = fileOf("A", channelOf("x"));
  text.resize(PublishedChannels::kMaxFileBytes, ' ');
  publish("a.json", text);
  EXPECT_THAT(readAll(), SizeIs(1));
  publish("a.json", text + " ");
  EXPECT_THAT(readAll(), IsEmpty());
  EXPECT_EQ(code(), kChannelsTooLarge);
  EXPECT_THAT(errors(), ElementsAre(path("a.json") + ": is larger than 1 MiB (failure 3" + kLeftOut));
}

TEST_F(PublishedChannelsTest, LeavesOutOtherThanRegularFiles) {
  ASSERT_EQ(mkfifo(path("a.json").c_str(), 0600), 0);
  std::filesystem::create_directory(path("b.json"));
  std::filesystem::create_symlink("c.json", path("c.json"));
  std::filesystem::create_symlink("nowhere", path("d.json"));
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_un address{.sun_family = AF_UNIX, .sun_path = {}};
  path("e.json").copy(address.sun_path, sizeof address.sun_path - 1);
  ASSERT_EQ(bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  publish("f.json", fileOf("F", channelOf("x")));
  EXPECT_THAT(namesOf(readAll()), ElementsAre("F x=1"));
  EXPECT_EQ(code(), kChannelsUnreadable);
  EXPECT_THAT(errors(),
              ElementsAre(path("a.json") + ": is no regular file (failure 2" + kLeftOut,
                          path("b.json") + ": Is a directory (failure 2" + kLeftOut,
                          path("c.json") + ": Too many levels of symbolic links (failure 2" + kLeftOut,
                          HasSubstr(path("e.json") + ": ")));
}

TEST_F(PublishedChannelsTest, LogsWhyAFileCannotBeRead) {
  if (geteuid() == 0) GTEST_SKIP() << "root may read everything";
  publish("a.json", fileOf("A", channelOf("x")));
  std::filesystem::permissions(path("a.json"), std::filesystem::perms::none);
  EXPECT_THAT(readAll(), IsEmpty());
  EXPECT_EQ(code(), kChannelsUnreadable);
  EXPECT_THAT(errors(), ElementsAre(path("a.json") + ": Permission denied (failure 2" + kLeftOut));
}

TEST_F(PublishedChannelsTest, FollowsALinkToAFile) {
  std::ofstream(directory_.path("elsewhere")) << fileOf("A", channelOf("x"));
  std::filesystem::create_symlink(directory_.path("elsewhere"), path("a.json"));
  EXPECT_THAT(namesOf(readAll()), ElementsAre("A x=1"));
}

TEST_F(PublishedChannelsTest, ReadsFilesUpToTheLimit) {
  for (std::size_t number = 0; number < PublishedChannels::kMaxFiles; ++number) {
    const std::string digits = std::to_string(1000 + number);
    publish(digits + ".json", fileOf(digits, channelOf("x")));
  }
  EXPECT_THAT(readAll(), SizeIs(PublishedChannels::kMaxFiles));
  EXPECT_EQ(code(), 0);
  publish("9999.json", fileOf("late", channelOf("x")));
  EXPECT_THAT(readAll(), SizeIs(PublishedChannels::kMaxFiles));
  EXPECT_EQ(code(), kChannelsTooMany);
  EXPECT_THAT(errors(), ElementsAre(channels() +
                                    ": holds more than 256 channel files; left out is all from 9999.json on "
                                    "(failure 9" +
                                    kLeftOut));
}

TEST_F(PublishedChannelsTest, ReadsEntriesUpToTheLimit) {
  for (std::size_t number = 0; number < PublishedChannels::kMaxEntries; ++number) {
    std::ofstream(path(std::to_string(number)));
  }
  readAll();
  EXPECT_EQ(code(), 0);
  std::ofstream(path("one more"));
  readAll();
  EXPECT_EQ(code(), kChannelsTooMany);
  EXPECT_THAT(errors(), ElementsAre(channels() +
                                    ": holds more than 4096 entries, of which the others are left "
                                    "out (failure 9" +
                                    kLeftOut));
}

TEST_F(PublishedChannelsTest, ReadsBytesUpToTheLimit) {
  std::string text = fileOf("A", channelOf("x"));
  text.resize(PublishedChannels::kMaxFileBytes, ' ');
  const std::size_t files = PublishedChannels::kMaxBytes / PublishedChannels::kMaxFileBytes;
  for (std::size_t number = 0; number < files; ++number) publish(std::to_string(number) + ".json", text);
  EXPECT_THAT(readAll(), SizeIs(files));
  EXPECT_EQ(code(), 0);
  publish("z.json", fileOf("Z", channelOf("x")));
  EXPECT_THAT(readAll(), SizeIs(files));
  EXPECT_EQ(code(), kChannelsTooMany);
  EXPECT_THAT(errors(), ElementsAre(path("z.json") +
                                    ": goes past the 8388608 bytes that all files together may "
                                    "have (failure 9" +
                                    kLeftOut));
  std::filesystem::remove(path("0.json"));
  EXPECT_THAT(readAll(), SizeIs(files));
  EXPECT_EQ(code(), 0);
}

// Otherwise, files that are added one before the other, with a reading after each, would all be kept in
// memory.
TEST_F(PublishedChannelsTest, FreesAFileThatIsBeyondTheLimitNow) {
  publish("z.json", fileOf("Z", channelOf("x")));
  const std::weak_ptr<const ChanmeterRecord> record = readAll().at(0);
  EXPECT_FALSE(record.expired());
  std::string text = fileOf("A", channelOf("x"));
  text.resize(PublishedChannels::kMaxFileBytes, ' ');
  const std::size_t files = PublishedChannels::kMaxBytes / PublishedChannels::kMaxFileBytes;
  for (std::size_t number = 0; number < files; ++number) publish(std::to_string(number) + ".json", text);
  EXPECT_THAT(readAll(), SizeIs(files));
  EXPECT_EQ(code(), kChannelsTooMany);
  EXPECT_TRUE(record.expired());
  std::filesystem::remove(path("0.json"));
  EXPECT_EQ(namesOf(readAll()).back(), "Z x=1");
}

TEST_F(PublishedChannelsTest, GivesChannelsUpToTheLimit) {
  publish("a.json", manyChannels(PublishedChannels::kMaxChannels / 2));
  publish("b.json", manyChannels(PublishedChannels::kMaxChannels / 2));
  EXPECT_THAT(readAll(), SizeIs(PublishedChannels::kMaxChannels));
  EXPECT_EQ(code(), 0);
  publish("c.json", manyChannels(1));
  EXPECT_THAT(readAll(), SizeIs(PublishedChannels::kMaxChannels));
  EXPECT_EQ(code(), kChannelsTooMany);
  EXPECT_THAT(errors(), ElementsAre(path("c.json") +
                                    ": goes past the 32768 channels that all files together may "
                                    "have (failure 9" +
                                    kLeftOut));
}

}  // namespace
}  // namespace tonewerk
