// SPDX-License-Identifier: Apache-2.0
//
// Tests that the memory of large sessions, or of many incomplete frames, soon returns to the system, for both
// transports and any number of clients. Only with the C library's allocator: sanitizers use others, which do
// not return memory.
#include <chrono>
#include <list>
#include <string>

#include "platform/accounts/Resource.h"
#include "platform/linux/dbus/DbusCaller.h"
#include "platform/linux/dbus/DbusValues.h"
#include "platform/linux/dbus/PrivateBus.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messaging/AllocatorReclaimer.h"
#include "platform/linux/socket/RawClient.h"
#include "system/memory/Sanitizers.h"
#include "system/support/DaemonTest.h"
#include "system/support/Packed.h"

namespace tonewerk {
namespace {

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr std::size_t kMegabyte = std::size_t{1} << 20;

// How much more memory an idle daemon may have than before: the amount that the allocator may keep, and the
// same amount for caches that have filled in between.
constexpr std::size_t kBound = 2 * AllocatorReclaimer::kMaxIdleBytes;
// The last check comes after half of it.
constexpr std::chrono::seconds kPatience{2 * AllocatorReclaimer::kLastCheckSeconds};

class MemoryReleaseTest : public DaemonTest {
 protected:
  void SetUp() override {
    if (kHasSanitizer) GTEST_SKIP() << "a sanitizer's allocator keeps what it has";
    daemon.setEnvironment("TONEWERK_LOG", "default");  // otherwise the log would have many lines
    ASSERT_TRUE(daemon.start());
    // One session first, so that everything that the first session makes exists.
    DaemonClient client = connect();
    client.create(kSession, kLongFormAudio);
    client.start(kSession);
    client.send({{"n", 1}}, 4, kTypeStart, {kSession});
    client.stop(kSession);
    client.destroy(kSession);
    idle = daemon.residentBytes();
    ASSERT_GT(idle, 0U);
  }

  // Fifty keys, with a number that differs in each message.
  static ValueMap payload(int number) {
    ValueMap payload{{"n", number}};
    for (int key = 0; key < 50; ++key) payload.set("key" + std::to_string(key), 1.5 * key);
    return payload;
  }
  // Makes a session of `messages` messages.
  static void fillSession(DaemonClient& client, ReporterID session = kSession, int messages = kMessages) {
    client.create(session, kLongFormAudio);
    client.start(session);
    for (int message = 0; message < messages; ++message) {
      client.notify("sendMessage",
                    ReportingClient::messageArguments(payload(message), 4, kTypeStart, {session}));
      // Waits for an answer now and then, so that neither side has to store what the other has not read yet.
      if (message % 1000 == 0) client.serviceType(session);
    }
    EXPECT_EQ(client.serviceType(session), kLongFormAudio);
  }

  void expectMuchMemory() { EXPECT_GT(daemon.residentBytes(), idle + 100 * kMegabyte); }
  void expectTheMemoryBack() {
    EXPECT_TRUE(waitUntil([this] { return daemon.residentBytes() < idle + kBound; }, kPatience))
        << daemon.residentBytes() / kMegabyte << " MiB; idle it had " << idle / kMegabyte << " MiB";
  }

