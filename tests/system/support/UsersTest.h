// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "support/users/UserIdentity.h"
#include "system/support/ChildProcess.h"
#include "system/support/DaemonTest.h"

namespace tonewerk {

// A client in a process of its own, which belongs to `user`. See tests/system/programs/user_client.cpp for
// commands and what they print.
class UserProcess {
 public:
  UserProcess(const DaemonProcess& daemon, std::uint32_t user, std::vector<std::string> command);

  // Waits until it has printed this word first in a line. False when it ended without, which is a test
  // failure.
  bool waitFor(const std::string& word);
  // The number that it has printed after this word; none when it has printed no such line.
  std::optional<double> number(const std::string& word) const;
  // Waits for its end and returns what it has printed. Another exit status than 0 is a test failure.
  std::string outputAtEnd();

  void kill() { process_.kill(); }

 private:
  std::string output() const { return textOfFile(directory_.path("output")); }
  std::string problem() const { return textOfFile(directory_.path("errors")); }

  TemporaryDirectory directory_;
  ChildProcess process_;
};

// What a quiet client measures.
struct RoundTrips {
  double count = 0;
  double p99Milliseconds = 0;
  double maxMilliseconds = 0;
};

// Base of tests with clients of several users: Alice, who does as she likes, and Bob, who must not notice.
// Only root can become other users; without that right the tests are skipped.
class UsersTest : public DaemonTest {
 protected:
  // The longest that a quiet user may wait in 99 of 100 cases. Sanitizers make the daemon slower. It is an
  // order of magnitude, which shows that nobody waits for another user's work; benchmarks measure the time
  // itself.
  static const double kMostMilliseconds;

  void SetUp() override;

  // Starts the daemon, with a socket that is open to all users.
  [[nodiscard]] bool startDaemon();

  // Returns a connected client of that user, in this process.
  DaemonClient connectAs(std::uint32_t user);

  // Starts a client, and waits until it says that it is ready, or another word.
  UserProcess& start(std::uint32_t user, const std::vector<std::string>& command,
                     const std::string& word = "ready");

  // What Bob's quiet client, in a process of its own, sees meanwhile.
  RoundTrips bobsRoundTrips();
  // Expects that Bob need not wait while Alice's work is under way.
  void expectBobNotHeldUp();

 private:
  std::vector<std::unique_ptr<UserProcess>> processes_;
};

}  // namespace tonewerk
