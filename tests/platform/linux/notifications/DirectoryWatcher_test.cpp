// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/notifications/DirectoryWatcher.h"

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <unistd.h>
#include <vector>

#include "support/OtherUser.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::chrono::seconds kTimeout{20};
constexpr char kEverything[] = "*";

class DirectoryWatcherTest : public ::testing::Test {
 protected:
  void watch() {
    watcher = std::make_unique<DirectoryWatcher>(
        watched, [this](std::string_view name) { report(std::string(name)); },
        [this] { report(kEverything); }, category);
  }
  std::string path(const std::string& name) const { return watched + "/" + name; }
  static void write(const std::string& path, const std::string& text = "1\n") { std::ofstream(path) << text; }

  void report(const std::string& what) {
    {
      MutexLock lock(mutex);
      reports.push_back(what);
      all.push_back(what);
      while (mustHold) isHeld.wait(lock);
    }
    changed.notifyAll();
  }
  // Waits until the watcher has reported this, and drops all reports up to it.
  bool waitFor(const std::string& what, std::chrono::milliseconds timeout = kTimeout) {
    const auto end = std::chrono::steady_clock::now() + timeout;
    MutexLock lock(mutex);
    auto found = std::find(reports.begin(), reports.end(), what);
    while (found == reports.end() && changed.waitUntil(lock, end)) {
      found = std::find(reports.begin(), reports.end(), what);
    }
    found = std::find(reports.begin(), reports.end(), what);  // once more after a timeout
    if (found == reports.end()) return false;
    before.assign(reports.begin(), found);
    reports.erase(reports.begin(), found + 1);
    return true;
  }
  // Makes a file name that is used only once.
  std::string newMarkerName() { return "witness" + std::to_string(++markers); }
  // Writes a marker file, and returns the reports before the marker's.
  std::vector<std::string> reportsSoFar() {
    const std::string marker = newMarkerName();
    write(path(marker));
    EXPECT_TRUE(waitFor(marker));
    return before;
  }
  // Keeps the watcher in its handler, so that the kernel queues all events until release().
  void hold() {
    {
      const MutexLock lock(mutex);
      mustHold = true;
    }
    write(path("gate"));
  }
  void release() {
    {
      const MutexLock lock(mutex);
      mustHold = false;
    }
    isHeld.notifyAll();
    EXPECT_TRUE(waitFor("gate"));
  }
  bool wasEverReported(const std::string& what) {
    const MutexLock lock(mutex);
    return std::find(all.begin(), all.end(), what) != all.end();
  }
  // Whether files are reported again. The first one may be part of a report of everything.
  bool isWatched() {
    for (int attempt = 0; attempt < 400; ++attempt) {
      const std::string marker = newMarkerName();
      write(path(marker));
      if (waitFor(marker, std::chrono::milliseconds(50))) return true;
    }
    return false;
  }

  TemporaryDirectory root;
  const std::string parent = root.path("parent");
  std::string watched = parent + "/watched";
  MemoryLog log;
  LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  Mutex mutex;
  Condition changed;
  Condition isHeld;
  std::vector<std::string> reports GUARDED_BY(mutex);
  std::vector<std::string> all GUARDED_BY(mutex);  // all reports, never dropped
  bool mustHold GUARDED_BY(mutex) = false;         // keeps the watcher in its handler
  std::vector<std::string> before;                 // the reports that waitFor() dropped
  int markers = 0;
  std::unique_ptr<DirectoryWatcher> watcher;
};

class WatchedDirectoryTest : public DirectoryWatcherTest {
 protected:
  WatchedDirectoryTest() {
    fs::create_directories(watched);
    watch();
  }
};

TEST_F(WatchedDirectoryTest, AFileThatIsRewrittenIsReported) {
  write(path("a"));
  EXPECT_TRUE(waitFor("a"));
  reportsSoFar();
  write(path("a"));
  EXPECT_TRUE(waitFor("a"));
}

TEST_F(WatchedDirectoryTest, AFileThatIsOpenedForWritingAndClosedIsReported) {
  write(path("a"));
  reportsSoFar();
  std::ofstream(path("a"), std::ios::app).close();
  EXPECT_TRUE(waitFor("a"));
}