  static constexpr int kMessages = 240'000;  // about 150 MB in the daemon
  std::size_t idle = 0;
};

TEST_F(MemoryReleaseTest, OfALargeSessionIsTheSystemsAgainWhenItHasStoppedAndItsClientLivesOn) {
  DaemonClient client = connect();
  fillSession(client);
  expectMuchMemory();
  client.stop(kSession);
  client.destroy(kSession);
  expectTheMemoryBack();
  EXPECT_TRUE(client.allReporters().empty());
}

TEST_F(MemoryReleaseTest, OfALargeSessionIsTheSystemsAgainWhenItsClientHasGone) {
  DaemonClient client = connect();
  fillSession(client);
  expectMuchMemory();
  client.disconnect();
  expectTheMemoryBack();
}

// No single client sends enough to cause a check.
TEST_F(MemoryReleaseTest, OfManySmallClientsIsTheSystemsAgainWhenTheirSessionsEndTogether) {
  constexpr int kClients = 600;
  std::list<DaemonClient> clients;
  for (int client = 0; client < kClients; ++client) {
    clients.push_back(connect());
    fillSession(clients.back(), kSession + client, kMessages / kClients);
  }
  expectMuchMemory();
  clients.clear();
  expectTheMemoryBack();
}

TEST_F(MemoryReleaseTest, OfAStormOfFramesThatNeverEndIsTheSystemsAgain) {
  // Small arrays of two bytes each, which would need many times their size if they were decoded before the
  // frame ends. No single connection sends enough to cause a check. All together are within the user's share.
  constexpr std::size_t kBytes = std::size_t{480} << 10;
  constexpr std::size_t kFrames = 100;
  static_assert(kFrames * kBytes < kResources[indexOf(Resource::kReadBytes)].total / 2);
  std::string frame = packed::arrayHeader(4) + packed::integer(0) + packed::integer(1) +
                      packed::text("sendMessage") + packed::arrayHeader(4) +
                      packed::arrayHeader(kMaxFrameBytes);
  while (frame.size() < kBytes) frame += std::string("\x91\x00", 2);
  std::list<RawClient> storm;
  for (std::size_t count = 0; count < kFrames; ++count) {
    storm.emplace_back(daemon.socketPath());
    ASSERT_TRUE(storm.back().send(frame));
  }
  DaemonClient witness = connect();
  witness.create(kSession, kLongFormAudio);
  EXPECT_TRUE(waitUntil([this] { return daemon.residentBytes() > idle + 40 * kMegabyte; }));
  storm.clear();
  expectTheMemoryBack();
  EXPECT_EQ(witness.serviceType(kSession), kLongFormAudio);
}

class DbusMemoryReleaseTest : public MemoryReleaseTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(bus.isRunning()) << "dbus-daemon does not run";
    daemon.setEnvironment("DBUS_SESSION_BUS_ADDRESS", bus.address());
    MemoryReleaseTest::SetUp();
    if (IsSkipped() || HasFatalFailure()) return;
    ASSERT_TRUE(waitForLogLine("serving com.orvane.tonewerk.reporting on D-Bus"));
  }

  // D-Bus is slower, so the store keeps up, and all memory to be returned belongs to the session.
  static void fillSession(DbusCaller& caller) {
    constexpr int kSlowMessages = 60'000;  // as trees, which take more; about 300 MB
    EXPECT_TRUE(caller.ask("CreateReportingSession", "x", kSession).boolean());
    EXPECT_TRUE(caller.ask("SetServiceType", "qx", kLongFormAudio, kSession).boolean());
    caller.send(caller.newCall("StartReportingSessionForID", "x", kSession));
    for (int message = 0; message < kSlowMessages; ++message) {
      const BusMessage call = caller.newCall("SendMessage");
      appendMap(call.get(), payload(message));
      ASSERT_GE(sd_bus_message_append(call.get(), "uqax", 4, kTypeStart, 1, kSession), 0);
      caller.sendWithoutAnswer(call);
      // The daemon limits the number of pending requests of a client.
      if (message % 200 == 0) expectServed(caller);
    }
    expectServed(caller);
  }
  static void expectServed(DbusCaller& caller) {
    EXPECT_EQ(caller.ask("GetServiceNameForReporterID", "x", kSession).uint16(), kLongFormAudio);
  }

  const PrivateBus bus;
  const DbusNames names{"com.orvane.tonewerk.reporting", "/com/orvane/tonewerk/reporting",
                        "com.orvane.tonewerk.TWReportingServiceProtocol"};
};

TEST_F(DbusMemoryReleaseTest, OfALargeSessionIsTheSystemsAgainWhenItHasStoppedAndItsClientLivesOn) {
  DbusCaller caller(bus.address(), names);
  fillSession(caller);
  expectMuchMemory();
  EXPECT_TRUE(caller.ask("StopReportingSessionForID", "x", kSession).boolean());
  EXPECT_TRUE(caller.ask("DestroyReportingSession", "x", kSession).boolean());
  expectTheMemoryBack();
  EXPECT_TRUE(caller.ask("GetAllReporters").int64List().empty());
}

TEST_F(DbusMemoryReleaseTest, OfALargeSessionIsTheSystemsAgainWhenItsNameHasVanished) {
  DbusCaller caller(bus.address(), names);
  fillSession(caller);
  expectMuchMemory();
  caller.disconnect();
  expectTheMemoryBack();
}

}  // namespace
}  // namespace tonewerk
