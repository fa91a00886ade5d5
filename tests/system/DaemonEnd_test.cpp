// SPDX-License-Identifier: Apache-2.0
//
// Tests how the daemon ends, by a signal, a request or a crash, and what the store then contains.
#include <filesystem>
#include <signal.h>
#include <sqlite3.h>
#include <string>
#include <vector>

#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr AudioEventCategory kPlayback = 4;
constexpr int kKilled = 128 + SIGKILL;

const std::string kMessage = "com.orvane.longformaudio.Playback.Start";
const std::string kSummary = "com.orvane.longformaudio.Session_Generic.Summary";
const std::string kSingleMessage = "com.orvane.standalone.Playback.Start";

class DaemonEndTest : public RunningDaemonTest {
 protected:
  std::vector<nlohmann::json> events(const std::string& name) const {
    return RecordedEvents(daemon.storePath()).named(name);
  }

  // Starts a session and sends it a message.
  void startReporting(DaemonClient& client, ReporterID reporterID = kSession) {
    client.create(reporterID, kLongFormAudio);
    client.start(reporterID);
    client.send({{"a", reporterID}}, kPlayback, kTypeStart, {reporterID});
  }

  std::optional<int> endBy(int signal) {
    daemon.process().signal(signal);
    return daemon.process().wait();
  }

  void expectSoundStore() { EXPECT_EQ(RecordedEvents(daemon.storePath()).integrity(), "ok"); }
};

class DaemonEndBySignalTest : public DaemonEndTest, public ::testing::WithParamInterface<int> {};

TEST_P(DaemonEndBySignalTest, EveryStartedSessionIsStoppedAndReported) {
  DaemonClient first = connect();
  DaemonClient second = connect();
  // Sent before there is a started session, so that the daemon makes a single-message session.
  first.send({{"alone", 1}}, kPlayback, kTypeStart, {});
  startReporting(first);
  startReporting(first, 78);
  startReporting(second, 79);
  second.create(80, kLongFormAudio);  // never started: nothing to report

  EXPECT_EQ(endBy(GetParam()), 0);
  EXPECT_THAT(events(kMessage), SizeIs(3));
  EXPECT_THAT(events(kSummary), SizeIs(3));
  EXPECT_THAT(events(kSingleMessage), SizeIs(1));
  // The single-message session has no workers that report at its stop, so only the log shows its end.
  EXPECT_EQ(logLinesWith("ending session. reporterID=1"), 1U);
  EXPECT_TRUE(first.waitForEnd());
  EXPECT_TRUE(second.waitForEnd());
  EXPECT_FALSE(std::filesystem::exists(daemon.socketPath()));
  expectSoundStore();
}

TEST_P(DaemonEndBySignalTest, EverythingThatWasHandedOverIsInTheStore) {
  constexpr int kMessages = 3000;
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  for (int at = 0; at < kMessages; ++at) {
    client.request("sendMessage",
                   ReportingClient::messageArguments({{"number", at}}, kPlayback, kTypeStart, {kSession}));
  }
  ASSERT_TRUE(client.waitForAnswers(kMessages));
  EXPECT_EQ(endBy(GetParam()), 0);
  const std::vector<nlohmann::json> recorded = events(kMessage);
  ASSERT_THAT(recorded, SizeIs(kMessages));
  for (int at = 0; at < kMessages; ++at) ASSERT_EQ(recorded[static_cast<std::size_t>(at)].at("number"), at);
}

TEST_P(DaemonEndBySignalTest, ADaemonWithoutClientsEndsToo) { EXPECT_EQ(endBy(GetParam()), 0); }

INSTANTIATE_TEST_SUITE_P(Signals, DaemonEndBySignalTest, ::testing::Values(SIGTERM, SIGINT),
                         [](const auto& tested) { return tested.param == SIGTERM ? "Sigterm" : "Sigint"; });

