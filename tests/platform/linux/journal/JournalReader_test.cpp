// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/JournalReader.h"

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gmock/gmock.h>
#include <iterator>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/journal/Crc32c.h"
#include "platform/linux/journal/SegmentFormat.h"
#include "platform/linux/journal/SegmentJournal.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr double kNow = 1'763'633'880.0;
constexpr std::string_view kFirst = "00000000000000000001.segment";

// A journal that another object uses, as a daemon does.
class JournalReaderTest : public testing::Test {
 protected:
  JournalReaderTest() { restart(); }

  std::string path() const { return directory_.path("journal"); }
  std::string path(std::string_view name) const { return path() + "/" + std::string(name); }
  void restart() {
    journal_.reset();
    journal_ = std::make_unique<SegmentJournal>(std::make_unique<LinuxJournalDirectory>(path()), preferences_,
                                                category_, limits_);
  }
  void write(std::string_view bytes) {
    journal_->append(Journal::Kind::kRequest, {kNow, 7, 1001}, bytes);
    EXPECT_TRUE(journal_->write());
  }
  // A text that takes a segment for itself.
  std::string longText(char letter) const { return std::string(limits_.segmentBytes - 100, letter); }
  void keepOldSegments() { preferences_.configure("com.orvane.tonewerk.store", "journal_days", 1); }

