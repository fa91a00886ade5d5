// SPDX-License-Identifier: Apache-2.0
//
// Tests the limits of one connection, at each limit and one above it. Other connections must notice nothing.
#include <poll.h>
#include <string>
#include <thread>
#include <vector>

#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/socket/RawClient.h"
#include "service/TWReportingClientServerInstance.h"
#include "system/support/DaemonTest.h"
#include "system/support/Packed.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using packed::integer;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr auto kMaxSessions = static_cast<ReporterID>(TWReportingClientServerInstance::kMaxSessions);
constexpr ReporterID kFirst = 1000;

// A list of this many sessions takes 4.5 KiB. This many requests for the list have answers far above every
// limit.
constexpr ReporterID kSessions = 512;
constexpr std::uint32_t kFarTooMany = 100'000;

class ConnectionLimitsTest : public DaemonTest {
 protected:
  void SetUp() override {
    daemon.setEnvironment("TONEWERK_LOG", "default");  // otherwise the log would have many lines
    // Makes a sanitizer return freed memory earlier.
    daemon.setEnvironment("ASAN_OPTIONS", "quarantine_size_mb=1");
    ASSERT_TRUE(daemon.start());
  }

  static void createSessions(DaemonClient& client, ReporterID count) {
    for (ReporterID at = 0; at < count; ++at) client.request("createReportingSession", {Value(kFirst + at)});
    EXPECT_TRUE(client.waitForAnswers(static_cast<std::size_t>(count)));
  }

  static std::int64_t errorCodeOf(const Answer& answer) { return answer.error ? answer.error->code : 0; }
};

// A client that sends requests with large answers and reads none of them.
class UnreadingClient {
 public:
  explicit UnreadingClient(const std::string& path) : client_(path) {}

  // Sends until the daemon has read nothing for a while. False when the daemon read all requests.
  bool sendUntilNothingIsTaken(std::uint32_t mostRequests) {
    while (sent_ < mostRequests) {
      if (rest_.empty()) rest_ = packed::request(sent_++, "getAllReporters", {});
      rest_.erase(0, client_.sendWithoutWaiting(rest_));
      if (!rest_.empty() && !isWritableSoon()) return true;
    }
    return false;
  }

  // Reads every answer, and then sends the rest of the last request.
  std::uint32_t readAll() {
    std::uint32_t read = 0;
    const std::uint32_t whole = rest_.empty() ? sent_ : sent_ - 1;
    while (read < whole && isNext(read)) ++read;
    if (read < whole || rest_.empty()) return read;
    return client_.send(rest_) && isNext(read) ? read + 1 : read;
  }

  std::uint32_t sent() const { return sent_; }

 private:
  static constexpr int kStandstillMilliseconds = 500;

  bool isNext(std::uint32_t identifier) {
    const auto answer = client_.response();
    return answer && !answer->error && answer->identifier == identifier;
  }
  bool isWritableSoon() const {
    pollfd polled{client_.fileDescriptor(), POLLOUT, 0};
    return poll(&polled, 1, kStandstillMilliseconds) == 1;
  }

  RawClient client_;
  std::uint32_t sent_ = 0;
  std::string rest_;  // bytes of the last request that are not sent yet
};

TEST_F(ConnectionLimitsTest, AConnectionHoldsSoManySessionsAndNotOneMore) {
  DaemonClient client = connect();
  createSessions(client, kMaxSessions);
  const Answer refusal = client.call("createReportingSession", {Value(kFirst + kMaxSessions)});
  EXPECT_EQ(errorCodeOf(refusal), 3);
  EXPECT_EQ(refusal.error.value_or(ReplyError()).domain, "com.orvane.tonewerk.messaging");
  EXPECT_THAT(client.allReporters(), SizeIs(kMaxSessions));

  client.create(kFirst);  // replaces a session
  DaemonClient other = connect();
  other.create(kFirst + kMaxSessions);  // each connection has its own limit
  client.destroy(kFirst);
  client.create(kFirst + kMaxSessions);
  EXPECT_EQ(errorCodeOf(client.call("createReportingSession", {Value(kFirst)})), 3);

  client.disconnect();
  EXPECT_TRUE(waitUntil([&] { return other.allReporters() == std::vector{kFirst + kMaxSessions}; }));
}

