// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <sstream>
#include <string>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "support/InterceptedCalls.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryFileSystem.h"
#include "support/memory/SmallFileSystem.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::StartsWith;

struct OnDisk {
  TemporaryDirectory directory;
  LinuxFileSystem files;

  std::string root() const { return directory.path(); }
  static std::optional<std::string> contents(const std::string& path) {
    std::ifstream file(path);
    if (!file) return std::nullopt;
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
  }
  static unsigned modeOf(const std::string& path) {
    struct stat status {};
    EXPECT_EQ(stat(path.c_str(), &status), 0);
    return status.st_mode & 07777U;
  }
  static void addSymbolicLink(const std::string& path) { std::filesystem::create_symlink("/dev/null", path); }
};

struct InMemory {
  MemoryFileSystem files;

  static std::string root() { return "/root"; }
  std::optional<std::string> contents(const std::string& path) const { return files.contents(path); }
  unsigned modeOf(const std::string& path) const { return files.directoryMode(path).value_or(0); }
  void addSymbolicLink(const std::string& path) { files.addSymbolicLink(path); }
};

// The contract of all file systems.
template <typename Kind>
class FileSystemContract : public testing::Test {
 protected:
  FileSystemContract() : error_(kind_.files.createDirectories(path("d"), 0755)) { EXPECT_FALSE(error_); }
  std::string path(const std::string& name) const { return kind_.root() + "/" + name; }
  std::unique_ptr<NewFile> create(const std::string& name) {
    return kind_.files.createFile(path("d"), name, error_);
  }
  // Writes a complete file with this text.
  void add(const std::string& name, const std::string& text) {
    const auto file = create(name);
    ASSERT_NE(file, nullptr) << error_.message();
    EXPECT_FALSE(file->write(text));
    EXPECT_FALSE(file->place(name));
  }

  Kind kind_;
  std::error_code error_;
};

using Kinds = testing::Types<OnDisk, InMemory>;
TYPED_TEST_SUITE(FileSystemContract, Kinds);

TYPED_TEST(FileSystemContract, ListsTheFilesOfADirectory) {
  this->add("a.json", "123");
  this->add("b.json", "");
  const auto unfinished = this->create("c.json");
  std::vector<std::string> listed;
  for (const FileEntry& file : this->kind_.files.listFiles(this->path("d"), this->error_)) {
    listed.push_back(file.name + " " + std::to_string(file.bytes));
    EXPECT_GE(file.modifiedAt, 0.0);
  }
  EXPECT_FALSE(this->error_);
  EXPECT_THAT(listed, testing::UnorderedElementsAre("a.json 3", "b.json 0"));
}

TYPED_TEST(FileSystemContract, CannotListADirectoryThatIsMissing) {
  EXPECT_THAT(this->kind_.files.listFiles(this->path("missing"), this->error_), IsEmpty());
  EXPECT_EQ(this->error_, std::errc::no_such_file_or_directory);
}

TYPED_TEST(FileSystemContract, RemovesAFile) {
  this->add("a.json", "123");
  EXPECT_FALSE(this->kind_.files.removeFile(this->path("d/a.json")));
  EXPECT_FALSE(this->kind_.files.exists(this->path("d/a.json")));
  EXPECT_EQ(this->kind_.files.removeFile(this->path("d/a.json")), std::errc::no_such_file_or_directory);
}

TYPED_TEST(FileSystemContract, DoesNotRemoveADirectory) {
  EXPECT_EQ(this->kind_.files.removeFile(this->path("d")), std::errc::is_a_directory);
  EXPECT_TRUE(this->kind_.files.exists(this->path("d")));
}

TYPED_TEST(FileSystemContract, AFileIsThereWhenItIsPlacedAndNotBefore) {
  const auto file = this->create("name.json");
  ASSERT_NE(file, nullptr);
  EXPECT_FALSE(this->error_);
  EXPECT_FALSE(file->write("one "));
  EXPECT_FALSE(file->write(""));
  EXPECT_FALSE(file->write("two"));
  EXPECT_FALSE(this->kind_.files.exists(this->path("d/name.json")));
  EXPECT_FALSE(file->place("name.json"));
  EXPECT_EQ(this->kind_.contents(this->path("d/name.json")), "one two");
}

