// SPDX-License-Identifier: Apache-2.0
//
// Tests signals to the daemon, and preference files that are written while it runs.
#include <algorithm>
#include <filesystem>
#include <signal.h>
#include <string>

#include "support/NotifySocket.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
const std::string kEvent = "com.orvane.longformaudio.Playback.Start";
const std::string kFeature = "spatial-audio-accessory-feature";

class ReloadTest : public DaemonTest {
 protected:
  void start() {
    daemon.setEnvironment("NOTIFY_SOCKET", manager.path());
    ASSERT_TRUE(daemon.start());
    ASSERT_THAT(manager.waitForLine("READY=1"), Not(IsEmpty()));
  }
  // Returns when the daemon has reported that the reload is done.
  void reload() {
    daemon.process().signal(SIGHUP);
    EXPECT_THAT(manager.waitForLine("RELOADING=1"), HasSubstr("MONOTONIC_USEC="));
    EXPECT_THAT(manager.waitForLine("READY=1"), HasSubstr("STATUS=Listening on"));
  }
  std::size_t recorded() const { return RecordedEvents(daemon.storePath()).named(kEvent).size(); }
  static void report(DaemonClient& client, int n) { client.send({{"number", n}}, 4, kTypeStart, {kSession}); }

  NotifySocket manager;
};

TEST_F(ReloadTest, AHangUpEndsNothingAndTellsTheManagerOfTheReload) {
  start();
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  for (int times = 0; times < 3; ++times) reload();
  EXPECT_EQ(client.serviceType(kSession), kLongFormAudio);
  EXPECT_TRUE(daemon.process().isRunning());
  EXPECT_EQ(daemon.stop(), 0);  // after which the whole log is written
  EXPECT_EQ(logLinesWith("preferences and device facts are read again"), 3U);
}

TEST_F(ReloadTest, ConsumersAreReadAgainAtOnce) {
  start();
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  report(client, 1);
  ASSERT_TRUE(waitUntil([&] { return recorded() == 1; }));
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.metricon.toml", "consumers = []\n"));
  reload();
  report(client, 2);  // no consumer asks for it any more
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.metricon.toml", ""));
  reload();
  report(client, 3);
  ASSERT_TRUE(waitUntil([&] { return recorded() == 2; }));
  client.stop(kSession);
  const auto events = RecordedEvents(daemon.storePath()).named(kEvent);
  ASSERT_EQ(events.size(), 2U);
  EXPECT_EQ(events[1].at("number"), 3);
}

TEST_F(ReloadTest, BackendsAreThoseOfTheTimeAtWhichASessionStarted) {
  start();
  const RecordedEvents recorded(daemon.storePath());
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  ASSERT_TRUE(waitUntil([&] { return recorded.rtcSessions().size() == 1; }));
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.linkreport.toml", "backends = []\n"));
  reload();
  client.create(kSession + 1, kLongFormAudio);
  client.start(kSession + 1);
  ASSERT_TRUE(waitForLogLine("no backends found, this session won't get sent to the server"));
  client.send({{"number", 1}}, 4, kTypeStart, {kSession, kSession + 1});
  EXPECT_EQ(daemon.stop(), 0);  // after everything was written

  const auto sessions = recorded.rtcSessions();
  ASSERT_EQ(sessions.size(), 1U);
  EXPECT_EQ(sessions[0].at("TWReportingSessionID"), kSession);
  const auto messages = recorded.rtcMessages();
  EXPECT_EQ(std::count_if(messages.begin(), messages.end(),
                          [](const auto& message) { return message.value("number", nlohmann::json()) == 1; }),
            1);
}

