// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/SegmentJournal.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <memory>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <thread>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/journal/Crc32c.h"
#include "platform/linux/journal/FaultyJournalDirectory.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/store/FullDisk.h"
#include "support/InterceptedCalls.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr double kNow = 1'763'633'880.0;
constexpr double kDay = 86'400.0;
constexpr std::string_view kFirst = "00000000000000000001.segment";

class SegmentJournalTest : public testing::Test {
 protected:
  SegmentJournalTest() { restart(); }

  std::string path() const { return directory_.path("journal"); }
  std::string path(std::string_view name) const { return path() + "/" + std::string(name); }
  void restart() {
    journal_.reset();
    journal_ = std::make_unique<SegmentJournal>(std::make_unique<LinuxJournalDirectory>(path()), preferences_,
                                                category_, limits_);
  }
  std::uint64_t append(std::string_view bytes, double at = kNow) {
    return journal_->append(Journal::Kind::kRequest, {at, 7, 1001}, bytes);
  }
  void write(std::string_view bytes, double at = kNow) {
    append(bytes, at);
    EXPECT_TRUE(journal_->write());
  }
  // Each takes a segment for itself.
  void writeSegments(int count, double at = kNow) {
    for (int segment = 0; segment < count; ++segment) write(std::string(limits_.segmentBytes - 100, 'x'), at);
  }
  std::vector<std::string> read() {
    std::vector<std::string> texts;
    reading_ = journal_->read([&texts](const Journal::Record& record) {
      texts.emplace_back(record.bytes);
      return true;
    });
    return texts;
  }
  std::vector<std::string> files() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(path())) {
      names.push_back(entry.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
  }
  std::string contents(std::string_view name) const {
    std::ifstream file(path(name), std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }
  void replace(std::string_view name, std::string_view bytes) const {
    std::ofstream(path(name), std::ios::binary | std::ios::trunc) << bytes;
  }
  void replaceWithFile() const { std::ofstream(path()) << "in the way"; }
  void set(const char* key, const Value& value) {
    preferences_.configure("com.orvane.tonewerk.store", key, value);
  }
  std::vector<std::string> errors() const { return log_.textsAt(LogLevel::kError); }

  TemporaryDirectory directory_;
  MemoryPreferenceStore preferences_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  SegmentJournal::Limits limits_{.segmentBytes = 4096, .pendingBytes = 8192};
  std::unique_ptr<SegmentJournal> journal_;
  Journal::Reading reading_;
};

unsigned modeOf(const std::string& path) {
  struct stat status {};
  EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
  return status.st_mode & 07777U;
}

TEST_F(SegmentJournalTest, OnlyTheOwnerMayReadIt) {
  write("a");
  EXPECT_EQ(modeOf(path()), 0700U);
  EXPECT_EQ(modeOf(path(kFirst)), 0600U);
  std::filesystem::permissions(path(), std::filesystem::perms{0755});
  restart();
  EXPECT_EQ(modeOf(path()), 0700U);
}

TEST_F(SegmentJournalTest, EachProcessBeginsASegmentNamedAfterItsFirstRecord) {
  write("a");
  append("b");
  write("c");
  restart();
  EXPECT_THAT(files(), ElementsAre(kFirst)) << "not before there is a record";
  write("d");
  EXPECT_THAT(files(), ElementsAre(kFirst, "00000000000000000004.segment"));
}

TEST_F(SegmentJournalTest, NoSegmentIsLongerThanItMayBe) {
  for (int at = 0; at < 100; ++at) append(std::string(150, 'x'));
  EXPECT_TRUE(journal_->write());
  EXPECT_THAT(files(), SizeIs(5));
  for (const std::string& name : files()) EXPECT_LE(contents(name).size(), limits_.segmentBytes);
}

TEST_F(SegmentJournalTest, ARequestWithoutAFrameIsStoredAsANotification) {
  journal_->append({kNow, 7, 1001}, "sendMessage", {Value(77), Value(ValueMap{{"a", 1.5}}), std::nullopt});
  EXPECT_TRUE(journal_->write());
  restart();
  const std::vector<std::string> texts = read();
  ASSERT_THAT(texts, SizeIs(1));
  RpcStrings strings;
  RpcFrameReader reader(strings);
  std::string_view bytes = texts.front();
  ASSERT_EQ(reader.next(bytes), RpcFrameReader::Result::kFrame);
  EXPECT_THAT(bytes, IsEmpty());
  const RpcFrame& frame = reader.frame();
  EXPECT_EQ(frame.kind, RpcFrame::Kind::kNotification);
  EXPECT_EQ(frame.method, "sendMessage");
  ASSERT_THAT(frame.arguments, SizeIs(3));
  EXPECT_EQ(frame.arguments[0], Value(77));
  EXPECT_EQ(frame.arguments[1], Value(ValueMap{{"a", 1.5}}));
  EXPECT_FALSE(frame.arguments[2]);
}

// --- Ends of processes and damage ---

TEST_F(SegmentJournalTest, AWriteThatWasCutOffIsNoDamageAndIsRemovedBeforeRecordsFollow) {
  write("first");
  const std::size_t begin = contents(kFirst).size();
  write("second");
  const std::string whole = contents(kFirst);
  for (std::size_t size = begin; size < whole.size(); ++size) {
    std::filesystem::remove_all(path());
    std::filesystem::create_directory(path());
    replace(kFirst, whole.substr(0, size));
    restart();
    EXPECT_THAT(read(), ElementsAre("first"));
    EXPECT_EQ(reading_.tornBytes, size - begin);
    EXPECT_EQ(append("again"), 2U);
    EXPECT_TRUE(journal_->write());
    restart();
    EXPECT_THAT(read(), ElementsAre("first", "again"));
    EXPECT_EQ(reading_.tornBytes + reading_.damagedPlaces, 0U) << size;
  }
}

TEST_F(SegmentJournalTest, DamageInTheMiddleIsCountedAndCostsOnlyItsRecords) {
  for (const char* text : {"first", "second", "third"}) write(text);
  std::string bytes = contents(kFirst);
  bytes[bytes.find("second")] = 'S';
  replace(kFirst, bytes);
  restart();
  EXPECT_THAT(read(), ElementsAre("first", "third"));
  EXPECT_EQ(reading_.records, 2U);
  EXPECT_EQ(reading_.damagedPlaces, 1U);
  EXPECT_EQ(reading_.damagedBytes, kRecordHeadBytes + 6);
  EXPECT_EQ(reading_.tornBytes, 0U);
}

TEST_F(SegmentJournalTest, AnEndThatIsMissingIsDamageWhenSegmentsFollow) {
  write("first");
  write("second");
  const std::string bytes = contents(kFirst);
  restart();
  write("third");
  replace(kFirst, bytes.substr(0, bytes.size() - 1));
  restart();
  EXPECT_THAT(read(), ElementsAre("first", "third"));
  EXPECT_EQ(reading_.damagedPlaces, 1U);
  EXPECT_EQ(reading_.damagedBytes, kRecordHeadBytes + 5);
  EXPECT_EQ(reading_.tornBytes, 0U);
}

TEST_F(SegmentJournalTest, ASegmentOfANewerVersionIsLeftAlone) {
  write("first");
  restart();
  write("newer");
  std::string bytes = contents("00000000000000000002.segment");
  bytes[8] = 2;
  const std::uint32_t crc = crc32c(std::string_view(bytes).substr(0, 16));
  for (std::size_t byte = 0; byte < 4; ++byte)
    bytes[16 + byte] = static_cast<char>(crc >> (8 * byte) & 0xFFU);
  replace("00000000000000000002.segment", bytes);
  restart();
  EXPECT_THAT(errors(), ElementsAre(AllOf(HasSubstr("00000000000000000002.segment is left alone"),
                                          HasSubstr("a newer version of the program has written it"))));
  EXPECT_THAT(read(), ElementsAre("first"));
  EXPECT_GT(append("next"), 2U);
  EXPECT_TRUE(journal_->write());
  journal_->drop(journal_->last() + 1);
  EXPECT_EQ(contents("00000000000000000002.segment"), bytes);
}

TEST_F(SegmentJournalTest, FilesThatAreNoSegmentsAreNotTouched) {
  const std::vector<std::string> names{"1.segment", "notes.txt", "00000000000000000000.segment",
                                       "99999999999999999999.segment", "0000000000000000000x.segment"};
  for (const std::string& name : names) replace(name, "text");
  restart();
  EXPECT_EQ(append("first"), 1U);
  EXPECT_TRUE(journal_->write());
  restart();
  EXPECT_THAT(read(), ElementsAre("first"));
  journal_->drop(2);
  for (const std::string& name : names) EXPECT_EQ(contents(name), "text") << name;
}

TEST_F(SegmentJournalTest, SegmentsThatWereBegunAndHaveNoRecordAreRemovedAtTheStart) {
  write("first");
  replace("00000000000000000002.segment", "");
  replace("00000000000000000003.segment", segmentHead(5));
  replace("00000000000000000009.segment", "TWJo");
  restart();
  EXPECT_THAT(files(), ElementsAre(kFirst, "00000000000000000009.segment"));
  EXPECT_EQ(append("next"), 9U) << "the newest one holds the place of the next number";
  EXPECT_TRUE(journal_->write());
  restart();
  EXPECT_THAT(read(), ElementsAre("first", "next"));
}

// --- Failures ---

// A disk that fills up takes a part of a write.
TEST_F(SegmentJournalTest, WhatDoesNotFitOnTheDiskIsWrittenWhenThereIsRoom) {
  write("first");
  const std::size_t size = contents(kFirst).size();
  for (const std::size_t room : {1U, 47U, 52U, 53U, 60U, 110U}) {
    {
      const FullDisk full(contents(files().back()).size() + room);
      append("in memory");
      append("in memory, too");
      EXPECT_FALSE(journal_->write());
      EXPECT_FALSE(journal_->write());
    }
    EXPECT_TRUE(journal_->write());
  }
  EXPECT_THAT(errors(), SizeIs(12));
  EXPECT_THAT(errors()[0], AllOf(HasSubstr("cannot write"), HasSubstr("File too large")));
  EXPECT_THAT(errors()[1], HasSubstr("goes on; requests given up meanwhile: 0"));
  EXPECT_GT(contents(kFirst).size(), size);
  restart();
  EXPECT_THAT(read(), SizeIs(13));
  EXPECT_EQ(reading_.damagedPlaces + reading_.tornBytes, 0U);
}

TEST_F(SegmentJournalTest, WhileNothingCanBeWrittenTheOldestAreGivenUpAndCounted) {
  write("first");
  {
    const FullDisk full(1);
    for (int at = 2; at <= 1000; ++at) append("number " + std::to_string(at));
    EXPECT_FALSE(journal_->write());
    EXPECT_LE(journal_->bytes(), limits_.pendingBytes + contents(kFirst).size());
  }
  EXPECT_TRUE(journal_->write());
  restart();
  const std::vector<std::string> texts = read();
  ASSERT_GT(texts.size(), 50U);
  EXPECT_EQ(texts.front(), "first");
  EXPECT_EQ(texts.back(), "number 1000");
  EXPECT_EQ(texts[1], "number " + std::to_string(1000 - (texts.size() - 2)));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot write"), HasSubstr("the oldest records are given up"),
                                    HasSubstr("given up meanwhile: " + std::to_string(1000 - texts.size()))));
}

