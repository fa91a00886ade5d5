// SPDX-License-Identifier: Apache-2.0
//
// Tests that sessions outlive a crash of the daemon: the next one reports them as if they had been stopped.
#include <chrono>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "platform/linux/store/RowsOf.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr AudioEventCategory kPlayback = 4;
const std::string kStarts = "com.orvane.longformaudio.Playback.Start";
const std::string kSummaries = "com.orvane.longformaudio.Volume.Summary";
const std::string kSessionSummaries = "com.orvane.longformaudio.Session_Generic.Summary";

class RecoveryTest : public DaemonTest {
 protected:
  void SetUp() override { ASSERT_TRUE(daemon.start()); }

  // Kills the daemon and starts the next one.
  void crash() {
    killDaemon();
    startNext();
  }
  // A daemon listens before it recovers, and serves after it.
  void startNext() {
    ASSERT_TRUE(daemon.start());
    EXPECT_THAT(connect().allReporters(), IsEmpty());
  }
  void killDaemon() {
    daemon.process().kill();
    daemon.process().wait();
  }

  void say(DaemonClient& client, AudioEventType type, double at, ValueMap message,
           ReporterID session = kSession) {
    message.set("twreporting_timestamp", begin + at);
    client.send(message, kPlayback, type, {session});
  }
  // Starts a session and plays in it for a minute, at two volumes.
  void play(DaemonClient& client, ReporterID session = kSession) {
    client.create(session, kLongFormAudio);
    client.setConfiguration(session, {{"HostApplicationDisplayID", "com.example.player"}});
    client.start(session);
    say(client, kTypeStart, 0.0,
        {{"session_output_running", true}, {"QMSessionVolume", 0.25}, {"active_devices", "Speaker"}},
        session);
    say(client, kTypeGeneric, 10.0, {{"QMSessionVolume", 0.75}}, session);
    say(client, kTypeStop, 60.0, {{"session_output_running", false}}, session);
  }
  // The payloads of the events, without the times at which the daemon handled them.
  std::vector<nlohmann::json> recorded(const std::string& name) const {
    std::vector<nlohmann::json> events = RecordedEvents(daemon.storePath()).named(name);
    for (auto& event : events) {
      for (const char* key :
           {"internal_event_epoch_time", "internal_event_system_uptime_sec", "twreporting_timestamp"})
        event.erase(key);
    }
    return events;
  }

  // A minute before the test, in seconds since 1970.
  const double begin =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count() - 60.0;
};

TEST_F(RecoveryTest, AnOpenSessionIsReportedAsAnOrderlyStopWouldHave) {
  {
    DaemonClient client = connect();
    play(client);
    client.stop(kSession);
    ASSERT_EQ(daemon.stop(), 0);
  }
  const std::vector<nlohmann::json> orderly = recorded(kSummaries);
  ASSERT_THAT(orderly, SizeIs(2));
  std::vector<nlohmann::json> sessions = recorded(kSessionSummaries);
  ASSERT_THAT(sessions, SizeIs(1));
  // What says how the device is now is left out of what is recovered.
  for (const char* key : {"thermal_state", "low_power_enabled", "vmInfo_phys_footprint_MiB", "load_avg_1_min",
                          "load_avg_5_min", "load_avg_15_min"}) {
    EXPECT_EQ(sessions.front().erase(key), 1U) << key;
  }
  std::filesystem::remove_all(daemon.path(DaemonProcess::kState));
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  play(client);
  EXPECT_THAT(recorded(kSummaries), IsEmpty());
  crash();
  EXPECT_EQ(recorded(kSummaries), orderly);
  EXPECT_EQ(recorded(kSessionSummaries), sessions);
}

TEST_F(RecoveryTest, WhatWasAnsweredIsStoredOnceAfterACrash) {
  constexpr int kMessages = 50;
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  for (int number = 0; number < kMessages; ++number) {
    client.send({{"number", number}}, kPlayback, kTypeStart, {kSession});
  }
  crash();
  EXPECT_EQ(daemon.stop(), 0);
  std::vector<int> numbers;
  for (const auto& event : recorded(kStarts)) numbers.push_back(event.at("number"));
  std::vector<int> expected;
  for (int number = 0; number < kMessages; ++number) expected.push_back(number);
  EXPECT_THAT(numbers, ::testing::ElementsAreArray(expected));
}

TEST_F(RecoveryTest, ASessionThatHasStoppedIsNotReportedAgain) {
  DaemonClient client = connect();
  play(client);
  client.stop(kSession);
  play(client, kSession + 1);
  crash();
  EXPECT_THAT(recorded(kSummaries), SizeIs(4));
  crash();
  EXPECT_THAT(recorded(kSummaries), SizeIs(4));
}

TEST_F(RecoveryTest, ASessionHasOneLifeAndItsEndingHoweverOftenTheDaemonCrashes) {
  const auto lives = [this] {
    SqliteDatabase store;
    EXPECT_TRUE(store.open(daemon.storePath(), SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(30)));
    return rowsOf(
        store,
        "SELECT reporter_id, ending, messages, application, (SELECT count(*) FROM volume_stretch AS v"
        " WHERE v.session = s.id AND v.started_at > 0) FROM session AS s ORDER BY id",
        5);
  };
  DaemonClient client = connect();
  play(client);
  client.stop(kSession);
  play(client, kSession + 1);
  const std::string stopped = std::to_string(kSession) + " stopped 3 com.example.player 2";
  const std::string interrupted = std::to_string(kSession + 1) + " interrupted 3 com.example.player 2";
  crash();
  EXPECT_THAT(lives(), ElementsAre(stopped, interrupted));
  crash();
  EXPECT_THAT(lives(), ElementsAre(stopped, interrupted));
}

