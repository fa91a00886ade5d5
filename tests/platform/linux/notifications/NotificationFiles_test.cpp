// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/notifications/NotificationFiles.h"

#include <cstdint>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <limits>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "support/OtherUser.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using ::testing::UnorderedElementsAre;

class NotificationFilesTest : public ::testing::Test {
 protected:
  void write(const std::string& name, const std::string& text) {
    std::filesystem::create_directories(files.directory());
    std::ofstream(files.directory() + "/" + name) << text;
  }
  // The state, or the problem of reading it.
  std::optional<std::uint64_t> state(const std::string& name) { return files.state(name, error); }
  std::vector<std::string> names() const {
    std::vector<std::string> found;
    for (const auto& entry : std::filesystem::directory_iterator(files.directory())) {
      found.push_back(entry.path().filename().string());
    }
    return found;
  }

  TemporaryDirectory directory;
  NotificationFiles files{directory.path("a/notifications")};
  std::error_code error;
};

TEST_F(NotificationFilesTest, AStateIsADecimalNumberWithSpacesAroundIt) {
  for (const auto& [text, expected] :
       std::vector<std::pair<std::string, std::uint64_t>>{{"0", 0},
                                                          {"1\n", 1},
                                                          {" \t007\r\n\n", 7},
                                                          {"18446744073709551615", UINT64_MAX},
                                                          {std::string(63, ' ') + "5", 5}}) {
    write("a", text);
    EXPECT_EQ(state("a"), expected) << text;
    EXPECT_FALSE(error);
  }
}

TEST_F(NotificationFilesTest, AFileThatIsNoNumberOrTooLongHasNoState) {
  for (const std::string& text :
       {std::string(), std::string("\n"), std::string("one"), std::string("-1"), std::string("+1"),
        std::string("0x1"), std::string("1.0"), std::string("1 2"), std::string("1\0", 2),
        std::string("18446744073709551616"), std::string(64, ' ') + "5", std::string(1 << 20, '1')}) {
    write("a", text);
    EXPECT_EQ(state("a"), std::nullopt) << text.substr(0, 70);
    EXPECT_EQ(error, std::errc::result_out_of_range) << text.substr(0, 70);
  }
}

TEST_F(NotificationFilesTest, WithoutAFileThereIsNoState) {
  EXPECT_EQ(state("a"), std::nullopt);
  EXPECT_EQ(error, std::errc::no_such_file_or_directory);
  write("b", "1");
  EXPECT_EQ(state("a"), std::nullopt);
  EXPECT_EQ(error, std::errc::no_such_file_or_directory);
}

TEST_F(NotificationFilesTest, APostCreatesTheDirectoryAndLeavesNoOtherFiles) {
  EXPECT_FALSE(files.post("a"));
  EXPECT_FALSE(files.post("b", 5));
  EXPECT_FALSE(files.post("a", std::numeric_limits<std::uint64_t>::max()));
  EXPECT_FALSE(files.post("b"));
  EXPECT_THAT(names(), UnorderedElementsAre("a", "b"));
  EXPECT_EQ(state("a"), std::numeric_limits<std::uint64_t>::max());
  EXPECT_EQ(state("b"), 5U);
}

TEST_F(NotificationFilesTest, APostKeepsWhateverItsFileHolds) {
  write("a", "no number");
  EXPECT_FALSE(files.post("a"));
  EXPECT_EQ(state("a"), std::nullopt);
  EXPECT_FALSE(files.post("a", 3));
  EXPECT_EQ(state("a"), 3U);
}

TEST_F(NotificationFilesTest, NamesThatAreNoFileNamesAreRefused) {
  for (const std::string& name : {std::string(), std::string("."), std::string(".."), std::string("../b"),
                                  std::string("/b"), std::string("a\0b", 3), std::string(256, 'a')}) {
    EXPECT_EQ(files.post(name), std::errc::invalid_argument);
    EXPECT_EQ(files.post(name, 1), std::errc::invalid_argument);
    EXPECT_EQ(state(name), std::nullopt);
    EXPECT_EQ(error, std::errc::invalid_argument);
  }
  EXPECT_FALSE(std::filesystem::exists(directory.path("a")));
}

