// SPDX-License-Identifier: Apache-2.0
//
// What large sessions, or a storm of frames that never end, took of the system's memory is the system's again
// soon after, whichever way and by however many clients it came. Only with the C library's own allocator:
// sanitizers bring others, which keep what they have.
#include <chrono>
#include <list>
#include <string>

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

// What an idle daemon may have more than before: what the allocator is left with, and as much for caches that
// have filled meanwhile.
constexpr std::size_t kBound = 2 * AllocatorReclaimer::kMaxIdleBytes;
// The last look is after half of it.
constexpr std::chrono::seconds kPatience{2 * AllocatorReclaimer::kLastCheckSeconds};

class MemoryReleaseTest : public DaemonTest {
 protected:
  void SetUp() override {
    if (kHasSanitizer) GTEST_SKIP() << "a sanitizer's allocator keeps what it has";
    daemon.setEnvironment("TONEWERK_LOG", "default");  // what follows would be many lines
    ASSERT_TRUE(daemon.start());
    // Once around, so that what is made by the first session is there.
    DaemonClient client = connect();
    client.create(kSession, kLongFormAudio);
    client.start(kSession);
    client.send({{"n", 1}}, 4, kTypeStart, {kSession});
    client.stop(kSession);
    client.destroy(kSession);
    idle = daemon.residentBytes();
    ASSERT_GT(idle, 0U);
  }

  // Fifty keys, and none like the one before.
  static ValueMap payload(int number) {
    ValueMap payload{{"n", number}};
    for (int key = 0; key < 50; ++key) payload.set("key" + std::to_string(key), 1.5 * key);
    return payload;
  }
  // A session of so many messages.
  static void fillSession(DaemonClient& client, ReporterID session = kSession, int messages = kMessages) {
    client.create(session, kLongFormAudio);
    client.start(session);
    for (int message = 0; message < messages; ++message) {
      client.notify("sendMessage",
                    ReportingClient::messageArguments(payload(message), 4, kTypeStart, {session}));
      // Now and then an answer, so that neither side has to keep what the other does not take.
      if (message % 1000 == 0) client.serviceType(session);
    }
    EXPECT_EQ(client.serviceType(session), kLongFormAudio);
  }

  void expectMuchMemory() { EXPECT_GT(daemon.residentBytes(), idle + 100 * kMegabyte); }
  void expectTheMemoryBack() {
    EXPECT_TRUE(waitUntil([this] { return daemon.residentBytes() < idle + kBound; }, kPatience))
        << daemon.residentBytes() / kMegabyte << " MiB; idle it had " << idle / kMegabyte << " MiB";
  }

  static constexpr int kMessages = 40'000;  // some 200 MB in the daemon's hands
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

// None of them brings as much as would be worth a look by itself.
TEST_F(MemoryReleaseTest, OfManySmallClientsIsTheSystemsAgainWhenTheirSessionsEndTogether) {
  constexpr int kClients = 100;
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
  // The smallest array, again and again: each takes many times its two bytes. No connection brings as much
  // as would be worth a look by itself.
  constexpr std::size_t kBytes = std::size_t{400} << 10;
  std::string frame = packed::arrayHeader(4) + packed::integer(0) + packed::integer(1) +
                      packed::text("sendMessage") + packed::arrayHeader(4) +
                      packed::arrayHeader(kMaxFrameBytes);
  while (frame.size() < kBytes) frame += std::string("\x91\x00", 2);
  std::list<RawClient> storm;
  for (int count = 0; count < 50; ++count) {
    storm.emplace_back(daemon.socketPath());
    ASSERT_TRUE(storm.back().send(frame));
  }
  DaemonClient witness = connect();
  witness.create(kSession, kLongFormAudio);
  EXPECT_TRUE(waitUntil([this] { return daemon.residentBytes() > idle + 100 * kMegabyte; }));
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

  // The slower way, on which the store keeps up: what there is to be given back is the session's alone.
  static void fillSession(DbusCaller& caller) {
    constexpr int kSlowMessages = kMessages + kMessages / 2;
    EXPECT_TRUE(caller.ask("CreateReportingSession", "x", kSession).boolean());
    EXPECT_TRUE(caller.ask("SetServiceType", "qx", kLongFormAudio, kSession).boolean());
    caller.send(caller.newCall("StartReportingSessionForID", "x", kSession));
    for (int message = 0; message < kSlowMessages; ++message) {
      const BusMessage call = caller.newCall("SendMessage");
      appendMap(call.get(), payload(message));
      ASSERT_GE(sd_bus_message_append(call.get(), "uqax", 4, kTypeStart, 1, kSession), 0);
      caller.sendWithoutAnswer(call);
      // Of what is under way a client may not have more than so much.
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
