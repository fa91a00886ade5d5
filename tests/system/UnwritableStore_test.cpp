// SPDX-License-Identifier: Apache-2.0
//
// Tests a store that cannot be written: the daemon keeps serving, logs the failure once, and writes again
// when it can.
#include <filesystem>
#include <fstream>
#include <sqlite3.h>
#include <string>

#include "support/memory/SmallFileSystem.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

constexpr ReporterID kSession = 77;
const std::string kEvent = "com.orvane.longformaudio.Playback.Start";

class UnwritableStoreTest : public DaemonTest {
 protected:
  void reportOne(DaemonClient& client) { client.send({{"number", ++reported}}, 4, kTypeStart, {kSession}); }
  void startReporting(DaemonClient& client) {
    client.create(kSession, 7);
    client.start(kSession);
    reportOne(client);
  }
  std::size_t recorded() const { return RecordedEvents(daemon.storePath()).named(kEvent).size(); }
  std::size_t failures() const { return logLinesWith("cannot write " + daemon.storePath()); }
  std::size_t resumptions() const { return logLinesWith("writing to " + daemon.storePath() + " goes on"); }

  std::size_t reported = 0;
};

TEST_F(UnwritableStoreTest, AStateDirectoryThatIsReplacedIsFoundAgain) {
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  startReporting(client);
  ASSERT_TRUE(waitUntil([&] { return recorded() == 1; }));

  const std::filesystem::path state = daemon.path(DaemonProcess::kState);
  const std::filesystem::path away = state.string() + ".away";
  std::filesystem::rename(state, away);
  ASSERT_TRUE(std::ofstream(state) << "in the way");
  reportOne(client);
  ASSERT_TRUE(waitUntil([&] { return failures() == 1; })) << daemon.log();
  for (int at = 0; at < 100; ++at) reportOne(client);
  EXPECT_EQ(client.serviceType(kSession), 7);

  std::filesystem::remove(state);
  std::filesystem::rename(away, state);
  EXPECT_TRUE(waitUntil([&] { return recorded() == reported; }));
  EXPECT_TRUE(waitUntil([&] { return resumptions() == 1; }));
  EXPECT_EQ(logLinesWith("rows dropped meanwhile: 0"), 1U);
  EXPECT_EQ(failures(), 1U);
  client.stop(kSession);
}

TEST_F(UnwritableStoreTest, ADaemonThatNeverGetsToItsStoreServesAndEnds) {
  std::filesystem::remove_all(daemon.path(DaemonProcess::kState));
  ASSERT_TRUE(std::ofstream(daemon.path(DaemonProcess::kState)) << "in the way");
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  startReporting(client);
  // Far more messages than there is room for.
  for (int at = 0; at < 10'000; ++at) {
    client.request("sendMessage",
                   ReportingClient::messageArguments({{"number", at}}, 4, kTypeStart, {kSession}));
  }
  ASSERT_TRUE(client.waitForAnswers(10'000));
  client.stop(kSession);
  EXPECT_EQ(failures(), 1U);
  // What it took is lost, and it says so. The store counts as hanging only after a time in which nothing was
  // written; until then the daemon waits for it once more.
  EXPECT_EQ(daemon.stop(), 1);
  EXPECT_EQ(logLinesWith("store hangs; what is not written is lost: ") +
                logLinesWith("rows lost that could not be written to " + daemon.storePath()),
            1U);
}

TEST_F(UnwritableStoreTest, SomebodyElsesWriteLockIsWaitedFor) {
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  startReporting(client);
  ASSERT_TRUE(waitUntil([&] { return recorded() == 1; }));
  sqlite3* other = nullptr;
  ASSERT_EQ(sqlite3_open(daemon.storePath().c_str(), &other), SQLITE_OK);
  ASSERT_EQ(sqlite3_exec(other, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
  reportOne(client);
  EXPECT_TRUE(waitUntil([&] { return failures() == 1; }));
  reportOne(client);
  EXPECT_EQ(recorded(), 1U);  // reading still works
  sqlite3_close(other);
  EXPECT_TRUE(waitUntil([&] { return recorded() == reported; }));
  EXPECT_TRUE(waitUntil([&] { return resumptions() == 1; }));
  EXPECT_EQ(failures(), 1U);
}

TEST_F(UnwritableStoreTest, AFullDiskCostsNothingOnceThereIsRoomAgain) {
  SmallFileSystem disk(daemon.path(DaemonProcess::kState));
  if (!disk.isMounted()) GTEST_SKIP() << "only root can make a file system";
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  startReporting(client);
  const std::string large(20'000, 'x');
  for (int at = 0; at < 100; ++at) {
    client.send({{"number", ++reported}, {"text", large}}, 4, kTypeStart, {kSession});
  }
  ASSERT_TRUE(waitUntil([&] { return failures() == 1; })) << daemon.log();
  EXPECT_EQ(client.serviceType(kSession), 7);
  ASSERT_TRUE(disk.grow());
  EXPECT_TRUE(waitUntil([&] { return recorded() == reported; }));
  EXPECT_EQ(failures(), 1U);
  EXPECT_EQ(RecordedEvents(daemon.storePath()).integrity(), "ok");
  client.disconnect();
  EXPECT_EQ(daemon.stop(), 0);
}

TEST_F(UnwritableStoreTest, ADamagedStoreIsMovedAside) {
  ASSERT_TRUE(std::ofstream(daemon.storePath()) << std::string(100'000, '?'));
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  startReporting(client);
  EXPECT_TRUE(waitUntil([&] { return recorded() == 1; }));
  EXPECT_EQ(logLinesWith("is damaged"), 1U);
  EXPECT_TRUE(std::filesystem::exists(daemon.storePath() + ".corrupt"));
}

}  // namespace
}  // namespace tonewerk