  // Reads everything. The texts of another process than the one before begin with "/". `onFirst` runs after
  // the first record was read.
  std::vector<std::string> read(const std::function<void()>& onFirst = [] {}) {
    std::vector<std::string> texts;
    LinuxJournalDirectory directory(path());
    EXPECT_FALSE(directory.openToRead());
    reader_.emplace(directory);
    EXPECT_FALSE(reader_->read([&](const Journal::Record& record, bool isFirstOfProcess) {
      texts.push_back((isFirstOfProcess ? "/" : "") + std::string(record.bytes.substr(0, 20)));
      if (texts.size() == 1) onFirst();
      return true;
    }));
    return texts;
  }
  std::string contents(std::string_view name) const {
    std::ifstream file(path(name), std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }
  void replace(std::string_view name, std::string_view bytes) const {
    std::ofstream(path(name), std::ios::binary | std::ios::trunc) << bytes;
  }
  void damage(std::string_view name, std::string_view text) const {
    std::string bytes = contents(name);
    bytes[bytes.find(text)] ^= 1;
    replace(name, bytes);
  }
  // The bytes of all files.
  std::map<std::string, std::string> files() const {
    std::map<std::string, std::string> found;
    for (const auto& entry : std::filesystem::directory_iterator(path())) {
      const std::string name = entry.path().filename();
      found[name] = contents(name);
    }
    return found;
  }

  TemporaryDirectory directory_;
  MemoryPreferenceStore preferences_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  SegmentJournal::Limits limits_{.segmentBytes = 4096, .pendingBytes = 8192};
  std::unique_ptr<SegmentJournal> journal_;
  std::optional<JournalReader> reader_;
};

TEST_F(JournalReaderTest, ReadsWhatARunningDaemonWrites) {
  write("a");
  write("b");
  EXPECT_THAT(read(), ElementsAre("a", "b"));
  write("c");
  EXPECT_THAT(read(), ElementsAre("a", "b", "c"));
  EXPECT_EQ(reader_->reading().records, 3U);
  EXPECT_EQ(reader_->missing() + reader_->reading().damagedPlaces + reader_->reading().tornBytes, 0U);
}

TEST_F(JournalReaderTest, ReadsOldSegmentsBeforeTheOthers) {
  keepOldSegments();
  for (const char letter : {'a', 'b', 'c'}) write(longText(letter));
  journal_->drop(3);
  ASSERT_EQ(files().count("00000000000000000001.old"), 1U);
  EXPECT_THAT(read(), ElementsAre(std::string(20, 'a'), std::string(20, 'b'), std::string(20, 'c')));
}

TEST_F(JournalReaderTest, ChangesNothing) {
  write("a");
  const std::string whole = contents(kFirst);
  replace(kFirst, whole + whole.substr(kSegmentHeadBytes, 30));
  std::filesystem::permissions(path(), std::filesystem::perms{0755});
  const auto before = files();
  EXPECT_THAT(read(), ElementsAre("a"));
  EXPECT_EQ(files(), before);
  EXPECT_EQ(std::filesystem::status(path()).permissions(), std::filesystem::perms{0755});
}

TEST_F(JournalReaderTest, MakesNoDirectory) {
  LinuxJournalDirectory directory(directory_.path("state/journal"));
  EXPECT_EQ(directory.openToRead(), std::errc::no_such_file_or_directory);
  EXPECT_FALSE(std::filesystem::exists(directory_.path("state")));
}

TEST_F(JournalReaderTest, ClaimsNothing) {
  write("a");
  journal_.reset();
  LinuxJournalDirectory reading(path());
  ASSERT_FALSE(reading.openToRead());
  restart();
  write("b");
  EXPECT_THAT(log_.textsAt(LogLevel::kError), IsEmpty());
}

TEST_F(JournalReaderTest, SaysWhereAnotherProcessBegins) {
  write("a");
  write("b");
  restart();
  write("c");
  restart();
  restart();
  write("d");
  write("e");
  EXPECT_THAT(read(), ElementsAre("a", "b", "/c", "/d", "e"));
}

TEST_F(JournalReaderTest, ASegmentOfTheSameProcessIsNoneOfAnother) {
  write(longText('a'));
  write(longText('b'));
  EXPECT_THAT(read(), ElementsAre(std::string(20, 'a'), std::string(20, 'b')));
}

// --- While the daemon works ---

TEST_F(JournalReaderTest, ASegmentThatBecomesOldMeanwhileIsRead) {
  keepOldSegments();
  for (const char letter : {'a', 'b', 'c'}) write(longText(letter));
  EXPECT_THAT(read([this] { journal_->drop(3); }), SizeIs(3));
  ASSERT_EQ(files().count("00000000000000000002.old"), 1U);
  EXPECT_EQ(reader_->missing(), 0U);
}

TEST_F(JournalReaderTest, ASegmentThatIsRemovedMeanwhileIsNoDamage) {
  for (const char letter : {'a', 'b', 'c'}) write(longText(letter));
  EXPECT_THAT(read([this] { journal_->drop(3); }), ElementsAre(std::string(20, 'a'), std::string(20, 'c')));
  EXPECT_EQ(reader_->missing() + reader_->reading().damagedPlaces, 0U);
  EXPECT_THAT(reader_->unread(), IsEmpty());
}

TEST_F(JournalReaderTest, WhatIsWrittenAfterItsBeginIsLeftOut) {
  write(longText('a'));
  EXPECT_THAT(read([this] { write(longText('b')); }), SizeIs(1));
}

TEST_F(JournalReaderTest, ARecordThatIsBeingWrittenIsNoDamage) {
  write("a");
  write("b");
  const std::string whole = contents(kFirst);
  for (std::size_t missing = 1; missing <= kRecordHeadBytes; ++missing) {
    replace(kFirst, whole.substr(0, whole.size() - missing));
    EXPECT_THAT(read(), ElementsAre("a"));
    EXPECT_EQ(reader_->reading().tornBytes, kRecordHeadBytes + 1 - missing);
    EXPECT_EQ(reader_->missing() + reader_->reading().damagedPlaces, 0U);
  }
}

// --- Losses ---

TEST_F(JournalReaderTest, CountsTheRecordsThatDamageCosts) {
  for (const char* text : {"first", "second", "third", "fourth"}) write(text);
  damage(kFirst, "second");
  damage(kFirst, "third");
  EXPECT_THAT(read(), ElementsAre("first", "fourth"));
  EXPECT_EQ(reader_->reading().damagedPlaces, 1U);
  EXPECT_EQ(reader_->missing(), 2U);
}

TEST_F(JournalReaderTest, CountsThoseAtTheBeginOfTheJournalAndAtTheEndOfASegment) {
  for (const char* text : {"first", "second", "third"}) write(text);
  restart();
  write("fourth");
  damage(kFirst, "first");
  damage(kFirst, "third");
  EXPECT_THAT(read(), ElementsAre("second", "/fourth"));
  EXPECT_EQ(reader_->reading().damagedPlaces, 2U);
  EXPECT_EQ(reader_->missing(), 2U);
}

TEST_F(JournalReaderTest, CountsRecordsThatWereGivenUp) {
  write("a");
  journal_->append(Journal::Kind::kRequest, {kNow, 7, 1001}, std::string(kMaxRecordBytes + 1, 'x'));
  write("c");
  EXPECT_THAT(read(), ElementsAre("a", "c"));
  EXPECT_EQ(reader_->missing(), 1U);
  EXPECT_EQ(reader_->reading().damagedPlaces, 0U);
}

TEST_F(JournalReaderTest, NumbersThatAProcessLeavesOutAreNotMissing) {
  write("a");
  restart();
  journal_->continueAfter(100);
  write("b");
  EXPECT_THAT(read(), ElementsAre("a", "/b"));
  EXPECT_EQ(reader_->missing(), 0U);
}

TEST_F(JournalReaderTest, NamesASegmentOfANewerVersion) {
  write("first");
  restart();
  write("newer");
  restart();
  write("third");
  const std::string name = "00000000000000000002.segment";
  std::string bytes = contents(name);
  bytes[8] = 2;
  const std::uint32_t crc = crc32c(std::string_view(bytes).substr(0, 16));
  for (std::size_t byte = 0; byte < 4; ++byte)
    bytes[16 + byte] = static_cast<char>(crc >> (8 * byte) & 0xFFU);
  replace(name, bytes);
  EXPECT_THAT(read(), ElementsAre("first", "/third"));
  EXPECT_THAT(reader_->unread(), ElementsAre(name + ": a newer version of the program has written it"));
  EXPECT_EQ(reader_->missing(), 0U) << "they are in the segment that is named";
}

TEST_F(JournalReaderTest, FilesThatAreNoSegmentsAreNotRead) {
  write("a");
  for (const char* name :
       {"1.segment", "notes.txt", "00000000000000000000.old", "0000000000000000000x.segment"})
    replace(name, "text");
  EXPECT_THAT(read(), ElementsAre("a"));
  EXPECT_EQ(reader_->reading().damagedPlaces, 0U);
}

}  // namespace
}  // namespace tonewerk
