// SPDX-License-Identifier: Apache-2.0
//
// Tests several clients that send random valid and invalid frames, together with one that works normally.
#include <array>
#include <atomic>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "platform/linux/socket/RawClient.h"
#include "protocol/Requests.h"
#include "system/support/DaemonTest.h"
#include "system/support/Packed.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::SizeIs;

constexpr ReporterID kSession = 1'000'000;

// Makes random frames; the same seed always makes the same frames.
class RandomFrames {
 public:
  explicit RandomFrames(unsigned seed) : random_(seed) {}

  std::size_t below(std::size_t bound) {
    return std::uniform_int_distribution<std::size_t>(0, bound - 1)(random_);
  }
  bool isOneOutOf(std::size_t count) { return below(count) == 0; }

  // Usually a request or notification with suitable arguments, sometimes something else.
  std::string next() {
    const Method& method = anyMethod();
    std::vector<std::string> params;
    for (const Parameter& parameter : method.parameters) {
      params.push_back(isOneOutOf(10) ? anything(4) : suiting(parameter.type));
    }
    if (isOneOutOf(20)) params.push_back(anything(3));
    std::string frame = isOneOutOf(3) ? packed::notification(method.name, params)
                                      : packed::request(nextIdentifier_++, method.name, params);
    if (isOneOutOf(40)) frame = anything(6);
    if (isOneOutOf(40)) frame[below(frame.size())] = static_cast<char>(below(256));
    if (isOneOutOf(60)) frame.resize(below(frame.size()));
    return frame;
  }

 private:
  // All methods except the one that ends the daemon.
  const Method& anyMethod() {
    const std::vector<Method>& methods = requests::all().methods;
    for (;;) {
      const Method& method = methods[below(methods.size())];
      if (method.result.type != ResultType::kNever) return method;
    }
  }

  // Few sessions, so that they are created, started, stopped and destroyed in every order.
  std::string reporterID() { return packed::integer(static_cast<std::int64_t>(below(6))); }

  std::string suiting(ParameterType type) {
    switch (type) {
      case ParameterType::kInt64:
        return reporterID();
      case ParameterType::kUInt32:
        return packed::integer(static_cast<std::int64_t>(below(18)));
      case ParameterType::kUInt16:
        return packed::integer(static_cast<std::int64_t>(below(21)));
      case ParameterType::kMap:
        return message();
      case ParameterType::kInt64ListOrNone:
        // Never without identifiers, because that would also reach the normal client's session.
        return packed::array({reporterID(), reporterID()});
    }
    return packed::nil();
  }

  std::string message() {
    static constexpr std::array<const char*, 7> kKeys{"session_output_running",
                                                      "QMSessionVolume",
                                                      "twreporting_timestamp",
                                                      "session_duration",
                                                      "issue_type",
                                                      "active_devices",
                                                      "a key"};
    std::vector<std::string> entries;
    for (std::size_t count = below(6); count > 0; --count) {
      entries.push_back(packed::text(kKeys[below(kKeys.size())]));
      entries.push_back(isOneOutOf(3) ? value(3) : packed::real(static_cast<double>(below(1000)) / 7));
    }
    return packed::map(entries);
  }

  // A value that the protocol carries.
  std::string value(std::size_t depth) {
    switch (below(depth == 0 ? 5 : 7)) {
      case 0:
        return packed::boolean(isOneOutOf(2));
      case 1:
        return packed::integer(static_cast<std::int64_t>(random_()) << below(33));
      case 2:
        return packed::text(std::string(below(200), 'x'));
      case 3:
        return packed::extension(-1, packed::bigEndian(static_cast<std::uint32_t>(random_())));
      case 4:
        return packed::real(isOneOutOf(5) ? __builtin_nan("") : static_cast<double>(below(100)));
      case 5:
        return packed::array({value(depth - 1), value(depth - 1)});
      default:
        return packed::map({packed::text("inner"), value(depth - 1)});
    }
  }