TEST_F(WatchedDirectoryTest, AFileThatIsRenamedIntoPlaceIsReported) {
  write(root.path("made"));
  fs::rename(root.path("made"), path("a"));
  EXPECT_TRUE(waitFor("a"));
  reportsSoFar();
  write(root.path("made"));
  fs::rename(root.path("made"), path("a"));  // over the old one
  EXPECT_TRUE(waitFor("a"));
}

TEST_F(WatchedDirectoryTest, AFileThatIsLinkedIntoPlaceIsReported) {
  write(root.path("made"));
  fs::create_hard_link(root.path("made"), path("a"));
  EXPECT_TRUE(waitFor("a"));
}

TEST_F(WatchedDirectoryTest, AFileThatIsOnlyCreatedIsNotReported) {
  std::ofstream file(path("a"));
  ASSERT_TRUE(file.is_open());
  EXPECT_THAT(reportsSoFar(), IsEmpty());
  file.close();
  EXPECT_TRUE(waitFor("a"));
}

// Regression: it was reported twice if its creation event was read only after it was written to.
TEST_F(WatchedDirectoryTest, AFileThatIsCreatedAndWrittenAtOnceIsReportedOnce) {
  hold();
  write(path("a"));
  release();
  EXPECT_THAT(reportsSoFar(), ElementsAre("a"));
}

TEST_F(WatchedDirectoryTest, ANewFileIsNotReportedBeforeItsWriterClosesIt) {
  hold();
  std::ofstream file(path("a"));
  file << "1\n" << std::flush;
  release();
  EXPECT_THAT(reportsSoFar(), IsEmpty());
  file << "2\n";
  file.close();
  EXPECT_TRUE(waitFor("a"));
  EXPECT_THAT(reportsSoFar(), IsEmpty());
}

TEST_F(WatchedDirectoryTest, AFileThatIsReadWhileItIsWrittenIsReportedOnce) {
  const auto read = [this] { std::ifstream(path("a")).get(); };
  hold();
  {
    std::ofstream file(path("a"));
    read();
    file << "1\n" << std::flush;
    read();
  }
  read();
  release();
  EXPECT_THAT(reportsSoFar(), ElementsAre("a"));
}

TEST_F(WatchedDirectoryTest, EachWriteToANewFileIsReported) {
  hold();
  write(path("a"));
  write(path("b"));
  write(path("a"));
  release();
  EXPECT_THAT(reportsSoFar(), ElementsAre("a", "b", "a"));
}

TEST_F(WatchedDirectoryTest, ALinkIsReportedOnceHoweverLateItsEventIsRead) {
  write(root.path("made"));
  hold();
  fs::create_hard_link(root.path("made"), path("a"));
  fs::remove(root.path("made"));
  release();
  EXPECT_TRUE(waitFor("a"));
  EXPECT_THAT(reportsSoFar(), IsEmpty());
}

TEST_F(WatchedDirectoryTest, ALinkThatIsReadIsReportedOnce) {
  write(root.path("made"));
  hold();
  fs::create_hard_link(root.path("made"), path("a"));
  EXPECT_EQ(std::ifstream(path("a")).get(), '1');
  EXPECT_EQ(std::ifstream(path("a")).get(), '1');
  release();
  EXPECT_TRUE(waitFor("a"));
  EXPECT_THAT(reportsSoFar(), IsEmpty());
}

TEST_F(WatchedDirectoryTest, ALinkThatIsOpenForReadingIsReportedWhenItIsClosed) {
  write(root.path("made"));
  hold();
  fs::create_hard_link(root.path("made"), path("a"));
  std::ifstream file(path("a"));
  ASSERT_TRUE(file.is_open());
  release();
  EXPECT_THAT(reportsSoFar(), IsEmpty());
  file.close();
  EXPECT_TRUE(waitFor("a"));
}

TEST_F(WatchedDirectoryTest, ALinkThatIsWrittenToIsReportedOnceAfterTheWrite) {
  write(root.path("made"));
  hold();
  fs::create_hard_link(root.path("made"), path("a"));
  std::ofstream file(path("a"), std::ios::app);
  file << "2\n" << std::flush;
  release();
  EXPECT_THAT(reportsSoFar(), IsEmpty());
  file.close();
  EXPECT_THAT(reportsSoFar(), ElementsAre("a"));
}

TEST_F(WatchedDirectoryTest, AFileThatIsGoneWhenItsEventIsReadIsNotReported) {
  write(root.path("made"));
  hold();
  fs::create_hard_link(root.path("made"), path("a"));
  fs::remove(path("a"));
  release();
  EXPECT_THAT(reportsSoFar(), IsEmpty());
}

