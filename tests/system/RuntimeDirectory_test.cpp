// SPDX-License-Identifier: Apache-2.0
//
// Tests a runtime directory that is removed and made again while the daemon runs.
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;

class RuntimeDirectoryTest : public RunningDaemonTest {
 protected:
  // Tries again, because the daemon may be creating files in it, as it does at its start.
  void remove() const {
    ASSERT_TRUE(waitUntil([&] {
      std::error_code error;
      fs::remove_all(runtime, error);
      return !error;
    }));
  }

  const std::string runtime = daemon.path(DaemonProcess::kRuntime);
};

TEST_F(RuntimeDirectoryTest, GetsItsSocketBackWhenItIsMadeAgainAndConnectionsLiveOn) {
  DaemonClient old = connect();
  old.create(kSession, kLongFormAudio);
  for (int round = 0; round < 3; ++round) {
    remove();
    EXPECT_FALSE(daemon.accepts());
    EXPECT_EQ(old.serviceType(kSession), kLongFormAudio);
    fs::create_directory(runtime);
    EXPECT_TRUE(waitUntil([&] { return daemon.accepts(); })) << daemon.log();
    DaemonClient fresh = connect();
    EXPECT_EQ(fresh.serviceType(kSession), kLongFormAudio);
  }
  EXPECT_EQ(fs::status(daemon.socketPath()).permissions(), fs::perms(0660));
  EXPECT_EQ(old.serviceType(kSession), kLongFormAudio);
  old.disconnect();
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_FALSE(fs::exists(daemon.socketPath()));
}

TEST_F(RuntimeDirectoryTest, IsNotMadeByTheDaemonItself) {
  remove();
  EXPECT_TRUE(waitForLogLine("clients cannot connect: " + daemon.socketPath() + " went with its directory"));
  EXPECT_FALSE(fs::exists(runtime));
}

TEST_F(RuntimeDirectoryTest, GetsItsNotificationsBack) {
  remove();
  fs::create_directory(runtime);
  const std::string notifications = runtime + "/notifications";
  ASSERT_TRUE(waitUntil([&] { return fs::is_directory(notifications) && daemon.accepts(); }));
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  ASSERT_TRUE(std::ofstream(notifications + "/com.orvane.homedeck.ringerstate") << "1\n" << std::flush);
  EXPECT_TRUE(waitUntil([&] {
    for (const auto& event :
         RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.Setup.Setup")) {
      if (event.value("ringerstate", nlohmann::json()) == true) return true;
    }
    return false;
  })) << daemon.log();
}

TEST_F(RuntimeDirectoryTest, AnotherDaemonsSocketInItIsLeftAlone) {
  remove();
  DaemonProcess other;
  ChildProcess process;
  const ChildCommand command{TONEWERK_DAEMON_PATH,
                             {},
                             {{"RUNTIME_DIRECTORY", other.path(DaemonProcess::kRuntime)},
                              {"STATE_DIRECTORY", other.path(DaemonProcess::kState)},
                              {"LOGS_DIRECTORY", other.path(DaemonProcess::kLogs)},
                              {"CONFIGURATION_DIRECTORY", other.path(DaemonProcess::kConfiguration)}}};
  ASSERT_TRUE(process.start(command, other.path(DaemonProcess::kState, "output"),
                            other.path(DaemonProcess::kState, "log")));
  ASSERT_TRUE(waitUntil([&] { return other.accepts(); }));
  // It answers when it has started: until then it may make its directory again, and a new socket there.
  EXPECT_THAT(DaemonClient(other.socketPath()).allReporters(), testing::IsEmpty());
  // The other daemon's directory takes the place of this one's, as when another daemon is started after a
  // clean-up.
  fs::rename(other.path(DaemonProcess::kRuntime), runtime);
  EXPECT_TRUE(waitForLogLine("clients cannot connect: " + daemon.socketPath() + " is in use by"))
      << daemon.log();
  EXPECT_TRUE(daemon.accepts());
  process.signal(SIGTERM);
  EXPECT_EQ(process.wait(), 0);
}

TEST_F(RuntimeDirectoryTest, ASocketThatIsRemovedAloneComesBackWithAReload) {
  fs::remove(daemon.socketPath());
  EXPECT_FALSE(daemon.accepts());
  daemon.process().signal(SIGHUP);
  EXPECT_TRUE(waitUntil([&] { return daemon.accepts(); })) << daemon.log();
}

}  // namespace
}  // namespace tonewerk
