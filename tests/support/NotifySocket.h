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
  // No test waits so long unless it fails.
  static constexpr std::chrono::seconds kPatience{30};

  // A test failure where there is none to be had.
  NotifySocket();
  NotifySocket(const NotifySocket&) = delete;
  NotifySocket& operator=(const NotifySocket&) = delete;
  ~NotifySocket();

  std::string path() const { return directory_.path("notify"); }

  // The messages that are there and were not taken yet, in the order in which they were sent.
  std::vector<std::string> take();

  // Waits for a message that has this line, and drops those before it. Empty when none came in time.
  std::string waitForLine(const std::string& line);

 private:
  // The next message; empty when none comes before `timeout`.
  std::string next(std::chrono::milliseconds timeout);

  const TemporaryDirectory directory_;
  int descriptor_ = -1;
};

}  // namespace tonewerk