TYPED_TEST(FileSystemContract, ShortAndLongTextsStayInOrder) {
  const auto file = this->create("name.json");
  ASSERT_NE(file, nullptr);
  std::string expected;
  const auto write = [&](const std::string& text) {
    EXPECT_FALSE(file->write(text));
    expected += text;
  };
  for (int line = 0; line < 50'000; ++line) write(std::to_string(line) + "\n");
  write(std::string(std::size_t{1} << 20, 'x'));
  write("end");
  EXPECT_FALSE(file->place("name.json"));
  EXPECT_TRUE(this->kind_.contents(this->path("d/name.json")) == expected);  // too long to be printed
}

TYPED_TEST(FileSystemContract, AFileThatIsNotPlacedLeavesNothing) {
  EXPECT_FALSE(this->create("name")->write("x"));
  EXPECT_FALSE(this->kind_.files.exists(this->path("d/name")));
}

TYPED_TEST(FileSystemContract, APlacedFileOutlivesItsWriter) {
  this->add("name", "text");
  EXPECT_EQ(this->kind_.contents(this->path("d/name")), "text");
}

TYPED_TEST(FileSystemContract, ATakenNameIsRefusedAndTheFileThereStays) {
  this->add("name", "old");
  EXPECT_EQ(this->create("name"), nullptr);
  EXPECT_EQ(this->error_, std::errc::file_exists);
  EXPECT_EQ(this->kind_.contents(this->path("d/name")), "old");
}

TYPED_TEST(FileSystemContract, ANameThatIsTakenWhileTheFileIsWrittenIsRefusedAndAnotherMayBeTried) {
  const auto file = this->create("name");
  EXPECT_FALSE(file->write("new"));
  this->add("name", "faster");
  EXPECT_EQ(file->place("name"), std::errc::file_exists);
  EXPECT_FALSE(file->place("another"));
  EXPECT_EQ(this->kind_.contents(this->path("d/name")), "faster");
  EXPECT_EQ(this->kind_.contents(this->path("d/another")), "new");
}

TYPED_TEST(FileSystemContract, TwoFilesMayBeWrittenAtOnce) {
  const auto first = this->create("first");
  const auto second = this->create("second");
  EXPECT_FALSE(first->write("1"));
  EXPECT_FALSE(second->write("2"));
  EXPECT_FALSE(second->place("second"));
  EXPECT_FALSE(first->place("first"));
  EXPECT_EQ(this->kind_.contents(this->path("d/first")), "1");
  EXPECT_EQ(this->kind_.contents(this->path("d/second")), "2");
}

TYPED_TEST(FileSystemContract, NamesThatWouldLeaveTheDirectoryAreRefused) {
  const auto file = this->create("good");
  for (const std::string& name : {std::string(""), std::string("."), std::string(".."), std::string("../x"),
                                  std::string("a/b"), std::string("/x"), std::string("a\0b", 3)}) {
    EXPECT_EQ(this->create(name), nullptr);
    EXPECT_EQ(this->error_, std::errc::invalid_argument);
    EXPECT_EQ(file->place(name), std::errc::invalid_argument);
  }
}

TYPED_TEST(FileSystemContract, ANameThatIsTooLongIsRefusedBeforeAnythingIsWritten) {
  this->add(std::string(255, 'a'), "text");
  EXPECT_EQ(this->create(std::string(256, 'a')), nullptr);
  EXPECT_EQ(this->error_, std::errc::filename_too_long);
}

TYPED_TEST(FileSystemContract, ASymbolicLinkIsNotFollowed) {
  this->kind_.addSymbolicLink(this->path("d/link"));
  EXPECT_EQ(this->create("link"), nullptr);
  EXPECT_EQ(this->error_, std::errc::file_exists);
  const auto file = this->create("free");
  EXPECT_EQ(file->place("link"), std::errc::file_exists);
}

TYPED_TEST(FileSystemContract, ADirectoryIsNoFile) {
  EXPECT_FALSE(this->kind_.files.createDirectories(this->path("d/inner"), 0755));
  EXPECT_EQ(this->create("inner"), nullptr);
  EXPECT_EQ(this->error_, std::errc::file_exists);
}

TYPED_TEST(FileSystemContract, AFileNeedsItsDirectory) {
  EXPECT_EQ(this->kind_.files.createFile(this->path("nowhere"), "x", this->error_), nullptr);
  EXPECT_EQ(this->error_, std::errc::no_such_file_or_directory);
}

TYPED_TEST(FileSystemContract, DirectoriesGetExactlyTheirMode) {
  EXPECT_FALSE(this->kind_.files.createDirectories(this->path("a/b/c"), 0777));
  for (const char* name : {"a", "a/b", "a/b/c"})
    EXPECT_EQ(this->kind_.modeOf(this->path(name)), 0777U) << name;
  // Existing directories keep their modes.
  EXPECT_FALSE(this->kind_.files.createDirectories(this->path("a/b/d"), 0700));
  EXPECT_EQ(this->kind_.modeOf(this->path("a/b")), 0777U);
  EXPECT_EQ(this->kind_.modeOf(this->path("a/b/d")), 0700U);
  EXPECT_FALSE(this->kind_.files.createDirectories(this->path("a/b/d"), 0755));
  EXPECT_EQ(this->kind_.modeOf(this->path("a/b/d")), 0700U);
}

TYPED_TEST(FileSystemContract, AFileInTheWayOfADirectoryIsAnError) {
  this->add("file", "");
  EXPECT_EQ(this->kind_.files.createDirectories(this->path("d/file"), 0755), std::errc::not_a_directory);
  EXPECT_EQ(this->kind_.files.createDirectories(this->path("d/file/below"), 0755),
            std::errc::not_a_directory);
}

TYPED_TEST(FileSystemContract, KnowsWhichPathsExist) {
  EXPECT_TRUE(this->kind_.files.exists(this->path("d")));
  EXPECT_FALSE(this->kind_.files.exists(this->path("d/file")));
  this->add("file", "");
  EXPECT_TRUE(this->kind_.files.exists(this->path("d/file")));
  EXPECT_FALSE(this->kind_.files.exists(""));
}

TYPED_TEST(FileSystemContract, ReadsAWholeFile) {
  this->add("file", std::string("one\0two", 7));
  std::string text;
  EXPECT_FALSE(this->kind_.files.readFile(this->path("d/file"), text));
  EXPECT_EQ(text, std::string("one\0two", 7));
  EXPECT_EQ(this->kind_.files.readFile(this->path("d/none"), text), std::errc::no_such_file_or_directory);
  EXPECT_TRUE(this->kind_.files.readFile(this->path("d"), text));
}

TYPED_TEST(FileSystemContract, MovesAFileToAnotherDirectory) {
  EXPECT_FALSE(this->kind_.files.createDirectories(this->path("e"), 0755));
  this->add("file", "text");
  EXPECT_FALSE(this->kind_.files.moveFile(this->path("d/file"), this->path("e"), "new"));
  EXPECT_FALSE(this->kind_.files.exists(this->path("d/file")));
  EXPECT_EQ(this->kind_.contents(this->path("e/new")), "text");
}

TYPED_TEST(FileSystemContract, AMoveReplacesNothing) {
  this->add("from", "new");
  this->add("to", "old");
  EXPECT_EQ(this->kind_.files.moveFile(this->path("d/from"), this->path("d"), "to"), std::errc::file_exists);
  EXPECT_EQ(this->kind_.contents(this->path("d/from")), "new");
  EXPECT_EQ(this->kind_.contents(this->path("d/to")), "old");
}

TYPED_TEST(FileSystemContract, AMoveDoesNotLeaveItsDirectory) {
  this->add("from", "new");
  for (const char* name : {"", ".", "..", "../x", "a/b"}) {
    EXPECT_EQ(this->kind_.files.moveFile(this->path("d/from"), this->path("d"), name),
              std::errc::invalid_argument);
  }
}

TYPED_TEST(FileSystemContract, AMoveNeedsItsFileAndItsDirectory) {
  EXPECT_EQ(this->kind_.files.moveFile(this->path("d/none"), this->path("d"), "to"),
            std::errc::no_such_file_or_directory);
  this->add("from", "new");
  EXPECT_EQ(this->kind_.files.moveFile(this->path("d/from"), this->path("none"), "to"),
            std::errc::no_such_file_or_directory);
  EXPECT_EQ(this->kind_.contents(this->path("d/from")), "new");
}

TYPED_TEST(FileSystemContract, OnlyAFileIsMoved) {
  this->kind_.addSymbolicLink(this->path("d/link"));
  EXPECT_FALSE(this->kind_.files.createDirectories(this->path("d/inner"), 0755));
  for (const char* name : {"d/link", "d/inner"}) {
    EXPECT_EQ(this->kind_.files.moveFile(this->path(name), this->path("d"), "to"),
              std::errc::operation_not_permitted);
  }
}

TEST(LinuxFileSystemTest, MovesAcrossFileSystems) {
  const TemporaryDirectory directory;
  const std::string from = "/dev/shm/tonewerk-move-" + std::to_string(getpid());
  std::ofstream(from) << "text";
  struct stat source {};
  struct stat target {};
  ASSERT_EQ(stat(from.c_str(), &source), 0);
  ASSERT_EQ(stat(directory.path().c_str(), &target), 0);
  if (source.st_dev == target.st_dev) {
    std::filesystem::remove(from);
    GTEST_SKIP() << "only one file system here";
  }
  LinuxFileSystem files;
  std::ofstream(directory.path("old")) << "old";
  EXPECT_EQ(files.moveFile(from, directory.path(), "old"), std::errc::file_exists);
  EXPECT_EQ(OnDisk::contents(directory.path("old")), "old");
  EXPECT_EQ(OnDisk::contents(from), "text");

  EXPECT_FALSE(files.moveFile(from, directory.path(), "new"));
  EXPECT_EQ(OnDisk::contents(directory.path("new")), "text");
  EXPECT_FALSE(std::filesystem::exists(from));
}

TEST(LinuxFileSystemTest, AMoveToWhereNoFileCanBeMadeLeavesTheFile) {
  const TemporaryDirectory directory;
  std::ofstream(directory.path("from")) << "text";
  LinuxFileSystem files;
  // Not even root can create a regular file there.
  EXPECT_TRUE(files.moveFile(directory.path("from"), "/proc/self", "to"));
  EXPECT_EQ(OnDisk::contents(directory.path("from")), "text");
}

TEST(LinuxFileSystemTest, APipeInTheFilesPlaceNeitherBlocksNorIsWritten) {
  const TemporaryDirectory directory;
  ASSERT_EQ(mkfifo(directory.path("pipe").c_str(), 0600), 0);
  std::error_code error;
  EXPECT_EQ(LinuxFileSystem().createFile(directory.path(), "pipe", error), nullptr);
  EXPECT_EQ(error, std::errc::file_exists);
}

// The names in a directory, including hidden ones.
std::vector<std::string> namesIn(const std::string& directory) {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(directory)) {
    names.push_back(entry.path().filename().string());
  }
  std::sort(names.begin(), names.end());
  return names;
}

