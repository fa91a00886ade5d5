// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/ProcessFiles.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
#include <unistd.h>

#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;

class ProcessFilesTest : public testing::Test {
 protected:
  void put(const std::string& name, const std::string& text) {
    const std::filesystem::path path = directory_.path(name);
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path) << text;
  }

  TemporaryDirectory directory_;
  const ProcessFiles files_{directory_.path()};
  std::error_code error_;
};

TEST_F(ProcessFilesTest, ProcessesAreNumbersInOrder) {
  for (const char* name : {"30/stat", "4/stat", "self/stat", "007/stat", "-1/stat", "0/stat", "5x/stat"}) {
    put(name, "x");
  }
  EXPECT_THAT(files_.processes(error_), ElementsAre(4, 30));
  EXPECT_FALSE(error_);
}

TEST_F(ProcessFilesTest, SaysThatThereIsNoSuchDirectory) {
  EXPECT_THAT(ProcessFiles(directory_.path("none")).processes(error_), IsEmpty());
  EXPECT_EQ(error_, std::errc::no_such_file_or_directory);
}

TEST_F(ProcessFilesTest, DistinguishesEndedFromUnreadableProcesses) {
  put("4/stat", "4 (a\xFF) S");
  put("4/status", "");
  std::string bytes;
  EXPECT_FALSE(files_.read(4, "stat", bytes));
  EXPECT_EQ(bytes, "4 (a\xFF) S");
  EXPECT_FALSE(ProcessFiles::isGone(files_.read(4, "status", bytes)));
  EXPECT_TRUE(ProcessFiles::isGone(files_.read(5, "status", bytes)));
}

TEST_F(ProcessFilesTest, FindsThisProcessAmongTheKernels) {
  EXPECT_THAT(ProcessFiles("/proc").processes(error_), Contains(getpid()));
}

}  // namespace
}  // namespace tonewerk