TEST_F(SegmentJournalTest, SaysAtTheEndWhatWasLost) {
  append("never written");
  append("never written");
  journal_.reset();
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("was not written: 2")));
}

TEST_F(SegmentJournalTest, ARequestThatIsTooLongIsLeftOutAndOthersGoOn) {
  EXPECT_EQ(append(std::string(kMaxRecordBytes + 1, 'x')), 1U);
  EXPECT_EQ(append(std::string(kMaxRecordBytes + 1, 'x')), 2U);
  write("next");
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("too long")));
  restart();
  EXPECT_THAT(read(), ElementsAre("next"));
}

TEST_F(SegmentJournalTest, ARecordThatIsLongerThanASegmentHasOneForItself) {
  write("first");
  const std::string longer(limits_.pendingBytes, 'x');
  write(longer);
  write("third");
  EXPECT_THAT(files(), SizeIs(3));
  restart();
  EXPECT_THAT(read(), ElementsAre("first", longer, "third"));
}

TEST_F(SegmentJournalTest, TwoProcessesCannotUseOneDirectory) {
  write("first");
  SegmentJournal second(path(), preferences_, category_);
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("Device or resource busy")));
  EXPECT_EQ(second.read([](const Journal::Record&) { return true; }).records, 0U);
  second.append(Journal::Kind::kRequest, {kNow, 1, 1}, "second's");
  EXPECT_FALSE(second.write());
  EXPECT_THAT(files(), ElementsAre(kFirst));
  write("goes on");
}

