// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/RegularFile.h"

#include <fstream>
#include <gtest/gtest.h>
#include <initializer_list>
#include <string>

#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

class RegularFileTest : public testing::Test {
 protected:
  std::error_code read(std::size_t expectedBytes, std::size_t mostBytes) {
    RegularFile file;
    struct stat status {};
    if (const std::error_code error = file.open(path_, status)) return error;
    return file.read(expectedBytes, mostBytes, bytes_);
  }

  TemporaryDirectory directory_;
  const std::string path_ = directory_.path("file");
  std::string bytes_;
};

TEST_F(RegularFileTest, ReadsTheSameWhateverIsExpected) {
  const std::string text(10'000, 'a');
  std::ofstream(path_) << text;
  for (const std::size_t expected :
       std::initializer_list<std::size_t>{0, 1, 9'999, 10'000, 10'001, 1'000'000}) {
    EXPECT_FALSE(read(expected, text.size()));
    EXPECT_EQ(bytes_, text) << expected;
  }
}

TEST_F(RegularFileTest, FailsForAFileBeyondTheLimit) {
  std::ofstream(path_) << std::string(10'000, 'a');
  for (const std::size_t expected : std::initializer_list<std::size_t>{0, 9'999, 10'000}) {
    EXPECT_EQ(read(expected, 9'999), std::errc::file_too_large) << expected;
  }
}

}  // namespace
}  // namespace tonewerk
