// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/DaemonLink.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include "bridges/pipewire/RecordingDaemon.h"
#include "bridges/pipewire/Said.h"
#include "bridges/pipewire/StreamReports.h"
#include "platform/linux/UnixAddress.h"
#include "support/ManualClock.h"
#include "support/ManualEventLoop.h"
#include "support/TemporaryDirectory.h"

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
    link.open([this] { ++connections; });
  }
  // Long enough for the next try, however many have failed.
  void waitForRetry() { clock.advance(RetryDelay::kLongest); }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  std::unique_ptr<RecordingDaemon> daemon;
  ManualClock clock;
  ManualEventLoop loop{clock};
  Said said;
  Diagnostics diagnostics{false, said.file()};
  DaemonLink link{loop, diagnostics, {path}};
  int connections = 0;
};

TEST_F(DaemonLinkTest, AsksForASessionStepByStep) {
  startDaemon();
  open();
  EXPECT_EQ(connections, 1);
  EXPECT_EQ(link.socketPath(), path);
  link.create(77);
  link.configure(77, 7, {{"HostApplicationDisplayID", "player"}});
  link.start(77);
  link.message(77, 5, 2, {{"QMSessionVolume", 0.5}});
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
  EXPECT_THAT(requests[4].arguments,
              ElementsAre(Argument(Value(ValueMap{{"QMSessionVolume", 0.5}})), Argument(Value(5)),
                          Argument(Value(2)), Argument(Value(ValueArray{Value(77)}))));
  EXPECT_THAT(requests[5].arguments, ElementsAre(session));
  EXPECT_THAT(requests[6].arguments, ElementsAre(session));
}

TEST_F(DaemonLinkTest, TriesUntilADaemonListens) {
  open();
  clock.advance(60.0);
  EXPECT_EQ(connections, 0);
  EXPECT_EQ(countOf(said.text(), "no reporting daemon"), 1);
  startDaemon();
  waitForRetry();
  EXPECT_EQ(connections, 1);
  clock.advance(60.0);
  EXPECT_EQ(connections, 1);
}

TEST_F(DaemonLinkTest, TriesSoonAgainAfterADaemonThatHasServed) {
  open();
  clock.advance(60.0);
  startDaemon();
  waitForRetry();
  link.create(77);
  ASSERT_TRUE(loop.runReadable());
  ASSERT_TRUE(link.isConnected());
  daemon.reset();
  ASSERT_TRUE(loop.runReadable());
  startDaemon();
  clock.advance(RetryDelay::kFirst);
  EXPECT_EQ(connections, 2);
}

// One that turns everybody away is found by every try, and must not be tried at the pace of one that
// restarts.
TEST_F(DaemonLinkTest, TriesSeldomADaemonThatOnlyEverHangsUp) {
  open();
  clock.advance(60.0);
  startDaemon();
  waitForRetry();
  daemon.reset();
  ASSERT_TRUE(loop.runReadable());
  startDaemon();
  clock.advance(RetryDelay::kFirst);
  EXPECT_EQ(connections, 1);
}

TEST_F(DaemonLinkTest, KeepsNothingForADaemonThatIsAway) {
  open();
  link.create(77);
  link.message(77, 5, 0, {{"QMSessionVolume", 0.5}});
  EXPECT_FALSE(link.finish(seconds(30)));
  startDaemon();
  waitForRetry();
  ASSERT_TRUE(link.finish(seconds(30)));
  EXPECT_THAT(daemon->methods(), ElementsAre("getAllReporters"));
}

TEST_F(DaemonLinkTest, FollowsADaemonThatRestarts) {
  startDaemon();
  open();
  daemon.reset();
  ASSERT_TRUE(loop.runReadable());
  EXPECT_FALSE(link.isConnected());
  link.create(77);
  startDaemon();
  waitForRetry();
  EXPECT_EQ(connections, 2);
  link.create(78);
  ASSERT_TRUE(daemon->waitForRequests(1));
  EXPECT_THAT(daemon->requests()[0].arguments, ElementsAre(Argument(Value(78))));
}

TEST_F(DaemonLinkTest, NoticesWhileItSendsThatTheDaemonIsGone) {
  startDaemon();
  open();
  daemon.reset();
  link.create(77);
  EXPECT_FALSE(link.isConnected());
  startDaemon();
  waitForRetry();
  EXPECT_TRUE(link.isConnected());
}

TEST_F(DaemonLinkTest, FinishesNothingWithADaemonThatIsGone) {
  startDaemon();
  open();
  daemon.reset();
  EXPECT_FALSE(link.finish(seconds(30)));
}

TEST_F(DaemonLinkTest, SaysARefusalOnceHoweverOftenItComes) {
  startDaemon();
  daemon->refuse({"com.orvane.audio.reporting", 1, ""});
  open();
  for (int i = 0; i < 5; ++i) link.message(77, 5, 0, {{"QMSessionVolume", 0.5}});
  ASSERT_TRUE(link.finish(seconds(30)));
  EXPECT_EQ(countOf(said.text(), "sendMessage refused: com.orvane.audio.reporting 1"), 1);
  link.create(77);
  ASSERT_TRUE(link.finish(seconds(30)));
  EXPECT_THAT(said.text(), HasSubstr("createReportingSession refused"));
}

// A daemon that accepts and then reads nothing must not stop the thread that PipeWire's events come on.
TEST_F(DaemonLinkTest, GivesUpADaemonThatDoesNotRead) {
  const FileDescriptor deaf(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const auto address = unixAddressOf(path);
  ASSERT_TRUE(address);
  ASSERT_EQ(bind(deaf.get(), generic(*address), sizeof(*address)), 0);
  ASSERT_EQ(listen(deaf.get(), 1), 0);
  open();
  ASSERT_TRUE(link.isConnected());
  const ValueMap message{{"text", std::string(1000, 'x')}};
  int sent = 0;
  while (link.isConnected() && sent < 100'000) {
    link.message(77, 5, 0, message);
    ++sent;
  }
  EXPECT_FALSE(link.isConnected());
}

// A stream that plays on while the daemon restarts has a session in the new one, from its present state.
TEST_F(DaemonLinkTest, BringsLiveStreamsToARestartedDaemon) {
  ReporterIdentifiers identifiers(clock, 1);
  StreamReports reports(link, clock, identifiers, loop);
  startDaemon();
  link.open([&] { reports.restartAll(); });
  StreamState state{true, "player", "Music", true, 0.5, AudioFormat{"lpcm", "F32LE", 48'000, 2}, "Speaker"};
  reports.streamChanged(40, state);
  clock.advance(1.0);
  ASSERT_TRUE(daemon->waitForRequests(5));
  const std::vector<RecordingDaemon::Request> before = daemon->requests();

  daemon.reset();
  link.message(1, 5, 0, {});
  state.volume = 0.3;
  reports.streamChanged(40, state);
  startDaemon();
  waitForRetry();
  clock.advance(1.0);
  ASSERT_TRUE(daemon->waitForRequests(5));
  EXPECT_THAT(daemon->methods(), ElementsAre("createReportingSession", "setServiceType", "setConfiguration",
                                             "startReportingSessionForID", "sendMessage"));
  const std::vector<RecordingDaemon::Request> after = daemon->requests();
  EXPECT_NE(after[0].arguments, before[0].arguments);
  EXPECT_EQ(after[4].arguments[0]->asMap()->number("QMSessionVolume"), 0.3);
  EXPECT_TRUE(after[4].arguments[0]->asMap()->boolean("session_output_running"));
}

}  // namespace
}  // namespace tonewerk