TEST_F(ReloadTest, AnIdleDaemonKeepsToANewBoundOfTheStore) {
  start();
  {
    DaemonClient client = connect();
    client.create(kSession, kLongFormAudio);
    client.start(kSession);
    for (int n = 0; n < 60; ++n) {
      client.send({{"number", n}, {"text", std::string(100'000, 'x')}}, 4, kTypeStart, {kSession});
    }
    client.stop(kSession);
  }
  ASSERT_TRUE(waitUntil([&] { return recorded() == 60; }));
  ASSERT_GT(fs::file_size(daemon.storePath()), 5 << 20);
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.store.toml", "max_megabytes = 1\n"));
  reload();
  EXPECT_TRUE(waitUntil([&] { return fs::file_size(daemon.storePath()) <= 1 << 20; }));
  EXPECT_THAT(RecordedEvents(daemon.storePath()).names(), Not(IsEmpty()));
}

TEST_F(ReloadTest, AnInternalBuildStaysWhatItWasAndOtherFactsAreReadAgain) {
  ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = false\n"));
  start();
  ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\noops\n"));
  EXPECT_EQ(logLinesWith("device-facts.toml:2:"), 0U);
  reload();
  EXPECT_TRUE(waitForLogLine("device-facts.toml:2:"));
  ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n"));
  reload();

  // It is no longer an internal build, so no file of the session's messages is written.
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  report(client, 1);
  client.stop(kSession);
  client.disconnect();
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_FALSE(fs::exists(daemon.path(DaemonProcess::kLogs, "Audio/Reporting")));
}

TEST_F(ReloadTest, RunningSessionsAreToldOfAFeatureThatWasEditedByHand) {
  start();
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.toml", "device_name = 'Kitchen'\n"));
  reload();
  EXPECT_TRUE(waitUntil([&] {
    for (const auto& event :
         RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.Setup.Setup")) {
      if (event.contains("device_name") && event.at("device_name") == "Kitchen") return true;
    }
    return false;
  })) << daemon.log();
}

TEST_F(ReloadTest, AUserSignalIsAnsweredWithALineOfStatus) {
  start();
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.create(kSession + 1, kLongFormAudio);
  daemon.process().signal(SIGUSR1);
  EXPECT_TRUE(waitForLogLine("status: clients 1, their sessions 2")) << daemon.log();
  EXPECT_EQ(client.serviceType(kSession), kLongFormAudio);
}

TEST_F(ReloadTest, ADaemonThatIsEndingIsNotStoppedByAHangUp) {
  start();
  daemon.process().signal(SIGTERM);
  daemon.process().signal(SIGHUP);
  daemon.process().signal(SIGUSR1);
  EXPECT_EQ(daemon.process().wait(), 0);
}

TEST_F(ReloadTest, APreferenceFileThatDoesNotParseIsSaidWhenItIsWritten) {
  start();
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.unheard.of.toml", "fine = 1\n= 5\n"));
  EXPECT_TRUE(waitForLogLine("com.orvane.unheard.of.toml:2:"));
  // Also below the state directory, where the preferences are created only now.
  const std::string written = daemon.path(DaemonProcess::kState, "preferences");
  fs::create_directory(written);
  ASSERT_TRUE(
      daemon.writeConfiguration("../state/preferences/com.orvane.metricon.toml", "\n\nconsumers = [\n"));
  EXPECT_TRUE(waitForLogLine("state/preferences/com.orvane.metricon.toml:")) << daemon.log();
}

TEST_F(ReloadTest, APreferenceFileThatDoesNotParseIsSaidAtTheStart) {
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.unheard.of.toml", "= 5\n"));
  start();
  EXPECT_EQ(logLinesWith("com.orvane.unheard.of.toml:1:"), 1U);
}

TEST_F(ReloadTest, PreferencesAreWatchedInAConfigurationThatComesLater) {
  const std::string later = daemon.path(DaemonProcess::kConfiguration, "not/yet/there");
  daemon.setEnvironment("CONFIGURATION_DIRECTORY", later);
  start();
  for (const char* part : {"not", "not/yet", "not/yet/there", "not/yet/there/preferences"}) {
    fs::create_directory(daemon.path(DaemonProcess::kConfiguration, part));
  }
  ASSERT_TRUE(daemon.writeConfiguration("not/yet/there/preferences/com.orvane.metricon.toml", "= 5\n"));
  EXPECT_TRUE(waitForLogLine("com.orvane.metricon.toml:1:")) << daemon.log();
}

}  // namespace
}  // namespace tonewerk
