// SPDX-License-Identifier: Apache-2.0
//
// Tests that a message starts the memory tools as processes.
#include <chrono>
#include <string>

#include "system/support/DaemonTest.h"

namespace tonewerk {
namespace {

using ::testing::HasSubstr;

constexpr AudioServiceType kTest = 11;
constexpr AudioEventType kMemoryLog = 19;

class MemoryLogSystemTest : public DaemonTest {
 protected:
  // Starts a daemon with these tools (its own when empty), and sends the message from a client.
  void requestMemoryLog(const std::string& tools) {
    if (!tools.empty()) {
      ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.twreporting.toml",
                                            "memory_tools = " + tools + "\n"));
    }
    ASSERT_TRUE(daemon.start());
    DaemonClient client = connect();
    client.create(77, kTest);
    client.start(77);
    client.send({{"reason", "test"}}, 1, kMemoryLog, {77});
    client.stop(77);
  }
};

TEST_F(MemoryLogSystemTest, TheDaemonsOwnToolIsFoundBesideIt) {
  requestMemoryLog({});
  EXPECT_EQ(logLinesWith("request tw-memory-usage captured"), 1U) << daemon.log();
  EXPECT_GT(logLinesWith("wiredlog: ", "twreportingd (user "), 0U);
  EXPECT_GT(logLinesWith("wiredlog: ", " phys_footprint "), 1U);
  EXPECT_GT(logLinesWith("WIRED LOG BLOCK 2"), 0U);
}

TEST_F(MemoryLogSystemTest, ToolsComeFromThePreference) {
  requestMemoryLog(R"(["echo noise; echo RESOURCE first", "echo second; exit 4"])");
  EXPECT_THAT(daemon.log(), HasSubstr("WIRED LOG BLOCK 1\nsecond\n"));
  EXPECT_THAT(daemon.log(), HasSubstr("WIRED LOG BLOCK 1\nwiredlog: RESOURCE first\n"));
  EXPECT_EQ(logLinesWith("was stopped"), 0U);
  EXPECT_EQ(logLinesWith("failed with status 4"), 1U);
}

TEST_F(MemoryLogSystemTest, ToolsThatAreNotThereOrWriteWithoutEndAreSaid) {
  requestMemoryLog(R"(["/nowhere/tool", "yes 0123456789012345678901234567890123456789"])");
  EXPECT_EQ(logLinesWith("wiredlog: unable to execute '/nowhere/tool'"), 1U);
  EXPECT_EQ(logLinesWith("was stopped after 4194304 bytes"), 1U);
  // 13 lines of 41 bytes in each block, and a last block of 127 bytes.
  EXPECT_EQ(logLinesWith("WIRED LOG BLOCK 7870"), 1U);
  EXPECT_EQ(logLinesWith("WIRED LOG BLOCK 7871"), 0U);
}

}  // namespace
}  // namespace tonewerk