  // A value, or something that the protocol does not carry.
  std::string anything(std::size_t depth) {
    switch (below(6)) {
      case 0:
        return packed::nil();
      case 1:
        return packed::binary(std::string(below(100), '\x80'));
      case 2:
        return packed::text("\xFF\xFE");
      case 3:
        return packed::map({value(depth), value(depth)});
      case 4:
        return packed::unsignedInteger(UINT64_MAX);
      default:
        return value(depth);
    }
  }

  std::mt19937 random_;
  std::uint32_t nextIdentifier_ = 1;
};

class HostileClientsTest : public DaemonTest {
 protected:
  static constexpr unsigned kClients = 4;
  static constexpr int kFramesEach = 3000;

  // Sends its frames, over as many connections as necessary, and reads only some of the answers.
  void attack(unsigned seed) {
    RandomFrames frames(seed);
    auto client = std::make_unique<RawClient>(daemon.socketPath());
    for (int at = 0; at < kFramesEach; ++at) {
      const bool isGone = !client->isConnected() || !sendPatiently(*client, frames.next());
      if (isGone || frames.isOneOutOf(200)) client = std::make_unique<RawClient>(daemon.socketPath());
    }
  }

  // False when the connection can no longer be used. Reads what the daemon sends, so that the daemon never
  // waits for this client.
  static bool sendPatiently(RawClient& client, std::string_view bytes) {
    while (!bytes.empty()) {
      pollfd polled{client.fileDescriptor(), POLLIN | POLLOUT, 0};
      if (poll(&polled, 1, 30'000) != 1 || (polled.revents & (POLLERR | POLLHUP)) != 0) return false;
      std::array<char, 4096> skipped;
      if ((polled.revents & POLLIN) != 0 &&
          recv(client.fileDescriptor(), skipped.data(), skipped.size(), 0) <= 0) {
        return false;
      }
      if ((polled.revents & POLLOUT) != 0) bytes.remove_prefix(client.sendWithoutWaiting(bytes));
    }
    return true;
  }
};

TEST_F(HostileClientsTest, AWellBehavedClientGetsItsResultsThroughout) {
  daemon.setEnvironment("TONEWERK_LOG", "error");
  ASSERT_TRUE(daemon.start());
  std::atomic<unsigned> attacking = kClients;
  std::vector<std::thread> attackers;
  attackers.reserve(kClients);
  for (unsigned seed = 1; seed <= kClients; ++seed) {
    attackers.emplace_back([this, seed, &attacking] {
      attack(seed);
      --attacking;
    });
  }

  DaemonClient client = connect();
  client.create(kSession, 7);
  std::size_t rounds = 0;
  do {
    const auto round = static_cast<std::int64_t>(rounds);
    client.request("startReportingSessionForID", {Value(kSession)});
    client.send({{"round", round}}, 16, 13, {kSession});
    EXPECT_EQ(client.serviceType(kSession), 7);
    client.request("stopReportingSessionForID", {Value(kSession)});
    ++rounds;
    if (!client.waitForAnswers(2 * rounds)) {
      ADD_FAILURE() << "round " << rounds << " is not answered";
      break;
    }
    EXPECT_THAT(std::vector(client.answered().end() - 2, client.answered().end()),
                ElementsAre("startReportingSessionForID", "stopReportingSessionForID"));
  } while (attacking > 0 && rounds < 1000 && !HasFailure());
  for (std::thread& attacker : attackers) attacker.join();

  EXPECT_TRUE(waitUntil([&] { return client.allReporters() == std::vector{kSession}; }));
  EXPECT_EQ(daemon.stop(), 0);
  const RecordedEvents events(daemon.storePath());
  EXPECT_EQ(events.integrity(), "ok");
  auto recorded = events.named("com.orvane.longformaudio.HearingHealth.AudioExposure");
  // A damaged message may have been sent to all sessions.
  std::erase_if(recorded, [](const auto& event) { return !event.contains("round"); });
  ASSERT_THAT(recorded, SizeIs(rounds));
  for (std::size_t at = 0; at < rounds; ++at) EXPECT_EQ(recorded[at].at("round"), at);
}

}  // namespace
}  // namespace tonewerk
