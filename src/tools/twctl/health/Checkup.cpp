// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/Checkup.h"

#include <sys/stat.h>

#include "platform/linux/directories/SocketPaths.h"
#include "protocol/WatchKeys.h"

namespace tonewerk {
namespace {

constexpr const char* kSystemUser = "tonewerk";

}  // namespace

uid_t Checkup::daemonUser() const {
  if (daemon.daemon.contains(kWatchKeyUser)) return static_cast<uid_t>(daemon.daemon.integer(kWatchKeyUser));
  if (isSystemWide) return around.userNumber(kSystemUser).value_or(0);
  // A daemon that the caller may not ask has made its socket.
  struct stat status {};
  const bool isThere = stat(socketPathOf(directories).c_str(), &status) == 0;
  return isThere ? status.st_uid : around.user;
}

std::string Checkup::systemctl() const { return isSystemWide ? "sudo systemctl" : "systemctl --user"; }

std::string Checkup::restart() const {
  if (daemon.daemon.contains(kWatchKeyState) && daemonMode(daemon.daemon) == "private")
    return "twctl kill, and start twreportingd again with its variables";
  return systemctl() + " restart twreportingd.service";
}

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