TEST(LinuxFileSystemTest, AFileThatIsBeingWrittenIsHiddenAndGoesWithItsWriter) {
  const TemporaryDirectory directory;
  LinuxFileSystem files;
  std::error_code error;
  auto file = files.createFile(directory.path(), "a.json", error);
  ASSERT_NE(file, nullptr);
  EXPECT_THAT(namesIn(directory.path()), ElementsAre(StartsWith(".new-")));
  file.reset();
  EXPECT_THAT(namesIn(directory.path()), IsEmpty());
}

// Runs a process that writes a file and is killed.
void beKilledWhileWriting(const std::string& directory) {
  const pid_t child = fork();
  if (child == 0) {
    std::error_code error;
    LinuxFileSystem files;
    const auto file = files.createFile(directory, "a.json", error);
    if (file != nullptr) static_cast<void>(file->write("half"));
    raise(SIGKILL);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  ASSERT_TRUE(WIFSIGNALED(status));
}

TEST(LinuxFileSystemTest, TheNextFileRemovesLeftoversOfAKilledProcess) {
  const TemporaryDirectory directory;
  beKilledWhileWriting(directory.path());
  beKilledWhileWriting(directory.path());
  EXPECT_THAT(namesIn(directory.path()), ElementsAre(StartsWith(".new-")));
  LinuxFileSystem files;
  std::error_code error;
  const auto file = files.createFile(directory.path(), "a.json", error);
  ASSERT_NE(file, nullptr);
  EXPECT_FALSE(file->place("a.json"));
  EXPECT_THAT(namesIn(directory.path()), ElementsAre("a.json"));
}

TEST(LinuxFileSystemTest, FilesThatAreNoLeftoversStay) {
  const TemporaryDirectory directory;
  LinuxFileSystem other;
  std::error_code error;
  const auto written = other.createFile(directory.path(), "b.json", error);
  ASSERT_NE(written, nullptr);
  std::ofstream(directory.path("new-1")) << "no hidden name";
  std::filesystem::create_directory(directory.path(".new-folder"));
  std::filesystem::create_symlink(directory.path("new-1"), directory.path(".new-link"));
  LinuxFileSystem files;
  const auto file = files.createFile(directory.path(), "a.json", error);
  ASSERT_NE(file, nullptr);
  EXPECT_FALSE(file->place("a.json"));
  EXPECT_FALSE(written->write("text"));
  EXPECT_FALSE(written->place("b.json"));
  EXPECT_THAT(namesIn(directory.path()),
              ElementsAre(".new-folder", ".new-link", "a.json", "b.json", "new-1"));
}

TEST(LinuxFileSystemTest, AnotherUsersFileStays) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can give a file to somebody else";
  const TemporaryDirectory directory;
  std::ofstream(directory.path(".new-1")) << "another user's";
  ASSERT_EQ(chown(directory.path(".new-1").c_str(), 1, 1), 0);
  LinuxFileSystem files;
  std::error_code error;
  EXPECT_NE(files.createFile(directory.path(), "a.json", error), nullptr);
  EXPECT_THAT(namesIn(directory.path()), ElementsAre(".new-1"));
}

