// SPDX-License-Identifier: Apache-2.0
//
// Tests that no user waits for the work of another one, whatever that one asks for.
#include <filesystem>
#include <string>
#include <vector>

#include "system/support/RecordedEvents.h"
#include "system/support/UsersTest.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMegabyte = std::size_t{1} << 20;

class TurnsTest : public UsersTest {
 protected:
  // Does not wait until everything that Alice has asked for is done.
  void endAtOnce() { daemon.process().kill(); }

  // The bytes of the store's files.
  std::size_t storeBytes() const {
    std::size_t bytes = 0;
    for (const char* suffix : {"", "-wal"}) {
      std::error_code error;
      const auto size = std::filesystem::file_size(daemon.storePath() + suffix, error);
      if (!error) bytes += size;
    }
    return bytes;
  }
};

TEST_F(TurnsTest, AQuietUserAloneIsServedAtOnce) {
  ASSERT_TRUE(startDaemon());
  expectBobNotHeldUp();
}

TEST_F(TurnsTest, AMessageThatNamesASessionThousandsOfTimesHoldsUpNobodyElse) {
  daemon.writeConfiguration("preferences/com.orvane.tonewerk.store.toml", "max_megabytes = 16\n");
  ASSERT_TRUE(startDaemon());
  start(kAlice, {"often", "1000000", "4096", "1"}, "begun");
  expectBobNotHeldUp();
  // The file, its write-ahead log, and what is written at once.
  EXPECT_LT(storeBytes(), (16 + 8 + 4) * kMegabyte);
  // Meanwhile Alice's work goes on.
  EXPECT_GT(storeBytes(), kMegabyte);
  endAtOnce();
}

TEST_F(TurnsTest, ABroadcastToThousandsOfSessionsHoldsUpNobodyElse) {
  ASSERT_TRUE(startDaemon());
  start(kAlice, {"broadcast", "4090", "3500", "0"}, "begun");
  expectBobNotHeldUp();
  endAtOnce();
}

TEST_F(TurnsTest, ALongRequestUnderWayDoesNotKeepTheDaemonFromEndingInOrder) {
  ASSERT_TRUE(startDaemon());
  start(kAlice, {"often", "1000000", "4096", "1"}, "begun");
  EXPECT_EQ(daemon.stop(), 0);
}

TEST_F(TurnsTest, AHundredFloodingConnectionsHoldUpNobodyElse) {
  ASSERT_TRUE(startDaemon());
  start(kAlice, {"flood", "100"}, "begun");
  expectBobNotHeldUp();
}

// The work of one request is done in slices, but the next request of its connection comes after all of them.
TEST_F(TurnsTest, ARequestAfterABroadcastIsServedAfterAllOfIt) {
  constexpr ReporterID kSessions = 1'000;
  ASSERT_TRUE(startDaemon());
  DaemonClient alice = connectAs(kAlice);
  for (ReporterID reporterID = 1; reporterID <= kSessions; ++reporterID) {
    alice.notify("createReportingSession", {Value(reporterID)});
    alice.notify("startReportingSessionForID", {Value(reporterID)});
  }
  // Only the last one is of a service that has a name in the store.
  alice.create(kSessions + 1, 7);
  alice.start(kSessions + 1);
  const auto send = [&](int number, const std::vector<ReporterID>& reporterIDs) {
    alice.notify("sendMessage",
                 ReportingClient::messageArguments({{"number", number}}, 4, kTypeStart, reporterIDs));
  };
  send(1, {});
  send(2, {kSessions + 1});
  send(3, {});
  alice.notify("stopReportingSessionForID", {Value(kSessions + 1)});
  send(4, {});
  alice.stop(kSessions);
  EXPECT_EQ(daemon.stop(), 0);
  std::vector<int> numbers;
  for (const auto& event :
       RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.Playback.Start")) {
    numbers.push_back(event.at("number"));
  }
  EXPECT_THAT(numbers, ::testing::ElementsAre(1, 2, 3));
}

TEST_F(TurnsTest, AUserWhoLeavesThousandsOfSessionsHoldsUpNobodyElse) {
  ASSERT_TRUE(startDaemon());
  start(kAlice, {"sessions", "4096"}).kill();
  expectBobNotHeldUp();
  DaemonClient root = connect();
  EXPECT_TRUE(waitUntil([&] { return root.allReporters().empty(); }));
}

}  // namespace
}  // namespace tonewerk
