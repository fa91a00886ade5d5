// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>
#include <string>

namespace tonewerk {

// What the daemon tells the service manager that started it, over the socket that NOTIFY_SOCKET names.
// Without that variable there is nobody to tell, and nothing happens; a message that cannot be sent is lost,
// since the manager notices by itself what matters.
//
// Any thread, as long as none changes the environment.
class ServiceManager {
 public:
  // Rarer pings are not worth a longer sum.
  static constexpr std::chrono::hours kLongestPingInterval{1};

  // Clients are served from now on. `status` is for people, in one line.
  void tellReady(const std::string& status) const;

  // The configuration is being read again, until tellReady().
  void tellReloading() const;

  // The end has begun, and takes as long as it takes: the manager expects no more pings.
  void tellStopping(const std::string& status) const;

  // The thread that serves clients is alive.
  void ping() const;

  // How often the manager wants a ping: in half the time after which it gives the process up (WATCHDOG_USEC,
  // where WATCHDOG_PID is none or this process). None where it wants none. At least a millisecond.
  std::optional<std::chrono::milliseconds> pingInterval() const;
};

}  // namespace tonewerk
