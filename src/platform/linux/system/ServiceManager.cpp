// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/ServiceManager.h"

#include <algorithm>
#include <cstdint>
#include <ctime>
#include <string>
#include <systemd/sd-daemon.h>

namespace tonewerk {
namespace {

// The variables stay for later messages. Programs that the daemon runs inherit them; the manager takes
// messages of the main process alone.
constexpr int kKeepVariables = 0;

void tell(const std::string& message) { ::sd_notify(kKeepVariables, message.c_str()); }

}  // namespace

void ServiceManager::tellReady(const std::string& status) const { tell("READY=1\nSTATUS=" + status); }

// The manager tells by the time which READY=1 belongs to this.
void ServiceManager::tellReloading() const {
  timespec now{};
  ::clock_gettime(CLOCK_MONOTONIC, &now);
  const std::int64_t microseconds = now.tv_sec * 1'000'000LL + now.tv_nsec / 1'000;
  tell("RELOADING=1\nMONOTONIC_USEC=" + std::to_string(microseconds));
}

// A ping that is on its way when the manager ends us would start its watch anew, which nobody feeds any more.
// A time-out of 0 ends that watch.
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
