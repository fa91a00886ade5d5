// SPDX-License-Identifier: Apache-2.0
#include "support/client/ReportingClient.h"

#include <cstdlib>
#include <gmock/gmock.h>
#include <memory>
#include <optional>
#include <poll.h>
#include <string>
#include <sys/socket.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/messaging/MessagingRig.h"
#include "platform/linux/protobuf/Hex.h"
#include "platform/linux/socket/UnixSocketListener.h"
#include "support/TemporaryDirectory.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using testing::ElementsAre;

// Connects to the daemon's own listener.
class ReportingClientTest : public testing::Test {
 protected:
  ReportingClientTest() {
    std::string problem;
    listener = std::make_unique<UnixSocketListener>(ServerSocket::open(path, problem), category, accounts);
    listener->setDelegate(delegate);
    listener->resume();
    EXPECT_FALSE(client.connect({path}));
  }

  std::optional<Answer> call(std::string_view method, const Arguments& arguments) {
    return client.call(method, arguments, kPatience, error);
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  MemoryLog log;
  LogCategory category{log, "com.example", "twrs"};
  TestAccounts accounts;
  MessagingRecord record;
  RigDelegate delegate{record};
  std::unique_ptr<UnixSocketListener> listener;
  ReportingClient client;
  std::error_code error;
};

TEST_F(ReportingClientTest, CallsAndGetsTheResult) {
  const auto answer = call("echo", {Value(ValueMap{{"a", 1}})});
  EXPECT_FALSE(error);
  ASSERT_TRUE(answer);
  EXPECT_EQ(answer->result, Value(ValueMap{{"a", 1}}));
  EXPECT_FALSE(answer->error);
}

TEST_F(ReportingClientTest, CallsAndGetsTheError) {
  const auto answer = call("takeMap", {Value(1)});
  EXPECT_FALSE(error);
  ASSERT_TRUE(answer);
  EXPECT_EQ(answer->error, messagingError(kInvalidArguments, "takeMap: argument 1 (map) must be a map"));
  EXPECT_FALSE(answer->result);
}

TEST_F(ReportingClientTest, RunsOtherHandlersWhileACallWaits) {
  std::vector<int> order;
  ASSERT_FALSE(client.request("echo", {Value(ValueMap{})}, [&](const Answer&) { order.push_back(1); }));
  ASSERT_TRUE(call("echo", {Value(ValueMap{})}));
  EXPECT_THAT(order, ElementsAre(1));
}

TEST_F(ReportingClientTest, NeverRunsAHandlerInsideRequest) {
  bool isAnswered = false;
  ASSERT_FALSE(client.request("echo", {Value(ValueMap{})}, [&](const Answer&) { isAnswered = true; }));
  pollfd polled{client.fileDescriptor(), POLLIN, 0};
  ASSERT_EQ(::poll(&polled, 1, 30'000), 1);
  ASSERT_FALSE(client.notify("takeInt64", {Value(1)}));
  EXPECT_FALSE(isAnswered);
  EXPECT_FALSE(client.processAnswers(milliseconds(0)));
  EXPECT_TRUE(isAnswered);
}

TEST_F(ReportingClientTest, IgnoresASecondAnswer) {
  std::vector<std::int64_t> answers;
  ASSERT_FALSE(client.request("answerTwice", {},
                              [&](const Answer& answer) { answers.push_back(answer.result->integer()); }));
  ASSERT_TRUE(call("takeInt64", {Value(1)}));
  EXPECT_THAT(answers, ElementsAre(1));
}

TEST_F(ReportingClientTest, TimesOutWhenNoAnswerComesAndTakesItLater) {
  EXPECT_FALSE(client.call("hold", {Value(1)}, milliseconds(1), error));
  EXPECT_EQ(error, std::errc::timed_out);
  EXPECT_TRUE(client.isConnected());
  ASSERT_TRUE(record.waitForHeld(1));
  record.takeHeld()[0].first(std::nullopt);
  EXPECT_FALSE(client.processAnswers(kPatience));
  EXPECT_TRUE(call("takeInt64", {Value(1)}));
}

TEST_F(ReportingClientTest, SaysWhenNothingCame) {
  EXPECT_EQ(client.processAnswers(milliseconds(1)), std::errc::timed_out);
  EXPECT_FALSE(client.processAnswers(milliseconds(0)));
}

TEST_F(ReportingClientTest, FailsOnceTheDaemonIsGone) {
  bool isAnswered = false;
  ASSERT_FALSE(client.request("hold", {Value(1)}, [&](const Answer&) { isAnswered = true; }));
  listener->shutDown();
  EXPECT_EQ(client.processAnswers(kPatience), std::errc::connection_reset);
  EXPECT_FALSE(client.isConnected());
  EXPECT_EQ(client.fileDescriptor(), -1);
  EXPECT_FALSE(isAnswered);
  EXPECT_EQ(client.processAnswers(kPatience), std::errc::not_connected);
  EXPECT_EQ(client.request("takeInt64", {Value(1)}, nullptr), std::errc::not_connected);
  EXPECT_EQ(client.notify("takeInt64", {Value(1)}), std::errc::not_connected);
}

TEST_F(ReportingClientTest, DeliversTheLastAnswersBeforeItFails) {
  bool isAnswered = false;
  ASSERT_FALSE(client.request("echo", {Value(ValueMap{})}, [&](const Answer&) { isAnswered = true; }));
  ASSERT_TRUE(record.waitForRequests(1));
  listener->shutDown();
  EXPECT_FALSE(client.processAnswers(kPatience));
  EXPECT_TRUE(isAnswered);
  EXPECT_EQ(client.processAnswers(kPatience), std::errc::connection_reset);
}

TEST_F(ReportingClientTest, LetsAHandlerSendAndCall) {
  std::optional<Answer> inner;
  ASSERT_FALSE(client.request("takeInt64", {Value(1)}, [&](const Answer&) {
    inner = call("echo", {Value(ValueMap{{"in", 1}})});
  }));
  ASSERT_TRUE(call("takeInt64", {Value(2)}));
  ASSERT_TRUE(inner);
  EXPECT_EQ(inner->result, Value(ValueMap{{"in", 1}}));
}

TEST_F(ReportingClientTest, LetsAHandlerDisconnect) {
  int answers = 0;
  for (int at = 0; at < 3; ++at) {
    ASSERT_FALSE(client.request("takeInt64", {Value(at)}, [&](const Answer&) {
      ++answers;
      client.disconnect();
    }));
  }
  EXPECT_FALSE(client.processAnswers(kPatience));
  EXPECT_EQ(answers, 1);
  EXPECT_FALSE(client.isConnected());
}

TEST_F(ReportingClientTest, RefusesWhatNoFrameCarriesAndStaysConnected) {
  const Value large(ValueMap{{"text", std::string(kMaxFrameBytes, 'x')}});
  EXPECT_EQ(client.request("takeMap", {large}, nullptr), std::errc::message_size);
  EXPECT_EQ(client.notify("takeMap", {large}), std::errc::message_size);
  Value deep = 1;
  for (std::size_t at = 0; at < kMaxFrameDepth; ++at) deep = ValueMap{{"deeper", deep}};
  EXPECT_EQ(client.request("takeMap", {deep}, nullptr), std::errc::invalid_argument);
  EXPECT_EQ(client.notify("takeMap", {deep}), std::errc::invalid_argument);
  EXPECT_TRUE(call("takeInt64", {Value(1)}));
}

// The daemon does not read while too many replies are unread. A client that only sends would therefore wait
// for a daemon that waits for the client.
TEST_F(ReportingClientTest, TakesAnswersInWhileItSendsALot) {
  std::size_t answers = 0;
  const Arguments arguments{Value(ValueMap{{"text", std::string(500'000, 'x')}})};
  for (int at = 0; at < 50; ++at) {
    ASSERT_FALSE(client.request("echo", arguments, [&](const Answer&) { ++answers; }));
  }
  while (answers < 50) ASSERT_FALSE(client.processAnswers(kPatience));
}

TEST_F(ReportingClientTest, ReconnectsAndForgetsWhatWaited) {
  bool isAnswered = false;
  ASSERT_FALSE(client.request("echo", {Value(ValueMap{})}, [&](const Answer&) { isAnswered = true; }));
  ASSERT_FALSE(client.connect({path}));
  EXPECT_TRUE(call("takeInt64", {Value(1)}));
  EXPECT_FALSE(isAnswered);
}

TEST_F(ReportingClientTest, TakesTheFirstPathOnWhichADaemonListens) {
  EXPECT_EQ(ReportingClient().socketPath(), "");
  EXPECT_FALSE(client.connect({directory.path("nobody.sock"), path}));
  EXPECT_EQ(client.socketPath(), path);
  EXPECT_TRUE(call("takeInt64", {Value(1)}));
  EXPECT_EQ(client.connect({directory.path("nobody.sock")}), std::errc::no_such_file_or_directory);
  EXPECT_FALSE(client.isConnected());
  EXPECT_EQ(client.connect({std::string(200, 'x')}), std::errc::filename_too_long);
}

TEST_F(ReportingClientTest, PutsAMessagesArgumentsInOrder) {
  const ValueMap message{{"volume", 0.5}};
  EXPECT_EQ(ReportingClient::messageArguments(message, 7, 8, {}),
            (Arguments{Value(message), Value(7), Value(8), std::nullopt}));
  EXPECT_EQ(ReportingClient::messageArguments(message, 7, 8, {1, -2}),
            (Arguments{Value(message), Value(7), Value(8), Value(ValueArray{1, -2})}));
}

// Connects to a socket on which the test itself plays the daemon.
class OddDaemonTest : public testing::Test {
 protected:
  OddDaemonTest() {
    const auto address = unixAddressOf(path);
    EXPECT_EQ(::bind(listening.get(), generic(*address), sizeof(*address)), 0);
    EXPECT_EQ(::listen(listening.get(), 5), 0);
    EXPECT_FALSE(client.connect({path}));
    daemon = FileDescriptor(::accept(listening.get(), nullptr, nullptr));
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("odd.sock");
  FileDescriptor listening{::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)};
  FileDescriptor daemon;
  ReportingClient client;
};

TEST_F(OddDaemonTest, GivesUpSendingToADaemonThatReadsNothing) {
  client.setSendTimeout(milliseconds(1));
  const Arguments arguments{Value(ValueMap{{"text", std::string(200'000, 'x')}})};
  std::error_code error;
  for (int at = 0; at < 100 && !error; ++at) error = client.notify("m", arguments);
  EXPECT_EQ(error, std::errc::timed_out);
  EXPECT_FALSE(client.isConnected());
}

TEST_F(OddDaemonTest, SurvivesTheDaemonsClosing) {
  daemon.reset();
  const std::error_code error = client.notify("m", {});
  EXPECT_EQ(error, std::errc::broken_pipe);
  EXPECT_FALSE(client.isConnected());
}

TEST_F(OddDaemonTest, EndsWhenTheDaemonSendsInvalidData) {
  const std::string request = fromHex("93 02 A1 6D 90");
  for (const std::string& nonsense : {std::string("HTTP/1.1 400"), request, fromHex("94 01 01 C0 C4 00")}) {
    ASSERT_EQ(::write(daemon.get(), nonsense.data(), nonsense.size()), static_cast<ssize_t>(nonsense.size()));
    EXPECT_EQ(client.processAnswers(kPatience), std::errc::bad_message);
    EXPECT_FALSE(client.isConnected());
    ASSERT_FALSE(client.connect({path}));
    daemon = FileDescriptor(::accept(listening.get(), nullptr, nullptr));
  }
}

TEST_F(OddDaemonTest, ReadsAnErrorThatIsNotAMap) {
  std::optional<Answer> answer;
  ASSERT_FALSE(client.request("m", {}, [&](const Answer& given) { answer = given; }));
  const std::string response = fromHex("94 01 01 A2 6E6F C0");
  ASSERT_EQ(::write(daemon.get(), response.data(), response.size()), static_cast<ssize_t>(response.size()));
  ASSERT_FALSE(client.processAnswers(kPatience));
  ASSERT_TRUE(answer);
  EXPECT_EQ(answer->error, (ReplyError{"", 0, "no"}));
}

class SocketPathsTest : public testing::Test {
 protected:
  void SetUp() override {
    ::unsetenv("TONEWERK_REPORTING_SOCKET");
    ::unsetenv("RUNTIME_DIRECTORY");
  }
  void TearDown() override { SetUp(); }
};

TEST_F(SocketPathsTest, AreTheChosenOneAlone) {
  ::setenv("TONEWERK_REPORTING_SOCKET", "/elsewhere/a.sock", 1);
  EXPECT_THAT(ReportingClient::socketPaths(), ElementsAre("/elsewhere/a.sock"));
}

TEST_F(SocketPathsTest, AreTheUsersThenTheSystems) {
  ::setenv("RUNTIME_DIRECTORY", "/run/mine", 1);
  EXPECT_THAT(ReportingClient::socketPaths(),
              ElementsAre("/run/mine/reporting.sock", "/run/tonewerk/reporting.sock"));
}

TEST_F(SocketPathsTest, NameTheSystemsOnlyOnce) {
  ::setenv("RUNTIME_DIRECTORY", "/run/tonewerk", 1);
  EXPECT_THAT(ReportingClient::socketPaths(), ElementsAre("/run/tonewerk/reporting.sock"));
}

}  // namespace
}  // namespace tonewerk
