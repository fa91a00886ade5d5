// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>

#include "platform/TimerService.h"
#include "platform/linux/tracing/lttng/SessionDaemon.h"

namespace tonewerk {

// A time limit for calls to the session daemon, which have none of their own: when the scope takes longer,
// the private session daemon is killed, and the call that waits for it fails.
class CallLimit {
 public:
  // Far above what the slowest programs can make a call take.
  static constexpr std::chrono::seconds kTimeout{10};

  // Both outlive the scope.
  CallLimit(SessionDaemon& daemon, TimerService& timers)
      : timer_(timers.repeat(kTimeout, [&daemon] { daemon.kill(); })) {}

 private:
  std::unique_ptr<Timer> timer_;
};

}  // namespace tonewerk
