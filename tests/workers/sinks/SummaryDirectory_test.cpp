// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/SummaryDirectory.h"

#include <gmock/gmock.h>
#include <string>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

constexpr char kDirectory[] = "/logs/Audio/Reporting";
constexpr double kDay = 86'400;
constexpr std::size_t kMegabyte = std::size_t{1} << 20U;

class SummaryDirectoryTest : public ReportingTest {
 protected:
  // Adds a file that was written at this time, and returns its path.
  std::string add(const std::string& name, double at, std::size_t bytes = 10) {
    std::string path = std::string(kDirectory) + "/20251120-111800+0100-" + name + ".json";
    const double now = test.clock.now();
    test.clock.setNow(at);
    test.files.addFile(path, std::string(bytes, 'x'), at);
    test.clock.setNow(now);
    return path;
  }
  // Adds files of today, so that age counts.
  void addWitnesses() {
    for (std::size_t file = 0; file < SummaryDirectory::kWitnesses; ++file) {
      add("witness" + std::to_string(file), test.clock.now() - 1.0 + 0.01 * static_cast<double>(file));
    }
  }
  void setBound(std::string_view key, double value) {
    EXPECT_FALSE(test.preferences.write(SummaryDirectory::kPreferenceDomain, key, value));
  }

  SummaryDirectory directory{kDirectory};
};

TEST_F(SummaryDirectoryTest, RemovesTheOldestFilesWhenAllTakeTooMuch) {
  setBound("summary_megabytes", 3);
  const double now = test.clock.now();
  const std::string oldest = add("a", now - 30, kMegabyte);
  const std::string middle = add("b", now - 20, kMegabyte);
  const std::string newer = add("c", now - 10, kMegabyte);
  const std::string newest = add("d", now, kMegabyte / 2);
  directory.tidy();
  EXPECT_THAT(test.files.files(), ElementsAre(middle, newer, newest));
  directory.tidy();
  EXPECT_THAT(test.files.files(), SizeIs(3));
}

TEST_F(SummaryDirectoryTest, KeepsTheNewestFileEvenWhenItIsTooLarge) {
  setBound("summary_megabytes", 1);
  add("a", test.clock.now() - 10);
  const std::string newest = add("b", test.clock.now(), 2 * kMegabyte);
  directory.tidy();
  EXPECT_THAT(test.files.files(), ElementsAre(newest));
}

TEST_F(SummaryDirectoryTest, RemovesFilesThatAreTooOld) {
  addWitnesses();
  const std::string old = add("old", test.clock.now() - 30.1 * kDay);
  const std::string young = add("young", test.clock.now() - 29.9 * kDay);
  directory.tidy();
  EXPECT_THAT(test.files.files(), Not(Contains(old)));
  EXPECT_THAT(test.files.files(), Contains(young));
  setBound("summary_days", 1);
  directory.tidy();
  EXPECT_THAT(test.files.files(), SizeIs(SummaryDirectory::kWitnesses));
}