TEST_F(ConnectionLimitsTest, AMessageNamesSoManySessionsAndNotOneMore) {
  DaemonClient client = connect();
  client.create(kFirst, 7);
  const std::vector<ReporterID> most(TWReportingClientServerInstance::kMaxSessions, kFirst);
  std::vector<ReporterID> oneMore = most;
  oneMore.push_back(kFirst);
  client.send({{"a", 1}}, 1, 0, most);
  EXPECT_EQ(
      errorCodeOf(client.call("sendMessage", ReportingClient::messageArguments({{"a", 1}}, 1, 0, oneMore))),
      3);
}

TEST_F(ConnectionLimitsTest, ManyMoreRequestsThanMayBeUnderWayAreAllAnsweredInOrder) {
  constexpr std::uint32_t kRequests = 8 * kMaxUnfinishedRequests;
  std::string all;
  for (std::uint32_t at = 0; at < kRequests; ++at) {
    all += packed::request(at, "getServiceNameForReporterID", {integer(5)});
  }
  RawClient client(daemon.socketPath());
  ASSERT_TRUE(client.send(all));
  for (std::uint32_t at = 0; at < kRequests; ++at) {
    const auto answer = client.response();
    ASSERT_TRUE(answer);
    ASSERT_EQ(answer->identifier, at);
    ASSERT_EQ(answer->result, Value(65'535));
  }
}

TEST_F(ConnectionLimitsTest, AClientThatReadsNothingIsNotReadFromUntilItReadsAndLosesNothing) {
  DaemonClient holder = connect();
  createSessions(holder, kSessions);
  UnreadingClient unreading(daemon.socketPath());
  ASSERT_TRUE(unreading.sendUntilNothingIsTaken(kFarTooMany));
  // Other clients are served as before.
  EXPECT_THAT(holder.allReporters(), SizeIs(kSessions));
  DaemonClient newcomer = connect();
  newcomer.create(5, 7);
  EXPECT_EQ(newcomer.serviceType(5), 7);
  newcomer.destroy(5);

  EXPECT_EQ(unreading.readAll(), unreading.sent());
  EXPECT_THAT(holder.allReporters(), SizeIs(kSessions));
}

TEST_F(ConnectionLimitsTest, ClientsThatNeverReadEndWithoutHarmToOthers) {
  DaemonClient holder = connect();
  createSessions(holder, kSessions);
  const std::size_t before = daemon.residentBytes();
  std::vector<std::unique_ptr<UnreadingClient>> unreading;
  for (int at = 0; at < 4; ++at) {
    unreading.push_back(std::make_unique<UnreadingClient>(daemon.socketPath()));
    ASSERT_TRUE(unreading.back()->sendUntilNothingIsTaken(kFarTooMany));
  }
  EXPECT_THAT(holder.allReporters(), SizeIs(kSessions));
  // 4 MiB of answers each, and the memory that is left over from growing to that size.
  EXPECT_LT(daemon.residentBytes(), before + unreading.size() * 32 * 1024 * 1024);
  unreading.clear();
  EXPECT_THAT(holder.allReporters(), SizeIs(kSessions));
}

TEST_F(ConnectionLimitsTest, ConnectionsThatComeAndGoLeaveNothingBehind) {
  DaemonClient bystander = connect();
  bystander.create(1, 7);
  bystander.start(1);
  // After the first recorded connection the daemon has all its own files open.
  { DaemonClient(daemon.socketPath()).create(2); }
  ASSERT_TRUE(waitUntil([&] { return !RecordedEvents(daemon.storePath()).names().empty(); }));
  const std::size_t atRest = daemon.openDescriptors();

  constexpr ReporterID kThreads = 4;
  constexpr ReporterID kEach = 100;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (ReporterID thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([this, thread] {
      for (ReporterID at = 0; at < kEach; ++at) {
        const ReporterID reporterID = kFirst + thread * kEach + at;
        RawClient client(daemon.socketPath());
        std::string bytes = packed::request(1, "createReportingSession", {integer(reporterID)}) +
                            packed::request(2, "startReportingSessionForID", {integer(reporterID)}) +
                            packed::request(3, "getAllReporters", {});
        if (at % 3 == 1) bytes.resize(bytes.size() / 2);
        client.send(bytes);
        if (at % 3 == 2) static_cast<void>(client.response());
      }
    });
  }
  for (std::thread& thread : threads) thread.join();

  EXPECT_TRUE(waitUntil([&] { return bystander.allReporters() == std::vector<ReporterID>{1}; }));
  EXPECT_TRUE(waitUntil([&] { return daemon.openDescriptors() <= atRest; }))
      << daemon.openDescriptors() << " descriptors, " << atRest << " at rest";
  EXPECT_THAT(bystander.answered(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