TEST_F(NotificationFilesTest, ALinkDoesNotLeadOutOfTheDirectory) {
  write("x", "");
  std::ofstream(directory.path("outside")) << "41\n";
  std::filesystem::create_symlink(directory.path("outside"), files.directory() + "/a");
  EXPECT_EQ(state("a"), std::nullopt);
  EXPECT_EQ(error, std::errc::too_many_symbolic_link_levels);
  EXPECT_EQ(files.post("a"), std::errc::too_many_symbolic_link_levels);
  EXPECT_FALSE(files.post("a", 1));  // replaces the link
  EXPECT_EQ(state("a"), 1U);
  std::string outside;
  std::getline(std::ifstream(directory.path("outside")), outside);
  EXPECT_EQ(outside, "41");
}

TEST_F(NotificationFilesTest, OtherThanRegularFilesAreRefusedAtOnce) {
  std::filesystem::create_directories(files.directory() + "/folder");
  ASSERT_EQ(mkfifo((files.directory() + "/pipe").c_str(), 0600), 0);
  EXPECT_EQ(state("folder"), std::nullopt);
  EXPECT_EQ(error, std::errc::invalid_argument);
  EXPECT_EQ(state("pipe"), std::nullopt);
  EXPECT_EQ(error, std::errc::invalid_argument);
  EXPECT_TRUE(files.post("folder"));
  EXPECT_TRUE(files.post("folder", 1));
  EXPECT_TRUE(files.post("pipe"));
  EXPECT_THAT(names(), UnorderedElementsAre("folder", "pipe"));
}

TEST_F(NotificationFilesTest, AFileInTheDirectorysPlaceIsAFailure) {
  std::ofstream(directory.path("a")) << "in the way";
  EXPECT_TRUE(files.post("b"));
  EXPECT_TRUE(files.post("b", 1));
  EXPECT_EQ(state("b"), std::nullopt);
}

TEST_F(NotificationFilesTest, TheDirectorysOwnerCanPostANameAfterRoot) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can be root";
  const std::string runtime = directory.path("a");
  std::filesystem::create_directory(runtime);
  ASSERT_EQ(chown(directory.path().c_str(), kOtherUser, kOtherUser), 0);
  ASSERT_EQ(chown(runtime.c_str(), kOtherUser, kOtherUser), 0);
  EXPECT_FALSE(files.post("stated", 5));
  EXPECT_FALSE(files.post("unstated"));
  runAsOtherUser([this] {
    EXPECT_FALSE(files.post("stated"));
    EXPECT_FALSE(files.post("unstated"));
    EXPECT_FALSE(files.post("unstated", 7));
    EXPECT_FALSE(files.post("another"));
  });
  EXPECT_EQ(state("stated"), 5);
  EXPECT_EQ(state("unstated"), 7);
}

// The directory has the sticky bit, belongs to `owner`, and everybody may write to it.
class SharedNotificationFilesTest : public NotificationFilesTest {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "only root can be another user";
  }
  void share(uid_t owner) {
    std::filesystem::create_directories(files.directory());
    for (const std::string& path : {directory.path(), directory.path("a"), files.directory()}) {
      ASSERT_EQ(chown(path.c_str(), owner, owner), 0);
    }
    ASSERT_EQ(chmod(files.directory().c_str(), 01777), 0);
    ASSERT_EQ(chmod(directory.path().c_str(), 0755), 0);
  }
  uid_t ownerOf(const std::string& name) const {
    struct stat status {};
    EXPECT_EQ(lstat((files.directory() + "/" + name).c_str(), &status), 0);
    return status.st_uid;
  }
  void writeAs(uid_t owner, const std::string& name, const std::string& text) {
    write(name, text);
    ASSERT_EQ(chown((files.directory() + "/" + name).c_str(), owner, owner), 0);
    ASSERT_EQ(chmod((files.directory() + "/" + name).c_str(), 0644), 0);
  }
  // Makes a file that nobody can read as a state: a closed one, a pipe, or a link to a state outside.
  void writeUnreadableAs(uid_t owner) {
    writeAs(owner, "closed", "5\n");
    ASSERT_EQ(chmod((files.directory() + "/closed").c_str(), 0600), 0);
    ASSERT_EQ(mkfifo((files.directory() + "/pipe").c_str(), 0600), 0);
    ASSERT_EQ(chmod((files.directory() + "/pipe").c_str(), 0666), 0);
    std::ofstream(directory.path("outside")) << "41\n";
    std::filesystem::create_symlink(directory.path("outside"), files.directory() + "/link");
    for (const char* name : {"pipe", "link"}) {
      ASSERT_EQ(lchown((files.directory() + "/" + name).c_str(), owner, owner), 0);
    }
  }

  static constexpr uid_t kThirdUser = kOtherUser - 1;
};

