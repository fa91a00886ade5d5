// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/DaemonLink.h"

#include <functional>
#include <gmock/gmock.h>
#include <sys/socket.h>
#include <vector>

#include "bridges/pipewire/sessions/ConsoleOutput.h"
#include "bridges/pipewire/sessions/RecordingDaemon.h"
#include "bridges/pipewire/sessions/StreamReports.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualEventLoop.h"

namespace tonewerk {
namespace {

using std::chrono::seconds;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

class DaemonLinkTest : public ::testing::Test {
 protected:
  void startDaemon() {
    daemon = std::make_unique<RecordingDaemon>(path);
    ASSERT_TRUE(daemon->isListening());
  }
  void open() {
    ASSERT_TRUE(link.open([this](DaemonLink::Connection connection) { connections.push_back(connection); }));
  }
  // Runs the work that the library's thread posts to the loop until `condition` holds.
  bool runUntil(const std::function<bool()>& condition) {
    while (!condition()) {
      if (!loop.runReadable()) return false;
    }
    return true;
  }
  bool waitForConnections(std::size_t count) {
    return runUntil([&] { return connections.size() >= count; });
  }
  void openAndConnect() {
    startDaemon();
    open();
    ASSERT_TRUE(waitForConnections(1));
  }
  void loseDaemon() {
    daemon.reset();
    ASSERT_TRUE(runUntil([&] { return !link.isConnected(); }));
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  std::unique_ptr<RecordingDaemon> daemon;
  ManualClock clock;
  ManualEventLoop loop{clock};
  ConsoleOutput output;
  Console console{false, output.file()};
  DaemonLink link{loop, console, path};
  std::vector<DaemonLink::Connection> connections;
};

TEST_F(DaemonLinkTest, SendsTheRequestsOfASessionInOrder) {
  openAndConnect();
  EXPECT_THAT(connections, ElementsAre(DaemonLink::Connection::kFirst));
  EXPECT_TRUE(link.isConnected());
  EXPECT_EQ(link.socketPath(), path);
  link.create(77);
  link.configure(77, 7, {{"HostApplicationDisplayID", "player"}});
  link.start(77);
  const ValueMap message{{"QMSessionVolume", 0.5}, {"twreporting_timestamp", 1763633999.25}};
  link.message(77, 5, 2, message);
  link.stop(77);
  link.destroy(77);
  ASSERT_TRUE(link.finish(seconds(30)));

  const std::vector<RecordingDaemon::Request> requests = daemon->requests();
  EXPECT_THAT(daemon->methods(),
              ElementsAre("createReportingSession", "setServiceType", "setConfiguration",
                          "startReportingSessionForID", "sendMessage", "stopReportingSessionForID",
                          "destroyReportingSession", "getAllReporters"));
  const Argument session(Value(77));
  EXPECT_THAT(requests[0].arguments, ElementsAre(session));
  EXPECT_THAT(requests[1].arguments, ElementsAre(Argument(Value(7)), session));
  EXPECT_THAT(requests[2].arguments,
              ElementsAre(Argument(Value(ValueMap{{"HostApplicationDisplayID", "player"}})), session));
  EXPECT_THAT(requests[4].arguments, ElementsAre(Argument(Value(message)), Argument(Value(5)),
                                                 Argument(Value(2)), Argument(Value(ValueArray{Value(77)}))));
  EXPECT_THAT(requests[5].arguments, ElementsAre(session));
  EXPECT_THAT(requests[6].arguments, ElementsAre(session));
}

TEST_F(DaemonLinkTest, ConnectsAgainUntilADaemonListens) {
  open();
  ASSERT_TRUE(runUntil([&] { return countOf(output.text(), "no reporting daemon") == 1; }));
  EXPECT_FALSE(link.isConnected());
  startDaemon();
  ASSERT_TRUE(waitForConnections(1));
  EXPECT_EQ(countOf(output.text(), "no reporting daemon"), 1);
  EXPECT_THAT(output.text(), HasSubstr("connected to the reporting daemon"));
}

TEST_F(DaemonLinkTest, DropsCallsMadeBeforeTheFirstConnection) {
  open();
  link.create(77);
  link.configure(77, 7, {{"HostApplicationDisplayID", "player"}});
  link.start(77);
  link.message(77, 5, 0, {{"QMSessionVolume", 0.5}});
  EXPECT_FALSE(link.finish(seconds(30)));
  startDaemon();
  ASSERT_TRUE(waitForConnections(1));
  ASSERT_TRUE(link.finish(seconds(30)));
  EXPECT_THAT(daemon->methods(), ElementsAre("getAllReporters"));
}

TEST_F(DaemonLinkTest, MakesItsSessionsAgainInARestartedDaemon) {
  openAndConnect();
  link.create(77);
  link.configure(77, 7, {{"HostApplicationDisplayID", "player"}});
  link.start(77);
  ASSERT_TRUE(link.finish(seconds(30)));
  loseDaemon();
  EXPECT_EQ(countOf(output.text(), "lost the reporting daemon"), 1);
  link.create(78);
  startDaemon();
  ASSERT_TRUE(waitForConnections(2));
  EXPECT_EQ(connections.back(), DaemonLink::Connection::kAgain);
  ASSERT_TRUE(link.finish(seconds(30)));
  EXPECT_THAT(daemon->methods(),
              ElementsAre("createReportingSession", "setServiceType", "setConfiguration",
                          "startReportingSessionForID", "createReportingSession", "getAllReporters"));
  EXPECT_THAT(daemon->requests()[4].arguments, ElementsAre(Argument(Value(78))));
}

TEST_F(DaemonLinkTest, CannotFinishWithoutADaemon) {
  openAndConnect();
  daemon.reset();
  EXPECT_FALSE(link.finish(std::chrono::milliseconds(100)));
}

TEST_F(DaemonLinkTest, ReportsARepeatedRefusalOnce) {
  startDaemon();
  daemon->refuse({"com.orvane.audio.reporting", 1, ""});
  open();
  ASSERT_TRUE(waitForConnections(1));
  link.create(77);
  for (int i = 0; i < 5; ++i) link.message(77, 5, 0, {{"QMSessionVolume", 0.5}});
  ASSERT_TRUE(link.finish(seconds(30)));
  const auto refusals = [&](const std::string& method) {
    return countOf(output.text(), method + " refused: com.orvane.audio.reporting 1");
  };
  ASSERT_TRUE(runUntil([&] { return refusals("sendMessage") > 0; }));
  link.stop(77);
  ASSERT_TRUE(runUntil([&] { return refusals("stopReportingSessionForID") > 0; }));
  EXPECT_EQ(refusals("sendMessage"), 1);
}

// A daemon that accepts and then reads nothing must not block the thread on which PipeWire's events arrive.
TEST_F(DaemonLinkTest, NeverWaitsForADaemonThatDoesNotRead) {
  const FileDescriptor listener(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const auto address = unixAddressOf(path);
  ASSERT_TRUE(address);
  ASSERT_EQ(bind(listener.get(), generic(*address), sizeof(*address)), 0);
  ASSERT_EQ(listen(listener.get(), 1), 0);
  open();
  ASSERT_TRUE(waitForConnections(1));
  link.create(77);
  const ValueMap message{{"text", std::string(1000, 'x')}};
  for (int sent = 0; sent < 10'000; ++sent)
    link.message(77, 5, 0, message);  // ten times the limit of waiting messages
  EXPECT_TRUE(link.isConnected());
}

// A stream that keeps playing while the daemon restarts is reported to the new daemon with its present state.
TEST_F(DaemonLinkTest, ReportsLiveStreamsToARestartedDaemon) {
  ReporterIdentifiers identifiers(clock, 1);
  StreamReports reports(link, clock, identifiers, loop);
  startDaemon();
  ASSERT_TRUE(link.open([&](DaemonLink::Connection connection) {
    connections.push_back(connection);
    connection == DaemonLink::Connection::kFirst ? reports.restartAll() : reports.resendAll();
  }));
  ASSERT_TRUE(waitForConnections(1));
  StreamState state{true, "player", "Music", true, 0.5, AudioFormat{"lpcm", "F32LE", 48'000, 2}, "Speaker"};
  reports.streamChanged(40, state);
  clock.advance(1.0);
  ASSERT_TRUE(daemon->waitForRequests(5));
  const std::vector<RecordingDaemon::Request> before = daemon->requests();

  loseDaemon();
  startDaemon();
  ASSERT_TRUE(waitForConnections(2));
  clock.advance(1.0);
  ASSERT_TRUE(daemon->waitForRequests(5));
  EXPECT_THAT(daemon->methods(), ElementsAre("createReportingSession", "setServiceType", "setConfiguration",
                                             "startReportingSessionForID", "sendMessage"));
  const std::vector<RecordingDaemon::Request> after = daemon->requests();
  EXPECT_EQ(after[0].arguments, before[0].arguments);
  EXPECT_EQ(after[4].arguments[0]->asMap()->number("QMSessionVolume"), 0.5);
  EXPECT_TRUE(after[4].arguments[0]->asMap()->boolean("session_output_running"));
}

}  // namespace
}  // namespace tonewerk
