// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/WholeFile.h"

#include <atomic>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>
#include <sys/stat.h>
#include <thread>

#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMax = 1000;

class WholeFileTest : public testing::Test {
 protected:
  std::error_code read(std::size_t most = kMax) { return readWholeFile(path_, most, text_, stamp_); }
  void write(const std::string& text) { std::ofstream(path_) << text; }

  TemporaryDirectory directory_;
  const std::string path_ = directory_.path("file");
  std::string text_;
  FileStamp stamp_{};
};

TEST_F(WholeFileTest, ReadsAFileUpToTheLimit) {
  for (const std::size_t size : {std::size_t{0}, std::size_t{1}, kMax}) {
    write(std::string(size, 'a'));
    EXPECT_FALSE(read());
    EXPECT_EQ(text_, std::string(size, 'a'));
    EXPECT_EQ(static_cast<std::size_t>(stamp_.size), size);
  }
  write(std::string(kMax + 1, 'a'));
  EXPECT_EQ(read(), std::errc::file_too_large);
}

TEST_F(WholeFileTest, DoesNotBlockOnOtherThanRegularFiles) {
  EXPECT_EQ(read(), std::errc::no_such_file_or_directory);
  ASSERT_EQ(mkfifo(path_.c_str(), 0600), 0);
  EXPECT_EQ(read(), std::errc::invalid_argument);
  std::filesystem::remove(path_);
  std::filesystem::create_directory(path_);
  EXPECT_EQ(read(), std::errc::is_a_directory);
  std::filesystem::remove(path_);
  std::filesystem::create_symlink(path_, path_);
  EXPECT_EQ(read(), std::errc::too_many_symbolic_link_levels);
}

// The size that stat() reports for the kernel's files is wrong, so they seem to grow while they are read.
TEST_F(WholeFileTest, GivesUpOnAFileThatChangesAtEveryRead) {
  EXPECT_EQ(readWholeFile("/proc/self/stat", kMax, text_, stamp_), std::errc::resource_unavailable_try_again);
}

TEST_F(WholeFileTest, ReadsTheOldOrTheNewContentsOfAReplacedFile) {
  write(std::string(900, 'a'));
  std::atomic<bool> stop{false};
  std::thread publisher([&] {
    for (char letter = 'a'; !stop; letter = letter == 'a' ? 'b' : 'a') {
      const std::string other = directory_.path(".new");
      std::ofstream(other) << std::string(900, letter);
      std::filesystem::rename(other, path_);
    }
  });
  for (int time = 0; time < 3000; ++time) {
    ASSERT_FALSE(read());
    EXPECT_TRUE(text_ == std::string(900, 'a') || text_ == std::string(900, 'b')) << text_;
  }
  stop = true;
  publisher.join();
}

}  // namespace
}  // namespace tonewerk