// The numbers of both would be the same.
TEST_F(SegmentJournalTest, WhatGotNumbersBeforeTheDirectoryCouldBeUsedIsGivenUpWhenTheyAreTaken) {
  write("first");
  write("second");
  SegmentJournal late(path(), preferences_, category_);
  EXPECT_EQ(late.append(Journal::Kind::kRequest, {kNow, 1, 1}, "early"), 1U);
  EXPECT_FALSE(late.write());
  journal_.reset();
  EXPECT_TRUE(late.write());
  EXPECT_THAT(errors().back(), HasSubstr("given up meanwhile: 1"));
  EXPECT_EQ(late.append(Journal::Kind::kRequest, {kNow, 1, 1}, "third"), 3U);
  EXPECT_TRUE(late.write());
  EXPECT_THAT(contents("00000000000000000003.segment"), HasSubstr("third"));
}

TEST_F(SegmentJournalTest, ADirectoryThatIsRemovedIsMadeAgain) {
  write("first");
  std::filesystem::remove_all(path());
  const std::string needsASegment(limits_.segmentBytes - 100, 'x');
  append(needsASegment);
  EXPECT_FALSE(journal_->write());
  EXPECT_TRUE(journal_->write());
  restart();
  EXPECT_THAT(read(), ElementsAre(needsASegment));
  EXPECT_EQ(append("next"), 3U);
}

