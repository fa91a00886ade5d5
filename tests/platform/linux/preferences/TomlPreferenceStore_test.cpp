// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/preferences/TomlPreferenceStore.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <sstream>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

#include "support/OtherUser.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::SizeIs;

constexpr char kDomain[] = "com.orvane.test";

class TomlPreferenceStoreTest : public testing::Test {
 protected:
  std::string configured() const { return directory_.path("configuration/com.orvane.test.toml"); }
  std::string written() const { return directory_.path("state/com.orvane.test.toml"); }

  static void write(const std::string& path, const std::string& text) {
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    std::ofstream(path) << text;
  }
  static std::string contentsOf(const std::string& path) {
    std::ostringstream text;
    text << std::ifstream(path).rdbuf();
    return text.str();
  }

  TemporaryDirectory directory_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  TomlPreferenceStore store_{directory_.path("configuration"), directory_.path("state"), category_};
};

TEST_F(TomlPreferenceStoreTest, TheWrittenFileHoldsOnlyWhatDiffers) {
  write(configured(), "a = 1\nb = 2\n");
  EXPECT_FALSE(store_.write(kDomain, "a", 1));
  EXPECT_FALSE(store_.write(kDomain, "b", 3));
  EXPECT_EQ(contentsOf(written()), "b = 3\n");
  EXPECT_FALSE(store_.write(kDomain, "b", 2));
  EXPECT_EQ(contentsOf(written()), "");
  EXPECT_EQ(contentsOf(configured()), "a = 1\nb = 2\n");
}

// If invalid bytes were replaced while reading, the replacement would be written back.
TEST_F(TomlPreferenceStoreTest, AFileThatIsNotUtf8IsLoggedAndNotOverwritten) {
  const std::string contents = "name = \"Caf\xE9\"\n";
  write(written(), contents);
  EXPECT_EQ(store_.read(kDomain, "name"), std::nullopt);
  EXPECT_THAT(log_.textsAt(LogLevel::kError), testing::ElementsAre(HasSubstr(written() + ":1:")));
  EXPECT_TRUE(store_.write(kDomain, "other", 1));
  EXPECT_EQ(contentsOf(written()), contents);
}

TEST_F(TomlPreferenceStoreTest, LogsTheKeysThatTheDaemonDoesNotReadUntilTheyChange) {
  const std::string domain = "com.orvane.tonewerk.store";
  write(directory_.path("configuration/" + domain + ".toml"), "max_dais = 5\nmax_days = 5\n");
  write(directory_.path("state/org.example.toml"), "anything = 1\n");
  store_.checkAllFiles();
  store_.checkAllFiles();
  EXPECT_THAT(log_.textsAt(LogLevel::kError),
              testing::ElementsAre("the daemon does not read max_dais of com.orvane.tonewerk.store; "
                                   "did you mean 'max_days'?"));
  EXPECT_FALSE(store_.write(domain, "max_weeks", 1));
  store_.checkFile(domain + ".toml");
  EXPECT_THAT(log_.textsAt(LogLevel::kError), SizeIs(3)) << "both keys now";
}

TEST_F(TomlPreferenceStoreTest, ReadsWhatAnotherProcessWrote) {
  EXPECT_FALSE(store_.write(kDomain, "a", 1));
  EXPECT_EQ(store_.read(kDomain, "a"), Value(1));
  const pid_t child = fork();
  if (child == 0) {
    TomlPreferenceStore other(directory_.path("configuration"), directory_.path("state"), category_);
    _exit(other.write(kDomain, "a", 2) ? 1 : 0);
  }
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  ASSERT_EQ(status, 0);
  EXPECT_EQ(store_.read(kDomain, "a"), Value(2));
}

// Two changes of the same length within one tick of the file system's clock differ only in the inode number,
// which may be used again.
TEST_F(TomlPreferenceStoreTest, ReadsEveryOfManyQuickChanges) {
  TomlPreferenceStore other(directory_.path("configuration"), directory_.path("state"), category_);
  for (int number = 100; number < 200; ++number) {
    ASSERT_FALSE(other.write(kDomain, "a", number));
    ASSERT_EQ(store_.read(kDomain, "a"), Value(number));
  }
}

TEST_F(TomlPreferenceStoreTest, ReadsAFileThatWasEditedInPlace) {
  write(written(), "a = 1\n");
  EXPECT_EQ(store_.read(kDomain, "a"), Value(1));
  write(written(), "a = 2\n");
  EXPECT_EQ(store_.read(kDomain, "a"), Value(2));
}

// While a file is missing, the store looks only for its appearance.
TEST_F(TomlPreferenceStoreTest, ReadsAFileEachTimeThatItAppears) {
  for (const std::string& path : {configured(), written()}) {
    for (int number = 1; number <= 3; ++number) {
      EXPECT_EQ(store_.read(kDomain, "a"), std::nullopt);
      EXPECT_EQ(store_.read(kDomain, "a"), std::nullopt);
      write(path, "a = " + std::to_string(number) + "\n");
      EXPECT_EQ(store_.read(kDomain, "a"), Value(number));
      std::filesystem::remove_all(std::filesystem::path(path).parent_path());
    }
  }
}

