// SPDX-License-Identifier: Apache-2.0
//
// What a large session, or a storm of frames that never end, took of the system's memory is the system's
// again soon after. Only with the C library's own allocator: sanitizers bring others, which keep what they
// have.
#include <chrono>
#include <list>
#include <string>

#include "platform/linux/AllocatorReclaimer.h"
#include "platform/linux/RawClient.h"
#include "platform/linux/RpcLimits.h"
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
constexpr std::size_t kBound = 2 * AllocatorReclaimer::kSpareBytes;
// The last look is after half of it.
constexpr std::chrono::seconds kPatience{2 * AllocatorReclaimer::kLastLook};

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

  // Some 200 MB in the daemon's hands: messages of fifty keys, none like the one before.
  void fillSession(DaemonClient& client) {
    client.create(kSession, kLongFormAudio);
    client.start(kSession);
    for (int message = 0; message < kMessages; ++message) {
      ValueMap payload{{"n", message}};
      for (int key = 0; key < 50; ++key) payload.set("key" + std::to_string(key), 1.5 * key);
      client.notify("sendMessage", ReportingClient::messageArguments(payload, 4, kTypeStart, {kSession}));
      // Now and then an answer, so that neither side has to keep what the other does not take.
      if (message % 1000 == 0) client.serviceType(kSession);
    }
    EXPECT_EQ(client.serviceType(kSession), kLongFormAudio);
    EXPECT_GT(daemon.residentBytes(), idle + 100 * kMegabyte);
  }

  void expectTheMemoryBack() {
    EXPECT_TRUE(waitUntil([this] { return daemon.residentBytes() < idle + kBound; }, kPatience))
        << daemon.residentBytes() / kMegabyte << " MiB; idle it had " << idle / kMegabyte << " MiB";
  }

  static constexpr int kMessages = 40'000;
  std::size_t idle = 0;
};

TEST_F(MemoryReleaseTest, OfALargeSessionIsTheSystemsAgainWhenItHasStoppedAndItsClientLivesOn) {
  DaemonClient client = connect();
  fillSession(client);
  client.stop(kSession);
  client.destroy(kSession);
  expectTheMemoryBack();
  EXPECT_TRUE(client.allReporters().empty());
}

TEST_F(MemoryReleaseTest, OfALargeSessionIsTheSystemsAgainWhenItsClientHasGone) {
  DaemonClient client = connect();
  fillSession(client);
  client.disconnect();
  expectTheMemoryBack();
}

TEST_F(MemoryReleaseTest, OfAStormOfFramesThatNeverEndIsTheSystemsAgain) {
  // The smallest array, as often as a frame has room for it: each takes many times its two bytes.
  std::string frame = packed::arrayHeader(4) + packed::integer(0) + packed::integer(1) +
                      packed::text("sendMessage") + packed::arrayHeader(4) +
                      packed::arrayHeader(kMostFrameBytes);
  while (frame.size() + 1000 < kMostFrameBytes) frame += std::string("\x91\x00", 2);
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

}  // namespace
}  // namespace tonewerk