TEST_F(RecoveryTest, NothingIsRecoveredAfterAnEndInOrder) {
  {
    DaemonClient client = connect();
    play(client);
  }
  ASSERT_EQ(daemon.stop(), 0);
  ASSERT_TRUE(daemon.start());
  EXPECT_EQ(logLinesWith("did not end in order"), 0U);
  EXPECT_THAT(recorded(kSummaries), SizeIs(2));
}

TEST_F(RecoveryTest, AJsonFileIsWrittenOnceAfterACrash) {
  constexpr AudioServiceType kTest = 11;
  DaemonClient client = connect();
  for (ReporterID session : {kSession, kSession + 1}) {
    client.create(session, kTest);
    client.start(session);
    client.send({{"text", "hello"}}, 9, kTypeGeneric, {session});
  }
  const auto files = [this] {
    std::size_t count = 0;
    for (const auto& entry :
         std::filesystem::recursive_directory_iterator(daemon.path(DaemonProcess::kLogs))) {
      if (entry.path().extension() == ".json") ++count;
    }
    return count;
  };
  client.stop(kSession);
  ASSERT_TRUE(waitUntil([&] { return files() == 1; }));
  crash();
  EXPECT_EQ(files(), 2U);
  crash();
  EXPECT_EQ(files(), 2U);
}

TEST_F(RecoveryTest, MessagesWithoutASessionAreRecoveredToo) {
  DaemonClient client = connect();
  client.send({{"number", 1}}, kPlayback, kTypeStart, {});
  crash();
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(RecordedEvents(daemon.storePath()).names(),
              ::testing::Contains("com.orvane.standalone.Playback.Start").Times(1));
}

TEST_F(RecoveryTest, ARecoveryThatIsKilledIsDoneAgain) {
  DaemonClient client = connect();
  for (ReporterID session = 1; session <= 20; ++session) play(client, session);
  killDaemon();
  for (int milliseconds : {5, 20, 40, 60, 80, 120, 160}) {
    ASSERT_TRUE(daemon.startWithoutWaiting());
    std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
    killDaemon();
  }
  ASSERT_TRUE(daemon.start());
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(recorded(kSummaries), SizeIs(40));
}

// The store writes some of the reports while others are still made.
TEST_F(RecoveryTest, ACrashWhileManySessionsStopLosesNoneAndDoublesNone) {
  constexpr int kSessions = 250;
  std::optional<DaemonClient> client = connect();
  for (ReporterID session = 1; session <= kSessions; ++session) play(*client, session);
  client.reset();
  const auto stored = [this] {
    return std::filesystem::exists(daemon.storePath()) ? recorded(kSummaries).size() : 0;
  };
  ASSERT_TRUE(waitUntil([&] { return stored() > 0; }));
  killDaemon();
  ASSERT_LT(stored(), 2U * kSessions) << "all sessions had stopped before the crash";
  // The recovery is killed in the same way.
  const std::size_t before = stored();
  ASSERT_TRUE(daemon.startWithoutWaiting());
  ASSERT_TRUE(waitUntil([&] { return stored() > before; }));
  killDaemon();
  ASSERT_TRUE(daemon.start());
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(recorded(kSummaries), SizeIs(2 * kSessions));
}

TEST_F(RecoveryTest, WhatHasBeenReportedIsNotReportedToAStoreThatIsNew) {
  DaemonClient client = connect();
  play(client);
  client.stop(kSession);
  client.disconnect();
  EXPECT_EQ(daemon.stop(), 0);
  ASSERT_THAT(recorded(kSummaries), SizeIs(2));
  for (const char* file : {"reports.db", "reports.db-wal", "reports.db-shm"}) {
    std::filesystem::remove(daemon.path(DaemonProcess::kState, file));
  }
  startNext();
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(recorded(kSummaries), IsEmpty());
}

TEST_F(RecoveryTest, AJournalThatEndsEachStartIsMovedAside) {
  DaemonClient client = connect();
  play(client);
  killDaemon();
  std::ofstream(daemon.path(DaemonProcess::kState, "journal/attempts")) << "30\n";
  startNext();
  EXPECT_TRUE(waitForLogLine("it is moved to"));
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_TRUE(std::filesystem::exists(daemon.path(DaemonProcess::kState, "journal.failed")));
  EXPECT_THAT(recorded(kSummaries), IsEmpty());
}

TEST_F(RecoveryTest, ClientsThatComeBackBeginNewSessions) {
  DaemonClient before = connect();
  play(before);
  crash();
  DaemonClient after = connect();
  EXPECT_THAT(after.allReporters(), IsEmpty());
  play(after);
  after.stop(kSession);
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(recorded(kSummaries), SizeIs(4));
}

TEST_F(RecoveryTest, WithoutAJournalNoSessionIsRecovered) {
  EXPECT_EQ(daemon.stop(), 0);
  ASSERT_TRUE(
      daemon.writeConfiguration("preferences/com.orvane.tonewerk.store.toml", "journal_megabytes = 0\n"));
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  play(client);
  crash();
  EXPECT_THAT(recorded(kSummaries), IsEmpty());
  for (const auto& file :
       std::filesystem::directory_iterator(daemon.path(DaemonProcess::kState, "journal"))) {
    ADD_FAILURE() << file.path() << " was written";
  }
}

TEST_F(RecoveryTest, WhatWasKeptIsRecoveredWhenTheJournalIsTurnedOff) {
  DaemonClient client = connect();
  play(client);
  killDaemon();
  ASSERT_TRUE(
      daemon.writeConfiguration("preferences/com.orvane.tonewerk.store.toml", "journal_megabytes = 0\n"));
  startNext();
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(recorded(kSummaries), SizeIs(2));
}

}  // namespace
}  // namespace tonewerk