TEST_F(TomlPreferenceStoreTest, WritersDoNotLoseEachOthersKeys) {
  constexpr int kWriters = 4;
  constexpr int kKeys = 25;
  {
    std::vector<std::jthread> writers;
    writers.reserve(kWriters);
    for (int writer = 0; writer < kWriters; ++writer) {
      writers.emplace_back([this, writer] {
        TomlPreferenceStore own(directory_.path("configuration"), directory_.path("state"), category_);
        for (int key = 0; key < kKeys; ++key) {
          EXPECT_FALSE(own.write(kDomain, std::to_string(writer) + "." + std::to_string(key), key));
        }
      });
    }
  }
  EXPECT_THAT(store_.readAll(kDomain), SizeIs(kWriters * kKeys));
}

TEST_F(TomlPreferenceStoreTest, AFileThatDoesNotParseIsLoggedOnceWithItsPlace) {
  write(configured(), "a = 1\nb = = 2\n");
  EXPECT_EQ(store_.read(kDomain, "a"), std::nullopt);
  EXPECT_EQ(store_.read(kDomain, "a"), std::nullopt);
  ASSERT_THAT(log_.textsOf("twrs", LogLevel::kError), SizeIs(1));
  EXPECT_THAT(log_.textsOf("twrs")[0], HasSubstr(configured() + ":2:"));
  write(configured(), "a = 1\n");
  EXPECT_EQ(store_.read(kDomain, "a"), Value(1));
  write(configured(), "a = [\n");
  EXPECT_EQ(store_.readAll(kDomain), ValueMap());
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kError), SizeIs(2));
}

TEST_F(TomlPreferenceStoreTest, AFileThatDoesNotParseIsNotOverwritten) {
  write(configured(), "a = 1\n");
  write(written(), "a = \n");
  std::string problem;
  EXPECT_EQ(store_.write(kDomain, "b", 2, &problem), std::errc::invalid_argument);
  EXPECT_THAT(problem, HasSubstr(written() + ":1:"));
  EXPECT_EQ(store_.remove(kDomain, "a", &problem), std::errc::invalid_argument);
  EXPECT_EQ(contentsOf(written()), "a = \n");
  EXPECT_EQ(store_.read(kDomain, "a"), Value(1));

  write(written(), "c = 3\n");
  EXPECT_FALSE(store_.write(kDomain, "b", 2));
  EXPECT_EQ(store_.readAll(kDomain), (ValueMap{{"a", 1}, {"b", 2}, {"c", 3}}));
}

TEST_F(TomlPreferenceStoreTest, AnInvalidConfigurationDoesNotPreventWrites) {
  write(configured(), "nonsense");
  EXPECT_FALSE(store_.write(kDomain, "a", 1));
  EXPECT_EQ(store_.read(kDomain, "a"), Value(1));
}

TEST_F(TomlPreferenceStoreTest, AFailedWriteChangesNothing) {
  EXPECT_FALSE(store_.write(kDomain, "a", 1));
  std::string problem;
  EXPECT_TRUE(store_.write(kDomain, "a", "\xFF", &problem));  // not UTF-8, so not TOML
  EXPECT_NE(problem, "");
  EXPECT_TRUE(store_.write(kDomain, "a", Date{1e15}, &problem));
  EXPECT_EQ(store_.read(kDomain, "a"), Value(1));
}

TEST_F(TomlPreferenceStoreTest, AStateDirectoryThatCannotBeMadeIsNamed) {
  write(directory_.path("state"), "a file in the directory's place");
  std::string problem;
  EXPECT_EQ(store_.write(kDomain, "a", 1, &problem), std::errc::not_a_directory);
  EXPECT_THAT(problem, HasSubstr(directory_.path("state")));
}

TEST_F(TomlPreferenceStoreTest, LeftoversOfACrashDoNoHarm) {
  std::filesystem::create_directories(directory_.path("state"));
  std::filesystem::create_symlink(directory_.path("elsewhere"), written() + ".new");
  EXPECT_FALSE(store_.write(kDomain, "a", 1));
  EXPECT_EQ(contentsOf(written()), "a = 1\n");
  EXPECT_FALSE(std::filesystem::exists(directory_.path("elsewhere")));
  EXPECT_FALSE(std::filesystem::exists(written() + ".new"));
}

TEST_F(TomlPreferenceStoreTest, APipeInAFilesPlaceDoesNotBlock) {
  std::filesystem::create_directories(directory_.path("state"));
  ASSERT_EQ(mkfifo(written().c_str(), 0600), 0);
  EXPECT_EQ(store_.read(kDomain, "a"), std::nullopt);
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kError), SizeIs(1));
  EXPECT_TRUE(store_.write(kDomain, "a", 1));
}

