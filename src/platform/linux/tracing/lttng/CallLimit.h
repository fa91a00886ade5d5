// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>

#include "platform/TimerService.h"
#include "platform/linux/tracing/lttng/SessionDaemon.h"

namespace tonewerk {

// Limits the time of calls to the session daemon, which have no timeout of their own. If the scope takes
// longer, the private session daemon is killed, so that the waiting call fails.
class CallLimit {
 public:
  // Much longer than any call takes, even with slow programs.
  static constexpr std::chrono::seconds kTimeout{10};

  // Both must outlive the scope.
  CallLimit(SessionDaemon& daemon, TimerService& timers)
      : timer_(timers.repeat(kTimeout, [&daemon] { daemon.kill(); })) {}

 private:
  std::unique_ptr<Timer> timer_;
};

}  // namespace tonewerk
