// SPDX-License-Identifier: Apache-2.0
//
// Tests the daemon when the system gives it no more memory. Only with the C library's allocator: a sanitizer
// takes terabytes of addresses.
#include <algorithm>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
#include <sys/resource.h>

#include "protocol/RequestSet.h"
#include "system/memory/Sanitizers.h"
#include "system/support/DaemonTest.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMegabyte = std::size_t{1} << 20;
constexpr AudioServiceType kLongformAudio = 7;

class OutOfMemoryTest : public DaemonTest {
 protected:
  void SetUp() override {
    if (kHasSanitizer) GTEST_SKIP() << "a sanitizer's allocator takes too many addresses";
    daemon.setEnvironment("TONEWERK_LOG", "default");  // lines of debugging hold whole messages
    ASSERT_TRUE(daemon.start());
  }

  // The daemon's addresses in use, in bytes.
  std::size_t addressBytes() {
    std::ifstream sizes("/proc/" + std::to_string(daemon.process().identifier()) + "/statm");
    std::size_t pages = 0;
    sizes >> pages;
    return pages * 4096;
  }

  // From now on the daemon gets this much memory more.
  void limitMemory(std::size_t bytes) {
    const rlimit limit{addressBytes() + bytes, RLIM_INFINITY};
    ASSERT_EQ(::prlimit(daemon.process().identifier(), RLIMIT_AS, &limit, nullptr), 0);
  }

  // Sends large messages to the session until the daemon refuses one. Returns the error's code, 0 if none is
  // refused.
  static std::int64_t sendUntilRefused(DaemonClient& client, ReporterID session) {
    for (int sent = 0; sent < 400; ++sent) {
      const ValueMap message{{"number", sent}, {"text", std::string(kMegabyte / 2, 'x')}};
      const Answer answer =
          client.call("sendMessage", ReportingClient::messageArguments(message, 4, 1, {session}));
      if (answer.error) return answer.error->code;
    }
    return 0;
  }
};

TEST_F(OutOfMemoryTest, RefusesAClientThatSendsMuchAndServesOthersAfterwards) {
  DaemonClient other = connect();
  other.create(78, kLongformAudio);
  DaemonClient client = connect();
  client.create(77, kLongformAudio);
  client.start(77);
  limitMemory(64 * kMegabyte);
  EXPECT_EQ(sendUntilRefused(client, 77), kOverLimit);
  EXPECT_TRUE(waitForLogLine("memory is short: sendMessage is refused"));
  EXPECT_EQ(other.serviceType(78), kLongformAudio);  // what takes no memory is served meanwhile
  client.destroy(77);
  client.disconnect();
  limitMemory(256 * kMegabyte);  // freed memory may be in pieces; the system has some again
  const auto takesMessages = [&] {
    const Answer answer =
        other.call("sendMessage", ReportingClient::messageArguments({{"a", 1}}, 4, 1, {ReporterID{78}}));
    return !answer.error;
  };
  EXPECT_TRUE(waitUntil(takesMessages));
  EXPECT_EQ(daemon.stop(), 0);
}

}  // namespace
}  // namespace tonewerk
