// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/TraceDirectory.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>

#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

class TraceDirectoryTest : public testing::Test {
 protected:
  std::shared_ptr<TraceDirectory> make(const std::string& name) {
    return TraceDirectory::make(root_.path("traces"), name, error_);
  }

  TemporaryDirectory root_;
  std::error_code error_;
};

TEST_F(TraceDirectoryTest, ExistsAsLongAsItsOwner) {
  auto directory = make("one");
  ASSERT_NE(directory, nullptr);
  EXPECT_EQ(directory->path(), root_.path("traces/one"));
  fs::create_directories(directory->path() + "/ust/uid");
  std::ofstream(directory->path() + "/ust/uid/metadata") << "text";
  const std::shared_ptr<void> token = directory;
  directory.reset();
  EXPECT_TRUE(fs::exists(root_.path("traces/one/ust/uid/metadata")));
}

TEST_F(TraceDirectoryTest, IsRemovedWithItsContents) {
  {
    const auto directory = make("one");
    fs::create_directories(directory->path() + "/ust/uid");
    std::ofstream(directory->path() + "/ust/uid/metadata") << "text";
  }
  EXPECT_FALSE(fs::exists(root_.path("traces/one")));
  EXPECT_TRUE(fs::exists(root_.path("traces")));
}

TEST_F(TraceDirectoryTest, IsAccessibleToItsOwnerOnly) {
  const auto directory = make("one");
  EXPECT_EQ(fs::status(directory->path()).permissions(), fs::perms::owner_all);
}

TEST_F(TraceDirectoryTest, FailsIfItExists) {
  const auto first = make("one");
  EXPECT_EQ(make("one"), nullptr);
  EXPECT_EQ(error_, std::errc::file_exists);
}

TEST_F(TraceDirectoryTest, SaysWhyItCannotBeMade) {
  std::ofstream(root_.path("traces")) << "in the way";
  EXPECT_EQ(make("one"), nullptr);
  EXPECT_TRUE(error_);
}

TEST_F(TraceDirectoryTest, RemovesLeftoversOfAnEarlierProcess) {
  fs::create_directories(root_.path("traces/old/ust"));
  std::ofstream(root_.path("traces/session-daemon.log")) << "text";
  TraceDirectory::removeLeftovers(root_.path("traces"));
  EXPECT_TRUE(fs::is_empty(root_.path("traces")));
  TraceDirectory::removeLeftovers(root_.path("nowhere"));
}

}  // namespace
}  // namespace tonewerk
