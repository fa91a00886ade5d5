// SPDX-License-Identifier: Apache-2.0
//
// Tests drafts of bug reports across restarts of the daemon.
#include <chrono>
#include <filesystem>
#include <string>

#include "system/support/DaemonTest.h"

namespace tonewerk {
namespace {

class IssueDraftsSystemTest : public DaemonTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n"));
    ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.twreporting.toml",
                                          "VidroInvalidXyBackOffSeconds = 3600\n"));
    daemon.setEnvironment("TONEWERK_LOG", "debug");
  }

  // Runs the daemon once; a call reports invalid coordinates.
  void reportOnce() {
    ASSERT_TRUE(daemon.start());
    {
      DaemonClient client = connect();
      client.create(77, 2);
      client.start(77);
      client.send({{"twreporting_timestamp", now() - 10.0}}, 5, 1, {77});
      client.send({{"vdac_invalid_x", true}}, 11, 0, {77});
      client.stop(77);
    }
    EXPECT_EQ(daemon.stop(), 0);
  }
  static double now() {
    return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  }
  std::string preferences() const {
    return daemon.path(DaemonProcess::kState, "preferences/com.orvane.tonewerk.twreporting.toml");
  }
};

TEST_F(IssueDraftsSystemTest, TheBackOffSurvivesARestart) {
  reportOnce();
  EXPECT_EQ(logLinesWith("Starting issue draft for VidroXYerrorMessage reporterID=77"), 1U) << daemon.log();
  EXPECT_EQ(logLinesWith("Issue draft has not run. key=VidroInvalidXyIDRlastRun"), 1U);
  EXPECT_TRUE(std::filesystem::exists(preferences()));
  reportOnce();
  EXPECT_EQ(logLinesWith("Issue draft has run. key=VidroInvalidXyIDRlastRun"), 1U);
  EXPECT_EQ(logLinesWith("Starting issue draft"), 1U);
}

TEST_F(IssueDraftsSystemTest, WithoutTheKeptTimeTheNextRunDraftsAgain) {
  reportOnce();
  ASSERT_TRUE(std::filesystem::remove(preferences()));
  reportOnce();
  EXPECT_EQ(logLinesWith("Starting issue draft"), 2U);
}

}  // namespace
}  // namespace tonewerk