TEST_F(WatchedDirectoryTest, ReadingRemovingAndMovingAwayAreNotReported) {
  write(path("a"));
  write(path("b"));
  reportsSoFar();
  std::string text;
  std::getline(std::ifstream(path("a")), text);
  EXPECT_EQ(text, "1");
  fs::remove(path("a"));
  fs::rename(path("b"), root.path("b"));
  EXPECT_THAT(reportsSoFar(), IsEmpty());
}

TEST_F(WatchedDirectoryTest, ARemovedFileIsReportedWhenItIsCreatedAgain) {
  write(path("a"));
  EXPECT_TRUE(waitFor("a"));
  reportsSoFar();
  fs::remove(path("a"));
  write(path("a"));
  EXPECT_TRUE(waitFor("a"));
}

TEST_F(WatchedDirectoryTest, OnlyRegularFilesAreReported) {
  fs::create_directory(path("folder"));
  fs::create_directory(root.path("other"));
  fs::rename(root.path("other"), path("other"));
  fs::create_symlink(root.path("nowhere"), path("link"));
  EXPECT_THAT(reportsSoFar(), IsEmpty());
}

TEST_F(WatchedDirectoryTest, ChangesOutsideTheDirectoryAreNotReported) {
  write(parent + "/reporting.sock");
  write(parent + "/watched2");
  fs::create_directory(parent + "/channels");
  EXPECT_THAT(reportsSoFar(), IsEmpty());
}

// Regression: the event of the directory above queued every handler although nothing was posted.
TEST_F(WatchedDirectoryTest, AChangedModeOfAWatchedDirectoryReportsNothing) {
  fs::permissions(watched, fs::perms::owner_all);
  fs::last_write_time(watched, fs::file_time_type::clock::now());
  EXPECT_THAT(reportsSoFar(), IsEmpty());
}

TEST_F(WatchedDirectoryTest, ADirectoryThatIsRemovedAndCreatedAgainIsWatched) {
  for (int round = 0; round < 3; ++round) {
    fs::remove_all(watched);
    EXPECT_TRUE(waitFor(kEverything));
    fs::create_directory(watched);
    EXPECT_TRUE(isWatched());
  }
}

TEST_F(WatchedDirectoryTest, AfterADirectoryIsMovedAwayTheNewOneIsWatched) {
  fs::rename(watched, root.path("away"));
  EXPECT_TRUE(waitFor(kEverything));
  write(root.path("away/old"));
  fs::create_directory(watched);
  EXPECT_TRUE(isWatched());
  EXPECT_FALSE(wasEverReported("old"));
}

TEST_F(WatchedDirectoryTest, AReplacedDirectoryIsNoLongerWatched) {
  fs::create_directory(parent + "/next");
  write(parent + "/next/a");
  fs::rename(parent + "/next", watched);
  EXPECT_TRUE(waitFor(kEverything));
  EXPECT_TRUE(isWatched());
}

TEST_F(WatchedDirectoryTest, AParentThatIsRemovedAndCreatedAgainIsFound) {
  fs::remove_all(parent);
  EXPECT_TRUE(waitFor(kEverything));
  fs::create_directories(watched);
  EXPECT_TRUE(isWatched());
}

TEST_F(WatchedDirectoryTest, AParentThatIsMovedAwayIsNoLongerWatched) {
  fs::rename(parent, root.path("away"));
  EXPECT_TRUE(waitFor(kEverything));
  write(root.path("away/watched/old"));
  fs::create_directories(watched);
  EXPECT_TRUE(isWatched());
  EXPECT_FALSE(wasEverReported("old"));
}