// Regression: after root had written one preference, the daemon could not write to the directory any more.
class PreferencesOfRootTest : public TomlPreferenceStoreTest {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "only root can be root";
    std::filesystem::create_directory(state_);
    ASSERT_EQ(chown(directory_.path().c_str(), kOtherUser, kOtherUser), 0);
    ASSERT_EQ(chown(state_.c_str(), kOtherUser, kOtherUser), 0);
  }

  static std::pair<uid_t, gid_t> ownerOf(const std::string& path) {
    struct stat status {};
    EXPECT_EQ(lstat(path.c_str(), &status), 0) << path;
    return {status.st_uid, status.st_gid};
  }

  static constexpr std::pair<uid_t, gid_t> kDaemons{kOtherUser, kOtherUser};
  static constexpr std::pair<uid_t, gid_t> kRoots{0, 0};

  const std::string state_ = directory_.path("daemon");
  const std::string preferences_ = state_ + "/preferences";
  TomlPreferenceStore roots_{directory_.path("configuration"), preferences_, category_};
};

TEST_F(PreferencesOfRootTest, FilesThatRootWritesBelongToTheDirectorysOwner) {
  EXPECT_FALSE(roots_.write(kDomain, "a", 1));
  for (const char* made : {"", "/.lock", "/com.orvane.test.toml"}) {
    EXPECT_EQ(ownerOf(preferences_ + made), kDaemons) << made;
  }
}

TEST_F(PreferencesOfRootTest, TheDaemonCanWriteAfterRootHasWritten) {
  EXPECT_FALSE(roots_.write(kDomain, "a", 1));
  runAsOtherUser([&] {
    TomlPreferenceStore daemons(directory_.path("configuration"), preferences_, category_);
    std::string problem;
    EXPECT_FALSE(daemons.write(kDomain, "b", 2, &problem)) << problem;
    EXPECT_FALSE(daemons.write("com.orvane.other", "c", 3, &problem)) << problem;
  });
  EXPECT_EQ(roots_.read(kDomain, "a"), Value(1));
  EXPECT_EQ(roots_.read(kDomain, "b"), Value(2));
}

TEST_F(PreferencesOfRootTest, ExistingFilesKeepTheirOwner) {
  const std::string secret = directory_.path("secret");
  write(secret, "root's\n");
  std::filesystem::create_directory(preferences_);
  ASSERT_EQ(chown(preferences_.c_str(), kOtherUser, kOtherUser), 0);
  std::filesystem::create_hard_link(secret, preferences_ + "/.lock");
  std::filesystem::create_hard_link(secret, preferences_ + "/com.orvane.test.toml.new");
  EXPECT_FALSE(roots_.write(kDomain, "a", 1));
  EXPECT_EQ(ownerOf(secret), kRoots);
  EXPECT_EQ(contentsOf(secret), "root's\n");
  EXPECT_EQ(ownerOf(preferences_ + "/com.orvane.test.toml"), kDaemons);
}

TEST_F(PreferencesOfRootTest, ALinkInTheLocksPlaceIsNotFollowed) {
  const std::string secret = directory_.path("secret");
  write(secret, "root's\n");
  std::filesystem::create_directory(preferences_);
  std::filesystem::create_symlink(secret, preferences_ + "/.lock");
  std::string problem;
  EXPECT_TRUE(roots_.write(kDomain, "a", 1, &problem));
  EXPECT_THAT(problem, HasSubstr(".lock"));
  EXPECT_EQ(ownerOf(secret), kRoots);
}

TEST_F(TomlPreferenceStoreTest, AFileThatStillDoesNotParseIsLoggedAgainWhenItIsWrittenAgain) {
  write(configured(), "a = \n");
  EXPECT_EQ(store_.read(kDomain, "a"), std::nullopt);
  write(configured(), "a = \nb = 1\n");
  EXPECT_EQ(store_.read(kDomain, "a"), std::nullopt);
  EXPECT_EQ(store_.read(kDomain, "a"), std::nullopt);
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kError), SizeIs(2));
}

TEST_F(TomlPreferenceStoreTest, ChecksEveryFileOfBothDirectories) {
  write(configured(), "fine = 1\n");
  write(directory_.path("configuration/com.orvane.one.toml"), "\noops\n");
  write(directory_.path("state/com.orvane.two.toml"), "= 5\n");
  write(directory_.path("state/com.orvane.three.toml.new"), "no preference file\n");
  write(directory_.path("state/.lock"), "nor this\n");
  store_.checkAllFiles();
  store_.checkAllFiles();
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kError),
              testing::UnorderedElementsAre(HasSubstr("configuration/com.orvane.one.toml:2:"),
                                            HasSubstr("state/com.orvane.two.toml:1:")));
}

TEST_F(TomlPreferenceStoreTest, ChecksNothingWhereThereAreNoDirectories) {
  store_.checkAllFiles();
  store_.checkFile("com.orvane.test.toml");
  EXPECT_THAT(log_.lines(), testing::IsEmpty());
}

}  // namespace
}  // namespace tonewerk