TEST(LinuxFileSystemTest, ATrailingSlashDoesNoHarm) {
  const TemporaryDirectory directory;
  EXPECT_FALSE(LinuxFileSystem().createDirectories(directory.path("a/b/"), 0755));
  EXPECT_TRUE(std::filesystem::is_directory(directory.path("a/b")));
}

TEST(LinuxFileSystemTest, ADeviceIsNotWritten) {
  std::error_code error;
  EXPECT_EQ(LinuxFileSystem().createFile("/dev", "null", error), nullptr);
  EXPECT_EQ(error, std::errc::file_exists);
}

TEST(MemoryFileSystemTest, FailsOnDemand) {
  MemoryFileSystem files;
  std::error_code error;
  files.failWrite(2, std::errc::no_space_on_device);
  {
    const auto file = files.createFile("/", "x", error);
    ASSERT_NE(file, nullptr);
    EXPECT_FALSE(file->write("a"));
    EXPECT_EQ(file->write("b"), std::errc::no_space_on_device);
    EXPECT_FALSE(file->write("c"));
    EXPECT_EQ(file->place("x"), std::errc::no_space_on_device);  // the file is incomplete
    EXPECT_EQ(files.openFiles(), 1);
  }
  EXPECT_EQ(files.openFiles(), 0);
  files.failPlace(std::errc::io_error);
  EXPECT_EQ(files.createFile("/", "x", error)->place("x"), std::errc::io_error);
  EXPECT_THAT(files.files(), IsEmpty());
  files.failCreateFile(std::errc::permission_denied);
  EXPECT_EQ(files.createFile("/", "y", error), nullptr);
  EXPECT_EQ(error, std::errc::permission_denied);
}