TEST_F(DaemonEndTest, TheKillRequestEndsItWithStatusTwoAndStopsNoSession) {
  DaemonClient client = connect();
  startReporting(client);
  bool isAnswered = false;
  ASSERT_FALSE(
      client.reportingClient().request("killService", {}, [&](const Answer&) { isAnswered = true; }));
  EXPECT_EQ(daemon.process().wait(), 2);
  EXPECT_TRUE(client.waitForEnd());
  EXPECT_FALSE(isAnswered);
  EXPECT_THAT(events(kMessage), SizeIs(1));
  EXPECT_THAT(events(kSummary), IsEmpty());
  EXPECT_EQ(logLinesWith("DESTROYING SERVICE"), 1U);
  expectSoundStore();
}

TEST_F(DaemonEndTest, TheKillRequestMayBeANotification) {
  DaemonClient client = connect();
  client.notify("killService", {});
  EXPECT_EQ(daemon.process().wait(), 2);
}

TEST_F(DaemonEndTest, AKilledDaemonsStoreIsSoundAndHoldsWhatWasCommitted) {
  DaemonClient client = connect();
  startReporting(client);
  ASSERT_TRUE(waitUntil([&] { return events(kMessage).size() == 1; }));
  EXPECT_EQ(endBy(SIGKILL), kKilled);
  expectSoundStore();
  EXPECT_THAT(events(kMessage), SizeIs(1));
  EXPECT_THAT(events(kSummary), IsEmpty());
}

TEST_F(DaemonEndTest, AfterAKillTheNextDaemonGoesOnWithTheSameStoreAndSocket) {
  {
    DaemonClient client = connect();
    startReporting(client);
    ASSERT_TRUE(waitUntil([&] { return events(kMessage).size() == 1; }));
  }
  EXPECT_EQ(endBy(SIGKILL), kKilled);
  EXPECT_TRUE(std::filesystem::exists(daemon.socketPath()));  // stale

  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  startReporting(client);
  client.stop(kSession);
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(events(kMessage), SizeIs(2));
  EXPECT_FALSE(std::filesystem::exists(daemon.socketPath()));
  expectSoundStore();
}

// Holds a write lock on the store, for which the daemon's last rows must wait.
class StoreLock {
 public:
  explicit StoreLock(const std::string& path) {
    sqlite3_open_v2(path.c_str(), &database_, SQLITE_OPEN_READWRITE, nullptr);
    isHeld_ = sqlite3_exec(database_, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr) == SQLITE_OK;
  }
  StoreLock(const StoreLock&) = delete;
  StoreLock& operator=(const StoreLock&) = delete;
  ~StoreLock() { sqlite3_close(database_); }

  bool isHeld() const { return isHeld_; }

 private:
  sqlite3* database_ = nullptr;
  bool isHeld_ = false;
};

class DaemonSecondSignalTest : public DaemonEndTest {
 protected:
  // Sends SIGTERM while the last rows cannot be written, then SIGINT. Returns the exit status.
  std::optional<int> endByTwoSignals() {
    DaemonClient client = connect();
    startReporting(client);
    EXPECT_TRUE(waitUntil([&] { return !events(kMessage).empty(); }));
    const StoreLock lock(daemon.storePath());
    EXPECT_TRUE(lock.isHeld());
    client.send({{"a", 2}}, kPlayback, kTypeStart, {kSession});
    daemon.process().signal(SIGTERM);
    EXPECT_TRUE(client.waitForEnd());  // the first signal has taken effect
    return endBy(SIGINT);
  }
};

TEST_F(DaemonSecondSignalTest, ASecondSignalEndsItAtOnce) {
  constexpr int kTries = 5;
  std::optional<int> status = endByTwoSignals();
  // On a busy machine the daemon may have dropped the rows and ended by itself before the second signal.
  for (int at = 1; at < kTries && status == 0; ++at) {
    ASSERT_TRUE(daemon.start());
    status = endByTwoSignals();
  }
  EXPECT_EQ(status, 128 + SIGINT);
}

}  // namespace
}  // namespace tonewerk