TEST_F(SegmentJournalTest, ASegmentThatCannotBeRemovedIsTriedAgainAndSaidOnce) {
  const auto faults = std::make_shared<JournalFaults>();
  journal_.reset();
  journal_ = std::make_unique<SegmentJournal>(std::make_unique<FaultyJournalDirectory>(path(), faults),
                                              preferences_, category_, limits_);
  writeSegments(2);
  faults->failing = faults->operations + 1;
  faults->count = 2;
  journal_->drop(2);
  journal_->drop(2);
  EXPECT_THAT(files(), SizeIs(2));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot remove")));
  journal_->drop(2);
  EXPECT_THAT(files(), SizeIs(1));
}

// --- Dropping ---

TEST_F(SegmentJournalTest, ALargeSegmentOfDroppedRecordsIsReplacedByAnEmptyOne) {
  limits_ = {.segmentBytes = 64 << 10, .pendingBytes = 128 << 10};
  restart();
  write("small");
  journal_->drop(2);
  EXPECT_THAT(files(), ElementsAre(kFirst)) << "as long as it is small";
  writeSegments(1);
  journal_->drop(3);
  EXPECT_THAT(files(), ElementsAre("00000000000000000003.segment"));
  EXPECT_EQ(contents("00000000000000000003.segment").size(), kSegmentHeadBytes);
  write("third");
  EXPECT_THAT(files(), ElementsAre("00000000000000000003.segment"));
  restart();
  EXPECT_THAT(read(), ElementsAre("third"));
}

TEST_F(SegmentJournalTest, ANewestSegmentWithoutAWholeRecordStaysWhenAllIsDropped) {
  write("lost");
  replace(kFirst, contents(kFirst).substr(0, kSegmentHeadBytes));
  limits_.segmentBytes = kSegmentHeadBytes;  // so that a head alone counts as large
  restart();
  journal_->drop(1);
  EXPECT_THAT(files(), ElementsAre(kFirst));
  write("next");
  restart();
  EXPECT_THAT(read(), ElementsAre("next"));
}

// The replacement is made in a new directory, where there is nothing to replace.
TEST_F(SegmentJournalTest, ADirectoryThatIsRemovedBeforeALargeSegmentIsReplacedIsMadeAgain) {
  writeSegments(1);
  std::filesystem::remove_all(path());
  journal_->drop(2);
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot write")));
  journal_->drop(2);
  EXPECT_THAT(files(), ElementsAre("00000000000000000002.segment"));
  write("next");
  restart();
  EXPECT_THAT(read(), ElementsAre("next"));
}

TEST_F(SegmentJournalTest, DroppedSegmentsAreKeptAsOldOnesForSomeDays) {
  set("journal_days", 2);
  writeSegments(1, kNow);
  writeSegments(1, kNow + kDay);
  writeSegments(1, kNow + 1.5 * kDay);
  journal_->drop(3);
  EXPECT_THAT(files(), ElementsAre("00000000000000000001.old", "00000000000000000002.old",
                                   "00000000000000000003.segment"));
  EXPECT_LT(journal_->bytes(), limits_.segmentBytes) << "old segments do not count";
  restart();
  EXPECT_THAT(read(), SizeIs(1)) << "old segments are not read";
  writeSegments(1, kNow + 2.5 * kDay);
  EXPECT_THAT(files(), ElementsAre("00000000000000000002.old", "00000000000000000003.segment",
                                   "00000000000000000004.segment"));
  writeSegments(1, kNow + 3.1 * kDay);
  EXPECT_THAT(files(), ElementsAre("00000000000000000003.segment", "00000000000000000004.segment",
                                   "00000000000000000005.segment"));
}

TEST_F(SegmentJournalTest, TheOldestOldSegmentsGoWhenAllTakeTooMuch) {
  limits_ = {.segmentBytes = 512 << 10, .pendingBytes = 1 << 20};
  restart();
  set("journal_days", 100);
  set("journal_megabytes", 2);
  writeSegments(6);
  journal_->drop(6);
  EXPECT_THAT(files(), ElementsAre("00000000000000000003.old", "00000000000000000004.old",
                                   "00000000000000000005.old", "00000000000000000006.segment"));
}