TEST(LinuxFileSystemTest, AFileIsNotPlacedOnAFullDisk) {
  const TemporaryDirectory directory;
  const SmallFileSystem small(directory.path());
  if (!small.isMounted()) GTEST_SKIP() << "only root can make a file system";
  LinuxFileSystem files;
  std::error_code error;
  auto file = files.createFile(directory.path(), "a.json", error);
  ASSERT_NE(file, nullptr);
  EXPECT_EQ(file->write(std::string(std::size_t{2} << 20, 'x')), std::errc::no_space_on_device);
  EXPECT_EQ(file->place("a.json"), std::errc::no_space_on_device);
  file.reset();
  EXPECT_THAT(namesIn(directory.path()), IsEmpty());
}

TEST(LinuxFileSystemTest, AfterAFailureForEarlierLinesNoLineIsWritten) {
  const TemporaryDirectory directory;
  SmallFileSystem small(directory.path());
  if (!small.isMounted()) GTEST_SKIP() << "only root can make a file system";
  LinuxFileSystem files;
  std::error_code error;
  const auto file = files.createFile(directory.path(), "a.json", error);
  ASSERT_NE(file, nullptr);
  const std::string line(1000, 'x');
  constexpr int kMoreThanFits = 2000;
  int written = 0;
  while (written < kMoreThanFits && !file->write(line)) ++written;
  EXPECT_LT(written, kMoreThanFits);
  ASSERT_TRUE(small.grow());
  EXPECT_EQ(file->write("x"), std::errc::no_space_on_device);
  EXPECT_EQ(file->place("a.json"), std::errc::no_space_on_device);
  EXPECT_THAT(namesIn(directory.path()), ElementsAre(StartsWith(".new-")));
}