TEST_F(SharedNotificationFilesTest, TheDirectorysOwnerPostsTheNameOfAnotherUserAndKeepsItsState) {
  share(kOtherUser);
  writeAs(kThirdUser, "a", "5\n");
  runAsOtherUser([this] { EXPECT_FALSE(files.post("a")); });
  EXPECT_EQ(ownerOf("a"), kOtherUser);
  EXPECT_EQ(state("a"), 5U);
  EXPECT_THAT(names(), UnorderedElementsAre("a"));
  runAsOtherUser([this] { EXPECT_FALSE(files.post("a", 6)); });
  EXPECT_EQ(state("a"), 6U);
}

TEST_F(SharedNotificationFilesTest, NobodyElsePostsTheNameOfAnotherUser) {
  share(kThirdUser);
  writeAs(kThirdUser, "a", "5\n");
  runAsOtherUser([this] {
    EXPECT_EQ(files.post("a"), std::errc::permission_denied);
    EXPECT_EQ(files.post("a", 6), std::errc::operation_not_permitted);
    EXPECT_FALSE(files.post("b", 1));
    EXPECT_FALSE(files.post("b", 2));
  });
  EXPECT_EQ(ownerOf("a"), kThirdUser);
  EXPECT_EQ(state("a"), 5U);
  EXPECT_EQ(state("b"), 2U);
  EXPECT_THAT(names(), UnorderedElementsAre("a", "b"));
}

TEST_F(SharedNotificationFilesTest, TheDirectorysOwnerPostsTheNameOfAFileThatItCannotRead) {
  share(kOtherUser);
  writeUnreadableAs(kThirdUser);
  for (const char* name : {"closed", "pipe", "link"}) {
    runAsOtherUser([&] { EXPECT_FALSE(files.post(name)) << name; });
    EXPECT_EQ(ownerOf(name), kOtherUser) << name;
    EXPECT_EQ(state(name), 0U) << name;
  }
  std::string outside;
  std::getline(std::ifstream(directory.path("outside")), outside);
  EXPECT_EQ(outside, "41");
}

TEST_F(SharedNotificationFilesTest, APipeThatAnotherUserReadsDoesNotKeepItsName) {
  share(kOtherUser);
  writeUnreadableAs(kThirdUser);
  const FileDescriptor reader(open((files.directory() + "/pipe").c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  ASSERT_TRUE(reader);
  runAsOtherUser([&] { EXPECT_FALSE(files.post("pipe")); });
  EXPECT_EQ(state("pipe"), 0U);
}

TEST_F(SharedNotificationFilesTest, NobodyElsePostsTheNameOfAFileThatCannotBeRead) {
  share(kThirdUser);
  writeUnreadableAs(kThirdUser);
  for (const char* name : {"closed", "pipe", "link"}) {
    runAsOtherUser([&] { EXPECT_EQ(files.post(name), std::errc::permission_denied) << name; });
    EXPECT_EQ(ownerOf(name), kThirdUser) << name;
  }
  EXPECT_THAT(names(), UnorderedElementsAre("closed", "pipe", "link"));
}

}  // namespace
}  // namespace tonewerk
