// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <string>
#include <vector>

#include "support/TemporaryDirectory.h"

namespace tonewerk {

// The service manager's end of the socket that NOTIFY_SOCKET names.
class NotifySocket {
 public:
  // How long to wait for a message. Only a failing test waits that long.
  static constexpr std::chrono::seconds kPatience{30};

  // Adds a test failure when the socket cannot be made.
  NotifySocket();
  NotifySocket(const NotifySocket&) = delete;
  NotifySocket& operator=(const NotifySocket&) = delete;
  ~NotifySocket();

  std::string path() const { return directory_.path("notify"); }

  // Returns the messages that have arrived and were not taken yet, in the order in which they were sent.
  std::vector<std::string> take();

  // Waits for a message that contains this line, and drops those before it. Returns an empty text when none
  // came in time.
  std::string waitForLine(const std::string& line);

 private:
  // Returns the next message, or an empty text when none comes within `timeout`.
  std::string next(std::chrono::milliseconds timeout);

  const TemporaryDirectory directory_;
  int descriptor_ = -1;
};

}  // namespace tonewerk
