// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/Checkup.h"

#include "protocol/WatchKeys.h"

namespace tonewerk {
namespace {

constexpr const char* kSystemUser = "tonewerk";

}  // namespace

uid_t Checkup::daemonUser() const {
  if (daemon.daemon.contains(kWatchKeyUser)) return static_cast<uid_t>(daemon.daemon.integer(kWatchKeyUser));
  return isSystemWide ? around.userNumber(kSystemUser).value_or(0) : around.user;
}

std::string Checkup::systemctl() const { return isSystemWide ? "sudo systemctl" : "systemctl --user"; }

std::string Checkup::twctl() const { return isSystemWide ? "sudo twctl --system" : "twctl"; }

Findings checkAll(const Checkup& checkup) {
  Findings findings;
  for (const auto check :
       {checkSocket, checkDaemon, checkDirectories, checkUnits, checkBridge, checkPreferences, checkFacts,
        checkEndpoints, checkClock, checkStore, checkReports})
    check(checkup, findings);
  return findings;
}

}  // namespace tonewerk
