// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>
#include <string>

namespace tonewerk {

// Sends the daemon's state to the service manager that started it, through the socket that NOTIFY_SOCKET
// names. Without that variable it does nothing. A message that cannot be sent is lost; that does no harm,
// because the manager notices the end of the daemon and missing pings by itself.
//
// Any thread, as long as no thread changes the environment.
class ServiceManager {
 public:
  // An upper limit, so that calculations with the interval cannot overflow.
  static constexpr std::chrono::hours kLongestPingInterval{1};

  // Says that the daemon serves clients from now on. `status` is one line for people.
  void tellReady(const std::string& status) const;

  // Says that the daemon reads its configuration again. tellReady() ends that state.
  void tellReloading() const;

  // Says what the daemon does before it is ready, and that the next part may take `step`.
  void tellProgress(const std::string& status, std::chrono::microseconds step) const;

  // Says that the daemon is ending. From then on the manager expects no more pings.
  void tellStopping(const std::string& status) const;

  // Says that the thread that serves clients is alive.
  void ping() const;

  // How often to ping: half of the manager's timeout, and at least a millisecond. The timeout is
  // WATCHDOG_USEC, if WATCHDOG_PID is not set or is this process. None if the manager expects no pings.
  std::optional<std::chrono::milliseconds> pingInterval() const;
};

}  // namespace tonewerk
