// SPDX-License-Identifier: Apache-2.0
//
// The checks of the socket, the daemon behind it, its units and the bridge.
#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <map>
#include <sstream>
#include <string_view>
#include <sys/stat.h>
#include <utility>

#include "protocol/WatchKeys.h"
#include "tools/twctl/health/Checkup.h"
#include "tools/twctl/health/ShellWord.h"
#include "tools/twctl/show/UserName.h"

namespace tonewerk {
namespace {

constexpr const char* kSocketUnit = "twreportingd.socket";
constexpr const char* kServiceUnit = "twreportingd.service";
// A socket of root's own daemon is no reason to become root.
constexpr std::string_view kRootGroup = "root";
constexpr const char* kBridgeUnit = "tw-pipewire.service";

// Returns a variable that decides where clients look; none when none is set.
std::optional<std::string> leadingVariable(const Surroundings& around) {
  for (const char* name : {"TONEWERK_REPORTING_SOCKET", "RUNTIME_DIRECTORY"}) {
    if (!around.environment(name).value_or("").empty()) return name;
  }
  return std::nullopt;
}

void addForbidden(const Checkup& checkup, const std::string& path, Findings& findings) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) return findings.couldNotSee(path + ": " + std::strerror(errno));
  const Surroundings& around = checkup.around;
  const std::string group = around.groupName(status.st_gid);
  const bool isInGroup =
      std::find(around.groups.begin(), around.groups.end(), status.st_gid) != around.groups.end();
  if (!isInGroup && around.isMember(status.st_gid)) {
    findings.add("old-login", path + ": you are in the group " + group + ", but this login is older",
                 "newgrp " + group + ", or log in again");
  } else if (!isInGroup && (status.st_mode & S_IWGRP) != 0 && group != kRootGroup) {
    findings.add("forbidden-socket", path + " is for the group " + group + ", and you are not in it",
                 "sudo usermod -aG " + group + " $USER, and log in again");
  } else {
    findings.add("forbidden-socket", path + " is for " + userName(status.st_uid) + " only",
                 "start a daemon of your own, or use the system's: twctl --system");
  }
}

// The properties of units, by unit, as `systemctl show` prints them: blocks of lines, one for each unit.
using Units = std::map<std::string, std::map<std::string, std::string>>;

Units parseUnits(const std::string& text) {
  Units units;
  std::map<std::string, std::string> block;
  std::istringstream lines(text + "\n\n");
  for (std::string line; std::getline(lines, line);) {
    if (const std::size_t sign = line.find('='); sign != std::string::npos) {
      block[line.substr(0, sign)] = line.substr(sign + 1);
    } else if (!block.empty()) {
      const std::string name = block["Id"];
      units[name] = std::exchange(block, {});
    }
  }
  units.erase("");
  return units;
}

std::optional<Units> showUnits(const Checkup& checkup, bool isSystem, const std::vector<std::string>& names) {
  std::vector<std::string> arguments{"show", "--property=Id,LoadState,ActiveState,Result"};
  if (!isSystem) arguments.insert(arguments.begin(), "--user");
  arguments.insert(arguments.end(), names.begin(), names.end());
  const std::optional<std::string> text = checkup.around.systemctl(arguments);
  return text ? std::optional(parseUnits(*text)) : std::nullopt;
}

std::string startAgain(const Checkup& checkup, const std::string& unit) {
  const std::string systemctl = checkup.systemctl();
  return systemctl + " reset-failed " + unit + "; " + systemctl + " start " + unit;
}

void addFailed(const Checkup& checkup, const Units& units, Findings& findings) {
  for (const auto& [name, properties] : units) {
    const auto state = properties.find("ActiveState");
    if (state == properties.end() || state->second != "failed") continue;
    const auto result = properties.find("Result");
    findings.add("failed-unit",
                 name + " has failed" + (result == properties.end() ? "" : " (" + result->second + ")"),
                 startAgain(checkup, name));
  }
}

bool isStopped(const Units& units, const std::string& name) {
  const auto unit = units.find(name);
  if (unit == units.end()) return false;
  const auto property = [&](const std::string& key) {
    const auto found = unit->second.find(key);
    return found == unit->second.end() ? std::string() : found->second;
  };
  return property("LoadState") == "loaded" && property("ActiveState") == "inactive";
}

}  // namespace