TEST(LinuxFileSystemTest, AFileWhoseLastTextDoesNotFitIsNotPlaced) {
  const TemporaryDirectory directory;
  const SmallFileSystem small(directory.path());
  if (!small.isMounted()) GTEST_SKIP() << "only root can make a file system";
  LinuxFileSystem files;
  std::error_code error;
  const auto file = files.createFile(directory.path(), "a.json", error);
  ASSERT_NE(file, nullptr);
  std::ofstream other(directory.path("other"));
  const std::string block(4096, 'x');
  while (other.write(block.data(), static_cast<std::streamsize>(block.size())).flush()) continue;
  EXPECT_FALSE(file->write("text"));
  EXPECT_EQ(file->place("a.json"), std::errc::no_space_on_device);
  EXPECT_FALSE(files.exists(directory.path("a.json")));
}

// Intercepts system calls of the file system.
class LinuxFileSystemCallTest : public testing::Test {
 protected:
  void SetUp() override {
    const bool isPossible = runIntercepted(SYS_flock, nullptr, [] {});
    if (!isPossible) GTEST_SKIP() << "system calls cannot be intercepted here";
  }
  // Writes a.json with the text "text". `handle` decides about each system call `number`. Sets `error` if
  // writing fails.
  void write(long number, const InterceptedCallHandler& handle) {
    ASSERT_TRUE(runIntercepted(number, handle, [this] {
      LinuxFileSystem files;
      const auto file = files.createFile(directory.path(), "a.json", error);
      if (file != nullptr) error = file->write("text");
      if (file != nullptr && !error) error = file->place("a.json");
    }));
  }
  // Locks the only file in the directory; none if another process has locked it.
  FileDescriptor lockOnlyFile() const {
    const std::vector<std::string> names = namesIn(directory.path());
    EXPECT_EQ(names.size(), 1U);
    FileDescriptor file(open(directory.path(names.at(0)).c_str(), O_RDONLY | O_CLOEXEC));
    EXPECT_TRUE(file);
    if (flock(file.get(), LOCK_EX | LOCK_NB) != 0) file.reset();
    return file;
  }

  // The largest number of calls that fail, so that a defect cannot make a test endless.
  static constexpr int kMaxCalls = 100;
  TemporaryDirectory directory;
  std::error_code error;
  int calls = 0;
};

// Regression: it created files without end on a file system without locks.
TEST_F(LinuxFileSystemCallTest, WritesWithoutLocksAndKeepsLeftovers) {
  std::ofstream(directory.path(".new-1")) << "left";
  for (const int failure : {ENOLCK, EOPNOTSUPP}) {
    calls = 0;
    write(SYS_flock, [&](const seccomp_data&) { return ++calls <= kMaxCalls ? failure : 0; });
    EXPECT_FALSE(error) << error.message();
    EXPECT_EQ(calls, 2);  // for the leftover and for the file
    EXPECT_THAT(namesIn(directory.path()), ElementsAre(".new-1", "a.json"));
    EXPECT_EQ(OnDisk::contents(directory.path("a.json")), "text");
    std::filesystem::remove(directory.path("a.json"));
  }
}

