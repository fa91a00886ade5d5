// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/ServiceManager.h"

#include <algorithm>
#include <cstdint>
#include <ctime>
#include <string>
#include <systemd/sd-daemon.h>

namespace tonewerk {
namespace {

// The variables are kept for later messages. Programs that the daemon runs inherit them, but the manager
// accepts messages of the main process only.
constexpr int kKeepVariables = 0;

void tell(const std::string& message) { ::sd_notify(kKeepVariables, message.c_str()); }

}  // namespace

void ServiceManager::tellReady(const std::string& status) const { tell("READY=1\nSTATUS=" + status); }

// The time tells the manager which READY=1 belongs to this message.
void ServiceManager::tellReloading() const {
  timespec now{};
  ::clock_gettime(CLOCK_MONOTONIC, &now);
  const std::int64_t microseconds = now.tv_sec * 1'000'000LL + now.tv_nsec / 1'000;
  tell("RELOADING=1\nMONOTONIC_USEC=" + std::to_string(microseconds));
}

void ServiceManager::tellProgress(const std::string& status, std::chrono::microseconds step) const {
  tell("EXTEND_TIMEOUT_USEC=" + std::to_string(step.count()) + "\nSTATUS=" + status);
}

// If a ping arrives after the manager has told the daemon to end, the manager starts the watchdog again, and
// no more pings follow. A timeout of 0 switches the watchdog off.
void ServiceManager::tellStopping(const std::string& status) const {
  tell((pingInterval() ? "STOPPING=1\nWATCHDOG_USEC=0\nSTATUS=" : "STOPPING=1\nSTATUS=") + status);
}

void ServiceManager::ping() const { tell("WATCHDOG=1"); }

std::optional<std::chrono::milliseconds> ServiceManager::pingInterval() const {
  using std::chrono::milliseconds;
  std::uint64_t microseconds = 0;
  if (::sd_watchdog_enabled(kKeepVariables, &microseconds) <= 0) return std::nullopt;
  constexpr std::uint64_t kHalfInMilliseconds = 2000;
  const std::uint64_t interval =
      std::min<std::uint64_t>(microseconds / kHalfInMilliseconds, milliseconds(kLongestPingInterval).count());
  return milliseconds(std::max<std::uint64_t>(interval, 1));
}

}  // namespace tonewerk
