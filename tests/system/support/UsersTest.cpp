// SPDX-License-Identifier: Apache-2.0
#include "system/support/UsersTest.h"

#include <sstream>

#include "support/OtherUser.h"
#include "system/memory/Sanitizers.h"

namespace tonewerk {
namespace {

// Longer than the daemon of a failing test may hold up the client.
constexpr std::chrono::seconds kPatience{60};
constexpr const char* kQuietMilliseconds = "4000";

}  // namespace

UserProcess::UserProcess(const DaemonProcess& daemon, std::uint32_t user, std::vector<std::string> command) {
  command.insert(command.begin(), {std::to_string(user), daemon.socketPath()});
  EXPECT_TRUE(process_.start({TONEWERK_USER_CLIENT, std::move(command), {}}, directory_.path("output"),
                             directory_.path("errors")));
}

bool UserProcess::waitFor(const std::string& word) {
  const auto hasWord = [&] { return ("\n" + output()).find("\n" + word) != std::string::npos; };
  const bool isThere = waitUntil([&] { return hasWord() || !process_.isRunning(); }, kPatience) && hasWord();
  EXPECT_TRUE(isThere) << "the client does not say \"" << word << "\"; it says: " << output() << problem();
  return isThere;
}

std::optional<double> UserProcess::number(const std::string& word) const {
  std::istringstream lines(output());
  double value = 0;
  for (std::string first; lines >> first;) {
    if (first == word && lines >> value) return value;
  }
  return std::nullopt;
}

std::string UserProcess::outputAtEnd() {
  EXPECT_EQ(process_.wait(kPatience), 0) << problem();
  return output();
}

const double UsersTest::kMostMilliseconds = kHasSanitizer ? 500 : 50;

void UsersTest::SetUp() {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can become other users";
  daemon.setEnvironment("TONEWERK_LOG", "error");  // otherwise the log would have many lines
}

bool UsersTest::startDaemon() {
  if (!daemon.start()) return false;
  openToAllUsers(daemon.socketPath());
  return true;
}

DaemonClient UsersTest::connectAs(std::uint32_t user) {
  std::optional<DaemonClient> client;
  // The kernel tells the daemon the user that the connecting thread has at that time.
  runAsUser(user, [&] { client.emplace(daemon.socketPath()); });
  return std::move(*client);
}

UserProcess& UsersTest::start(std::uint32_t user, const std::vector<std::string>& command,
                              const std::string& word) {
  processes_.push_back(std::make_unique<UserProcess>(daemon, user, command));
  processes_.back()->waitFor(word);
  return *processes_.back();
}

RoundTrips UsersTest::bobsRoundTrips() {
  UserProcess quiet(daemon, kBob, {"quiet", kQuietMilliseconds});
  quiet.outputAtEnd();
  return {quiet.number("count").value_or(0), quiet.number("p99").value_or(-1),
          quiet.number("max").value_or(-1)};
}

void UsersTest::expectBobNotHeldUp() {
  const RoundTrips seen = bobsRoundTrips();
  EXPECT_GE(seen.count, 1000);
  EXPECT_GE(seen.p99Milliseconds, 0);
  EXPECT_LT(seen.p99Milliseconds, kMostMilliseconds);
  RecordProperty("p99Microseconds", static_cast<int>(seen.p99Milliseconds * 1000));
  RecordProperty("maxMicroseconds", static_cast<int>(seen.maxMilliseconds * 1000));
}

}  // namespace tonewerk
