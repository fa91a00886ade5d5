// SPDX-License-Identifier: Apache-2.0
//
// Tests that no user can take what another one needs: connections, memory, rows in the store, log lines.
#include <algorithm>
#include <chrono>
#include <sstream>
#include <string>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <vector>

#include "system/support/RecordedEvents.h"
#include "system/support/UsersTest.h"

namespace tonewerk {
namespace {

using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr AudioEventCategory kPlayback = 4;
const std::string kEvent = "com.orvane.longformaudio.Playback.Start";

double now() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// Limits the descriptors of processes that this one starts, as long as it exists.
class DescriptorLimit {
 public:
  explicit DescriptorLimit(rlim_t limit) {
    ::getrlimit(RLIMIT_NOFILE, &before_);
    const rlimit lower{limit, limit};
    EXPECT_EQ(::setrlimit(RLIMIT_NOFILE, &lower), 0);
  }
  DescriptorLimit(const DescriptorLimit&) = delete;
  DescriptorLimit& operator=(const DescriptorLimit&) = delete;
  ~DescriptorLimit() { ::setrlimit(RLIMIT_NOFILE, &before_); }

 private:
  rlimit before_{};
};

class SharesTest : public UsersTest {
 protected:
  DaemonClient withSession(std::uint32_t user, ReporterID reporterID = kSession) {
    DaemonClient client = connectAs(user);
    client.create(reporterID, kLongFormAudio);
    client.start(reporterID);
    return client;
  }
  std::vector<nlohmann::json> recorded(const std::string& name) const {
    return RecordedEvents(daemon.storePath()).named(name);
  }
  std::size_t logLines() const {
    const std::string log = daemon.log();
    return static_cast<std::size_t>(std::count(log.begin(), log.end(), '\n'));
  }
};

TEST_F(SharesTest, AUserThatOpensAllConnectionsItCanLeavesOneForTheNext) {
  {
    const DescriptorLimit limit(200);
    ASSERT_TRUE(startDaemon());
  }
  UserProcess& greedy = start(kAlice, {"connections", "400"});
  const double taken = greedy.number("answered").value_or(0);
  EXPECT_GT(taken, 10);
  EXPECT_LT(taken, 200);
  DaemonClient bob = connectAs(kBob);
  bob.create(kSession, kLongFormAudio);
  EXPECT_EQ(bob.serviceType(kSession), kLongFormAudio);
  // Even one that comes after both of them.
  DaemonClient root = connect();
  EXPECT_THAT(root.allReporters(), SizeIs(1));
}

TEST_F(SharesTest, AUserThatFillsTheStoreErasesNobodyElsesRows) {
  daemon.writeConfiguration("preferences/com.orvane.tonewerk.store.toml", "max_megabytes = 16\n");
  ASSERT_TRUE(startDaemon());
  DaemonClient bob = withSession(kBob);
  constexpr int kRows = 200;
  for (int number = 0; number < kRows; ++number) {
    bob.send({{"number", number}}, kPlayback, kTypeStart, {kSession});
  }
  ASSERT_TRUE(waitUntil([&] { return recorded(kEvent).size() == kRows; }));
  start(kAlice, {"large", "1000000", "60"});  // more than three times what the store may hold
  // The daemon looks at the size every ten seconds while reports come in.
  const auto hasLooked = std::chrono::steady_clock::now() + std::chrono::seconds(12);
  int last = 0;
  EXPECT_TRUE(waitUntil([&] {
    bob.send({{"last", ++last}}, kPlayback, kTypeStart, {kSession});
    return std::chrono::steady_clock::now() > hasLooked;
  }));
  bob.stop(kSession);
  EXPECT_EQ(daemon.stop(), 0);
  std::vector<nlohmann::json> rows = recorded(kEvent);
  std::erase_if(rows, [](const auto& row) { return !row.contains("number"); });
  EXPECT_THAT(rows, SizeIs(kRows));
}

TEST_F(SharesTest, WhatATrustedUserSendsIntoAnothersSessionIsChargedToTheSender) {
  ASSERT_TRUE(
      daemon.writeConfiguration("preferences/com.orvane.tonewerk.service.toml", "kept_megabytes = 16\n"));
  ASSERT_TRUE(startDaemon());
  DaemonClient alice = withSession(kAlice);
  DaemonClient root = connect();
  const std::string large(1'000'000, 'x');
  for (int number = 0; number < 20; ++number) {
    root.send({{"filler", number}, {"text", large}}, 9, kTypeGeneric, {kSession});
  }
  // A minute of playback that ended just now.
  const double begin = now() - 60.0;
  const auto say = [&](AudioEventType type, double at, ValueMap message) {
    message.set("twreporting_timestamp", begin + at);
    alice.send(message, kPlayback, type, {kSession});
  };
  alice.setConfiguration(kSession, {{"HostApplicationDisplayID", "com.example.player"}});
  say(kTypeStart, 0.0,
      {{"session_output_running", true}, {"QMSessionVolume", 0.25}, {"active_devices", "Speaker"}});
  say(kTypeGeneric, 10.0, {{"QMSessionVolume", 0.75}});
  say(kTypeStop, 30.0, {{"session_output_running", false}});
  alice.stop(kSession);
  EXPECT_EQ(daemon.stop(), 0);
  double seconds = 0;
  for (const auto& summary : recorded("com.orvane.longformaudio.Volume.Summary")) {
    EXPECT_EQ(summary.at("HostApplicationDisplayID"), "com.example.player");
    seconds += summary.at("play_seconds").get<double>();
  }
  EXPECT_DOUBLE_EQ(seconds, 30.0);
}

TEST_F(SharesTest, MessagesForSessionsThatDoNotExistHaveAFewLinesInTheLog) {
  daemon.setEnvironment("TONEWERK_LOG", "default");
  ASSERT_TRUE(startDaemon());
  const std::size_t before = logLines();
  constexpr std::size_t kRequests = 256;
  start(kAlice, {"unknown", std::to_string(kRequests), "4000"});
  EXPECT_LE(logLines(), before + kRequests);
  EXPECT_GE(logLinesWith("failed to find reporting session", "others"), 1U);
}

TEST_F(SharesTest, ATextWithALineFeedIsPartOfOneRecordOfTheLog) {
  daemon.setEnvironment("TONEWERK_LOG", "debug");
  ASSERT_TRUE(startDaemon());
  char name[16] = {};
  ::prctl(PR_GET_NAME, name);
  ::prctl(PR_SET_NAME, "x\nforged name");
  {
    DaemonClient alice = withSession(kAlice);
    alice.setConfiguration(kSession, {{"HostApplicationDisplayID", "x\nforged application"}});
    EXPECT_TRUE(alice.call("x\nforged method").error);
    alice.stop(kSession);
  }
  EXPECT_TRUE(waitForLogLine("connection exited"));
  ::prctl(PR_SET_NAME, name);
  EXPECT_GT(logLinesWith("forged"), 0U);
  std::istringstream lines(daemon.log());
  for (std::string line; std::getline(lines, line);) EXPECT_FALSE(line.starts_with("forged")) << line;
}

}  // namespace
}  // namespace tonewerk