void checkSocket(const Checkup& checkup, Findings& findings) {
  for (const std::string& path : checkup.sockets) {
    struct stat status {};
    if (stat(path.c_str(), &status) == 0 && (status.st_mode & S_IWOTH) != 0)
      findings.add("open-socket", path + " can be used by every user", "chmod o-rwx " + shellWord(path));
  }
  if (checkup.daemon.isConnected) return;
  const std::optional<std::string> variable = leadingVariable(checkup.around);
  bool isThere = false;
  for (const std::string& path : checkup.sockets) {
    const std::error_code error = checkup.around.connect(path);
    if (error == std::errc::no_such_file_or_directory || error == std::errc::not_a_directory) continue;
    isThere = true;
    if (error == std::errc::permission_denied) {
      addForbidden(checkup, path, findings);
    } else {
      findings.add("dead-socket", path + ": " + error.message(),
                   checkup.systemctl() + " restart " + kSocketUnit + ", or start twreportingd");
    }
  }
  if (!isThere) {
    std::string tried;
    for (const std::string& path : checkup.sockets) tried += (tried.empty() ? "" : ", ") + path;
    findings.add("no-daemon", "there is no socket at " + tried,
                 checkup.systemctl() + " start " + kSocketUnit + ", or start twreportingd");
  }
  if (variable && !checkup.isSystemWide)
    findings.add("other-socket", *variable + " is set to " + *checkup.around.environment(*variable),
                 "unset " + *variable);
}

void checkDaemon(const Checkup& checkup, Findings& findings) {
  const DaemonReport& daemon = checkup.daemon;
  if (!daemon.isConnected) return;
  const std::string restart = checkup.restart();
  if (!daemon.answers) return findings.add("silent-daemon", daemon.problem, restart);
  const std::string version = daemon.daemon.text(kWatchKeyVersion);
  if (version != checkup.ownVersion)
    findings.add("other-version",
                 "the daemon has the version " + (version.empty() ? "of an older release" : version) +
                     ", twctl " + checkup.ownVersion,
                 restart);
}

void checkUnits(const Checkup& checkup, Findings& findings) {
  const std::optional<Units> units = showUnits(checkup, checkup.isSystemWide, {kSocketUnit, kServiceUnit});
  if (!units) return findings.couldNotSee("units: systemctl gives no answer");
  addFailed(checkup, *units, findings);
  if (isStopped(*units, kSocketUnit) && !checkup.daemon.isConnected)
    findings.add("stopped-socket", std::string(kSocketUnit) + " is installed, but does not run",
                 checkup.systemctl() + " enable --now " + kSocketUnit);
}

// The bridge is a unit of users.
void checkBridge(const Checkup& checkup, Findings& findings) {
  const std::vector<BridgeProcess> bridges = checkup.around.bridges();
  const bool runs = std::any_of(bridges.begin(), bridges.end(), [&](const BridgeProcess& bridge) {
    return bridge.user == checkup.around.user;
  });
  if (!runs) {
    if (checkup.isSystemWide) return;
    const std::optional<Units> units = showUnits(checkup, false, {kBridgeUnit});
    if (!units) return;
    addFailed(checkup, *units, findings);
    if (isStopped(*units, kBridgeUnit))
      findings.add("no-bridge", std::string(kBridgeUnit) + " is installed, but does not run");
    return;
  }
  std::string directory = checkup.around.environment("PIPEWIRE_RUNTIME_DIR").value_or("");
  if (directory.empty()) directory = checkup.around.environment("XDG_RUNTIME_DIR").value_or("");
  const std::string remote = checkup.around.environment("PIPEWIRE_REMOTE").value_or("pipewire-0");
  if (directory.empty() && !remote.starts_with('/'))
    return findings.couldNotSee("PipeWire: XDG_RUNTIME_DIR is not set, so its socket is not known");
  const std::string path = remote.starts_with('/') ? remote : directory + "/" + remote;
  std::error_code error;
  if (!std::filesystem::exists(path, error) && !error)
    findings.add("no-pipewire", "tw-pipewire runs, but there is no " + path);
}

}  // namespace tonewerk