TEST_F(SummaryDirectoryTest, AClockThatJumpsAheadTakesNoFilesAlong) {
  for (int file = 0; file < 20; ++file) add(std::to_string(file), test.clock.now() + file);
  test.clock.advance(3'650 * kDay);
  add("future", test.clock.now());
  directory.tidy();
  EXPECT_THAT(test.files.files(), SizeIs(21));
}

TEST_F(SummaryDirectoryTest, FilesFromTheFutureTakeNoFilesAlong) {
  for (int file = 0; file < 20; ++file) add("f" + std::to_string(file), test.clock.now() + 3'650 * kDay);
  const std::string present = add("present", test.clock.now());
  directory.tidy();
  EXPECT_THAT(test.files.files(), Contains(present));
}

// The clock was ahead when they were written.
TEST_F(SummaryDirectoryTest, FilesFromTheFutureAreRemovedBeforeNewOnesWhenAllTakeTooMuch) {
  setBound("summary_megabytes", 3);
  const double now = test.clock.now();
  add("f1", now + 400 * kDay, kMegabyte);
  const std::string future = add("f2", now + 401 * kDay, kMegabyte);
  const std::string older = add("p1", now - 10, kMegabyte);
  const std::string newest = add("p2", now, kMegabyte / 2);
  directory.tidy();
  EXPECT_THAT(test.files.files(), ElementsAre(future, older, newest));
}

TEST_F(SummaryDirectoryTest, FilesFromTheFutureDoNotKeepOldOnes) {
  addWitnesses();
  add("future", test.clock.now() + 400 * kDay);
  const std::string old = add("old", test.clock.now() - 31 * kDay);
  directory.tidy();
  EXPECT_THAT(test.files.files(), Not(Contains(old)));
}

TEST_F(SummaryDirectoryTest, LeavesFilesWithOtherNamesAlone) {
  setBound("summary_megabytes", 1);
  const std::string other = std::string(kDirectory) + "/notes.json";
  test.files.addFile(other, std::string(2 * kMegabyte, 'x'), 0.0);
  const std::string old = add("a", 1.0);
  const std::string young = add("b", 2.0);
  directory.tidy();
  EXPECT_THAT(test.files.files(), ElementsAre(old, young, other));
}

TEST_F(SummaryDirectoryTest, KnowsTheNamesOfSummaryFiles) {
  EXPECT_TRUE(
      SummaryDirectory::isSummaryName("20261120-101800+0100-77-com.orvane.player-longformaudio.json"));
  EXPECT_TRUE(SummaryDirectory::isSummaryName("20261120-101800-0430-77-Unknown-test-2.json"));
  for (const char* other :
       {"20261120-101800+0100-.jsn", "a.json", ".json", "20261120-101800+0100-",
        "2026112x-101800+0100-77-Unknown-test.json", "20261120_101800+0100-77-a-test.json"}) {
    EXPECT_FALSE(SummaryDirectory::isSummaryName(other)) << other;
  }
}

TEST_F(SummaryDirectoryTest, ReadsTheDirectoryOnlyWhenItMayBeTooLarge) {
  setBound("summary_megabytes", 1);
  directory.added(10);
  add("a", 1.0, kMegabyte);
  add("b", 2.0, kMegabyte);
  directory.added(10);  // what was added does not exceed the bound
  EXPECT_THAT(test.files.files(), SizeIs(2));
  directory.added(kMegabyte);
  EXPECT_THAT(test.files.files(), SizeIs(1));
}

TEST_F(SummaryDirectoryTest, ReadsTheDirectoryFromTimeToTime) {
  setBound("summary_megabytes", 1);
  directory.added(10);
  add("a", 1.0, kMegabyte);
  add("b", 2.0, kMegabyte);
  test.clock.advance(SummaryDirectory::kReadInterval);
  directory.added(10);
  EXPECT_THAT(test.files.files(), SizeIs(1));
}

TEST_F(SummaryDirectoryTest, UsesTheDefaultInPlaceOfAWrongPreferenceAndSaysSoOnce) {
  setBound("summary_megabytes", 0);
  add("a", 1.0, 10);
  add("b", 2.0, 10);
  directory.tidy();
  directory.tidy();
  EXPECT_THAT(test.files.files(), SizeIs(2));
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError),
              ElementsAre(HasSubstr("are left out: summary_megabytes = 0")));
}

TEST_F(SummaryDirectoryTest, GoesOnWithTheNextFileWhenOneCannotBeRemoved) {
  setBound("summary_megabytes", 1);
  add("a", 1.0, kMegabyte);
  add("b", 2.0, kMegabyte);
  add("c", 3.0, 10);
  test.files.failRemoveFile(std::errc::permission_denied);
  directory.tidy();
  EXPECT_THAT(test.files.files(), SizeIs(3));
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError), SizeIs(1));
  test.files.failRemoveFile(std::errc());
  directory.tidy();
  EXPECT_THAT(test.files.files(), SizeIs(1));
}

TEST_F(SummaryDirectoryTest, ADirectoryThatIsMissingIsNoProblem) {
  directory.tidy();
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
