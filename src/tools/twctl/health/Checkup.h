// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <sys/types.h>
#include <system_error>
#include <vector>

#include "platform/linux/directories/Directories.h"
#include "tools/twctl/health/BridgeProcesses.h"
#include "tools/twctl/health/DaemonReport.h"
#include "tools/twctl/health/Findings.h"
#include "tools/twctl/health/StoreFacts.h"

namespace tonewerk {

// What the checks ask of the system beside files. Tests put functions of their own in.
struct Surroundings {
  struct Space {
    std::uint64_t freeBytes = 0;
  };

  uid_t user = 0;
  std::vector<gid_t> groups;  // those of this process
  double now = 0.0;           // seconds since 1970
  Directories::Environment environment;
  // The name of a group; whether the user's entry in the system's list of groups has it, since when ever.
  std::function<std::string(gid_t)> groupName;
  std::function<bool(gid_t)> isMember;
  // The number of a user; none when there is no such user.
  std::function<std::optional<uid_t>(const std::string& name)> userNumber;
  std::function<std::error_code(const std::string& path)> connect;
  // Why no TCP connection can be made; empty when one can.
  std::function<std::string(const std::string& host, const std::string& port)> reach;
  std::function<std::optional<Space>(const std::string& path)> space;
  // Runs systemctl with these arguments and returns its output, which is empty where systemd does not run;
  // none when it gives no answer.
  std::function<std::optional<std::string>(const std::vector<std::string>& arguments)> systemctl;
  std::function<std::vector<BridgeProcess>()> bridges;
};

// What is checked, and by whom.
struct Checkup {
  Directories directories;
  std::vector<std::string> sockets;
  bool isSystemWide = false;  // the system's daemon, and not a user's own
  std::string ownVersion;
  DaemonReport daemon;
  StoreFacts store;
  double storeMegabytes = 0.0;  // the most that the store may take
  Surroundings around;

  // The user that the daemon runs as, or should.
  uid_t daemonUser() const;
  // "systemctl --user" or "sudo systemctl", and "twctl" or "sudo twctl --system".
  std::string systemctl() const;
  // How to end the daemon and start it again. No unit has a daemon with directories of its own.
  std::string restart() const;
  std::string twctl() const;
};

// Each looks at one thing, and adds what is wrong.
void checkSocket(const Checkup& checkup, Findings& findings);
void checkDaemon(const Checkup& checkup, Findings& findings);
void checkDirectories(const Checkup& checkup, Findings& findings);
void checkUnits(const Checkup& checkup, Findings& findings);
void checkBridge(const Checkup& checkup, Findings& findings);
void checkPreferences(const Checkup& checkup, Findings& findings);
void checkFacts(const Checkup& checkup, Findings& findings);
void checkEndpoints(const Checkup& checkup, Findings& findings);
void checkClock(const Checkup& checkup, Findings& findings);
void checkStore(const Checkup& checkup, Findings& findings);
void checkReports(const Checkup& checkup, Findings& findings);

// All of them.
[[nodiscard]] Findings checkAll(const Checkup& checkup);

// Of the machine and of this process.
[[nodiscard]] Surroundings linuxSurroundings();

}  // namespace tonewerk
