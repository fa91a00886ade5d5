// SPDX-License-Identifier: Apache-2.0
//
// Tests how much memory one user can make the daemon use. Only with the C library's allocator: sanitizers
// need several times as much.
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "system/memory/Sanitizers.h"
#include "system/support/UsersTest.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMegabyte = std::size_t{1} << 20;

class UserMemoryTest : public UsersTest {
 protected:
  void SetUp() override {
    if (kHasSanitizer) GTEST_SKIP() << "a sanitizer's allocator keeps what it has";
    UsersTest::SetUp();
  }

  // Expects that the memory soon falls below this number of megabytes.
  void expectMemoryBelow(std::size_t megabytes) {
    EXPECT_TRUE(waitUntil([&] { return daemon.residentBytes() < megabytes * kMegabyte; }))
        << daemon.residentBytes() / kMegabyte << " MiB";
  }

  // Publishes `count` simple channels, in files of 1,000.
  void publishChannels(int count, int value) const {
    constexpr int kInFile = 1'000;
    const std::filesystem::path directory = daemon.path(DaemonProcess::kRuntime, "channels");
    std::filesystem::create_directories(directory);
    for (int first = 0; first < count; first += kInFile) {
      const std::string name = "driver" + std::to_string(first);
      std::ofstream file(directory / ("." + name));
      file << R"({"driver": ")" << name << R"(", "channels": [)";
      for (int at = 0; at < kInFile; ++at) {
        file << (at == 0 ? "" : ",") << R"({"group": "Speaker", "name": "c)" << at
             << R"(", "format": "simple", "value": )" << value + at << "}";
      }
      file << "]}" << std::flush;
      std::filesystem::rename(directory / ("." + name), directory / (name + ".json"));
    }
  }
};

// Over so many connections one user would hold 400 MiB; its share is 64.
TEST_F(UserMemoryTest, FramesThatNeverEndTakeNoMoreThanAUsersShareAndAreGivenBack) {
  ASSERT_TRUE(startDaemon());
  const std::size_t idle = daemon.residentBytes();
  UserProcess& alice = start(kAlice, {"unfinished", "400"});
  EXPECT_GT(alice.number("taken").value_or(0), 0);
  EXPECT_LT(daemon.residentBytes(), 256 * kMegabyte);
  DaemonClient bob = connectAs(kBob);
  bob.create(77, 7);
  EXPECT_EQ(bob.serviceType(77), 7);
  alice.kill();
  expectMemoryBelow(idle / kMegabyte + 32);
}

TEST_F(UserMemoryTest, NestedArraysCountAsWhatTheyTake) {
  // Half of it is one user's.
  ASSERT_TRUE(
      daemon.writeConfiguration("preferences/com.orvane.tonewerk.service.toml", "kept_megabytes = 64\n"));
  ASSERT_TRUE(startDaemon());
  const std::size_t idle = daemon.residentBytes();
  start(kAlice, {"nested", "24"});
  // Beside what is kept there is one message at a time, and what the sinks have not written yet.
  EXPECT_LT(daemon.residentBytes(), idle + (32 + 192) * kMegabyte);
  DaemonClient bob = connectAs(kBob);
  bob.create(77, 7);
  EXPECT_EQ(bob.serviceType(77), 7);
}

TEST_F(UserMemoryTest, SnapshotsOfManyChannelsTakeNoMoreThanAUsersShareAndHoldUpNobodyElse) {
  publishChannels(32'000, 1);
  ASSERT_TRUE(startDaemon());
  start(kAlice, {"sessions", "1"});
  const std::size_t first = daemon.residentBytes();
  UserProcess& alice = start(kAlice, {"sessions", "1000"});
  EXPECT_LT(daemon.residentBytes(), first + 128 * kMegabyte);
  publishChannels(32'000, 100);
  alice.kill();
  expectBobNotHeldUp();
}

}  // namespace
}  // namespace tonewerk