TEST_F(SegmentJournalTest, OldSegmentsGoWhenNoneAreWantedAnyMore) {
  set("journal_days", 100);
  writeSegments(3);
  journal_->drop(3);
  set("journal_days", 0);
  restart();
  EXPECT_THAT(files(), ElementsAre("00000000000000000003.segment"));
}

TEST_F(SegmentJournalTest, AWrongPreferenceIsSaidOnce) {
  set("journal_days", "some");
  writeSegments(4);
  journal_->drop(2);
  journal_->drop(4);
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("journal_days must be a number from 0, not \"some\"")));
  EXPECT_THAT(files(), SizeIs(1));
}

// --- Syncing ---

TEST_F(SegmentJournalTest, AnotherThreadMaySyncWhileRecordsAreAdded) {
  std::atomic<bool> isDone = false;
  std::uint64_t syncs = 0;
  std::thread syncing([&] {
    while (!isDone) {
      EXPECT_TRUE(journal_->sync());
      EXPECT_LT(journal_->bytes(), std::uint64_t{1} << 30);
      ++syncs;
    }
  });
  for (std::uint64_t at = 1; at <= 2000; ++at) {
    write(std::string(100, 'x'));
    if (at % 50 == 0) journal_->drop(at - 40);
  }
  isDone = true;
  syncing.join();
  EXPECT_TRUE(journal_->sync());
  EXPECT_GT(syncs, 0U);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(SegmentJournalTest, AFailedSyncIsSaidOnceAndTriedAgain) {
  const auto faults = std::make_shared<JournalFaults>();
  journal_.reset();
  journal_ = std::make_unique<SegmentJournal>(std::make_unique<FaultyJournalDirectory>(path(), faults),
                                              preferences_, category_, limits_);
  write("first");
  faults->failing = faults->operations + 1;
  faults->count = 4;
  EXPECT_FALSE(journal_->sync());
  EXPECT_FALSE(journal_->sync());
  EXPECT_TRUE(journal_->sync());
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot bring"), HasSubstr("to the disk again")));
}

std::uint64_t bytesWrittenByThisThread() {
  std::ifstream file("/proc/thread-self/io");
  std::string key;
  std::uint64_t value = 0;
  while (file >> key >> value) {
    if (key == "wchar:") return value;
  }
  return 0;
}

// After a failed sync, Linux takes the bytes for written. A second sync would succeed and they would not be
// on the disk.
TEST_F(SegmentJournalTest, WhatASyncCouldNotBringToTheDiskIsWrittenAgain) {
  const std::string bytes(3000, 'x');
  std::uint64_t writtenAgain = 0;
  int syncs = 0;
  const bool isTried = runIntercepted(
      SYS_fdatasync, [&syncs](const seccomp_data&) { return ++syncs == 2 ? EIO : 0; },
      [&] {
        write("synced before");
        EXPECT_TRUE(journal_->sync());
        write(bytes);
        EXPECT_FALSE(journal_->sync());
        const std::uint64_t before = bytesWrittenByThisThread();
        EXPECT_TRUE(journal_->sync());
        writtenAgain = bytesWrittenByThisThread() - before;
        write("after");
        EXPECT_TRUE(journal_->sync());
      });
  if (!isTried) GTEST_SKIP() << "system calls cannot be intercepted here";
  EXPECT_EQ(syncs, 4);
  EXPECT_GE(writtenAgain, kRecordHeadBytes + bytes.size());
  EXPECT_LT(writtenAgain, kRecordHeadBytes + bytes.size() + 500);  // a sanitizer writes some bytes, too
  restart();
  EXPECT_THAT(read(), ElementsAre("synced before", bytes, "after"));
}

// What this process has not read, the next one plays.
TEST_F(SegmentJournalTest, SegmentsThatAreFoundLateAreLeftToTheNextProcess) {
  write("before");
  journal_.reset();
  const std::filesystem::path away = path() + ".away";
  std::filesystem::rename(path(), away);
  replaceWithFile();
  restart();
  EXPECT_EQ(journal_->bytes(), 0U);
  std::filesystem::remove(path());
  std::filesystem::rename(away, path());
  append("given up, because its number is taken");
  EXPECT_TRUE(journal_->write());
  write("after");
  journal_->drop(journal_->last());
  restart();
  EXPECT_THAT(read(), ElementsAre("before", "after"));
}

}  // namespace
}  // namespace tonewerk