TEST_F(WatchedDirectoryTest, AnOverflowOfTheEventQueueReportsEverything) {
  std::size_t most = 0;
  std::ifstream("/proc/sys/fs/inotify/max_queued_events") >> most;
  if (most == 0 || most > 200'000) GTEST_SKIP() << "events that fit: " << most;
  hold();
  // Two names in turn, because the kernel merges consecutive equal events.
  for (std::size_t count = 0; count <= most / 2 + 1000; ++count) {
    std::ofstream(path("a"), std::ios::app).close();
    std::ofstream(path("b"), std::ios::app).close();
  }
  write(path("lost"));
  release();
  EXPECT_TRUE(waitFor(kEverything));
  write(path("after"));
  EXPECT_TRUE(waitFor("after"));
}

TEST_F(DirectoryWatcherTest, TheDirectoryMayBeCreatedLater) {
  fs::create_directories(parent);
  watch();
  EXPECT_TRUE(watcher->isWorking());
  fs::create_directory(watched);
  EXPECT_TRUE(waitFor(kEverything));
  write(path("a"));
  EXPECT_TRUE(waitFor("a"));
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(DirectoryWatcherTest, TheDirectoryMayBeCreatedWithItsParent) {
  watch();
  fs::create_directories(watched);
  EXPECT_TRUE(waitFor(kEverything));
  // Everything is reported again if the watcher noticed the parent before the directory.
  EXPECT_TRUE(isWatched());
}

TEST_F(DirectoryWatcherTest, TheDirectoryMayBeCreatedLevelByLevelWithPauses) {
  watched = root.path("a/b/c/d");
  watch();
  for (const char* level : {"a", "a/b", "a/b/c"}) {
    fs::create_directory(root.path(level));
    // Reported when the watcher has reached this level.
    EXPECT_TRUE(waitFor(kEverything)) << level;
  }
  fs::create_directory(watched);
  EXPECT_TRUE(isWatched());
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(DirectoryWatcherTest, AllDirectoriesAboveMayBeRemovedAndCreatedAgain) {
  watched = root.path("a/b/c/d");
  fs::create_directories(watched);
  watch();
  for (int round = 0; round < 3; ++round) {
    fs::remove_all(root.path("a"));
    EXPECT_TRUE(waitFor(kEverything));
    fs::create_directories(watched);
    EXPECT_TRUE(isWatched());
  }
}

TEST_F(DirectoryWatcherTest, WaitsWhileAFileIsInTheDirectorysPlace) {
  fs::create_directories(parent);
  write(watched);
  watch();
  fs::remove(watched);
  fs::create_directory(watched);
  EXPECT_TRUE(isWatched());
}

TEST_F(DirectoryWatcherTest, AnUnreadableDirectoryIsLoggedOnce) {
  if (geteuid() == 0) GTEST_SKIP() << "root may read everything";
  fs::create_directories(watched);
  fs::permissions(watched, fs::perms::none);
  watch();
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kError),
              ::testing::ElementsAre("cannot watch " + watched + ": Permission denied"));
  fs::permissions(watched, fs::perms::owner_all);
}

TEST_F(DirectoryWatcherTest, ADirectoryThatBecomesReadableIsWatched) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can watch as somebody else";
  constexpr auto kEverybodys = static_cast<fs::perms>(0755);
  fs::create_directories(watched);
  fs::permissions(root.path(), kEverybodys);
  fs::permissions(parent, kEverybodys);
  fs::permissions(watched, fs::perms::owner_all);
  runAsOtherUser([this] { watch(); });  // the watcher's thread has the same user
  fs::permissions(watched, kEverybodys);
  EXPECT_TRUE(waitFor(kEverything));
  write(path("a"));
  EXPECT_TRUE(waitFor("a"));
}

// The names of new files are kept until it is known what they are. Somebody who makes them without end must
// not make the list longer without end.
TEST_F(DirectoryWatcherTest, TooManyNewFilesAtOnceAreReportedAsEverything) {
  fs::create_directories(watched);
  watch();
  write(root.path("made"));
  hold();
  for (std::size_t link = 0; link <= DirectoryWatcher::kMaxNewFiles; ++link) {
    fs::create_hard_link(root.path("made"), path("link" + std::to_string(link)));
  }
  release();
  EXPECT_TRUE(waitFor(kEverything));
  EXPECT_FALSE(wasEverReported("link0"));
}

TEST_F(DirectoryWatcherTest, AsManyNewFilesAsAreRememberedAreReportedByName) {
  fs::create_directories(watched);
  watch();
  write(root.path("made"));
  hold();
  for (std::size_t link = 0; link < DirectoryWatcher::kMaxNewFiles; ++link) {
    fs::create_hard_link(root.path("made"), path("link" + std::to_string(link)));
  }
  release();
  EXPECT_TRUE(waitFor("link0"));
  EXPECT_FALSE(wasEverReported(kEverything));
}

}  // namespace
}  // namespace tonewerk