TEST_F(LinuxFileSystemCallTest, MakesAnotherFileIfAnotherProcessLockedTheFirst) {
  FileDescriptor held;
  write(SYS_flock, [&](const seccomp_data&) {
    if (++calls == 1) held = lockOnlyFile();
    return 0;
  });
  EXPECT_TRUE(held);
  EXPECT_EQ(calls, 2);
  EXPECT_FALSE(error) << error.message();
  EXPECT_THAT(namesIn(directory.path()), ElementsAre("a.json"));
}

TEST_F(LinuxFileSystemCallTest, MakesAnotherFileIfTheFirstWasRemovedBeforeItWasLocked) {
  write(SYS_flock, [&](const seccomp_data&) {
    if (++calls == 1) std::filesystem::remove(directory.path(namesIn(directory.path()).at(0)));
    return 0;
  });
  EXPECT_EQ(calls, 2);
  EXPECT_FALSE(error) << error.message();
  EXPECT_THAT(namesIn(directory.path()), ElementsAre("a.json"));
}

TEST_F(LinuxFileSystemCallTest, GivesUpIfEveryNewFileIsLockedByAnotherProcess) {
  write(SYS_flock, [&](const seccomp_data&) { return ++calls <= kMaxCalls ? EWOULDBLOCK : 0; });
  EXPECT_EQ(error, std::errc::resource_unavailable_try_again);
  EXPECT_LT(calls, kMaxCalls);
  EXPECT_THAT(namesIn(directory.path()), IsEmpty());
}

// Otherwise another process could lock the leftover just before it is removed, and write to a removed file.
TEST_F(LinuxFileSystemCallTest, ALeftoverIsLockedUntilItIsRemoved) {
  std::ofstream(directory.path(".new-1")) << "left";
  write(SYS_unlinkat, [&](const seccomp_data&) {
    ++calls;
    EXPECT_FALSE(lockOnlyFile());
    return 0;
  });
  EXPECT_EQ(calls, 1);
  EXPECT_FALSE(error) << error.message();
  EXPECT_THAT(namesIn(directory.path()), ElementsAre("a.json"));
}

// Otherwise a crash of the system could lose the name although the text is on the disk.
TEST_F(LinuxFileSystemCallTest, AFailedSyncOfTheDirectoryIsAFailure) {
  write(SYS_fsync, [&](const seccomp_data& call) {
    const std::string file = "/proc/self/fd/" + std::to_string(call.args[0]);
    if (!std::filesystem::equivalent(file, directory.path())) return 0;
    ++calls;
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("a.json"));
    return EIO;
  });
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(error, std::errc::io_error);
  EXPECT_EQ(OnDisk::contents(directory.path("a.json")), "text");
}

// Some file systems cannot rename without replacing.
TEST_F(LinuxFileSystemCallTest, AFileIsPlacedWithALinkIfARenameWouldReplace) {
  write(SYS_renameat2, [&](const seccomp_data&) {
    ++calls;
    return EINVAL;
  });
  EXPECT_EQ(calls, 1);
  EXPECT_FALSE(error) << error.message();
  EXPECT_THAT(namesIn(directory.path()), ElementsAre("a.json"));
  EXPECT_EQ(OnDisk::contents(directory.path("a.json")), "text");
}

TEST_F(LinuxFileSystemCallTest, ALinkReplacesNothingAndAnotherNameMayBeTried) {
  const auto refuse = [](const seccomp_data&) { return EINVAL; };
  ASSERT_TRUE(runIntercepted(SYS_renameat2, refuse, [this] {
    LinuxFileSystem files;
    const auto file = files.createFile(directory.path(), "a.json", error);
    ASSERT_NE(file, nullptr);
    std::ofstream(directory.path("a.json")) << "faster";
    EXPECT_EQ(file->place("a.json"), std::errc::file_exists);
    EXPECT_FALSE(file->place("b.json"));
  }));
  EXPECT_THAT(namesIn(directory.path()), ElementsAre("a.json", "b.json"));
  EXPECT_EQ(OnDisk::contents(directory.path("a.json")), "faster");
}

}  // namespace
}  // namespace tonewerk
