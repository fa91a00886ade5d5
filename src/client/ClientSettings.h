// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>
#include <vector>

#include "tonewerk/reporting.h"

namespace tonewerk {

// What a client is made with.
struct ClientSettings {
  static constexpr std::size_t kDefaultQueueBytes = std::size_t{256} * 1024;

  std::vector<std::string> socketPaths;  // in the order in which to try them
  std::size_t queueBytes = kDefaultQueueBytes;
  bool isOnce = false;
  void (*stateChanged)(void* context, twr_state state) = nullptr;
  void* context = nullptr;

  // Between attempts to connect; see Backoff.
  std::chrono::milliseconds firstDelay{250};
  std::chrono::milliseconds mostDelay{30'000};
  // A connection that the daemon kept for so long was a good one, even if it never had to answer.
  std::chrono::milliseconds settledTime{5'000};
  // Between looks at the senders' rings: while messages come, and after a while without any.
  std::chrono::milliseconds busyPoll{10};
  std::chrono::milliseconds idlePoll{100};
};

}  // namespace tonewerk
