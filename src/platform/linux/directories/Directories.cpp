// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/directories/Directories.h"

#include <algorithm>
#include <cstdlib>
#include <pwd.h>
#include <unistd.h>

namespace tonewerk {
namespace {

constexpr char kName[] = "/tonewerk";

std::optional<std::string> setVariable(const Directories::Environment& environment, const char* name) {
  std::optional<std::string> value = environment(name);
  return value && !value->empty() ? value : std::nullopt;
}

// From the service manager's variable, which holds one directory or several separated by colons. The first
// one is used.
std::optional<std::string> serviceDirectory(const Directories::Environment& environment, const char* name) {
  std::optional<std::string> value = setVariable(environment, name);
  if (!value) return std::nullopt;
  value->resize(std::min(value->find(':'), value->size()));
  while (value->size() > 1 && value->back() == '/') value->pop_back();
  return value->empty() ? std::nullopt : value;
}

// Below a base directory that the user chose. Relative paths are ignored, as is usual for these variables.
std::optional<std::string> userDirectory(const Directories::Environment& environment, const char* name) {
  const std::optional<std::string> base = setVariable(environment, name);
  if (!base || base->front() != '/') return std::nullopt;
  return *base + kName;
}

std::string homeDirectory() {
  const passwd* entry = getpwuid(geteuid());
  return entry == nullptr || entry->pw_dir == nullptr ? std::string() : entry->pw_dir;
}

std::optional<std::string> processVariable(const std::string& name) {
  if (const char* value = std::getenv(name.c_str())) return value;
  if (name == "HOME") return homeDirectory();
  return std::nullopt;
}

}  // namespace

Directories Directories::fromEnvironment() { return from(processVariable, geteuid()); }

Directories Directories::from(const Environment& environment, uid_t user) {
  const bool isRoot = user == 0;
  const std::string home = setVariable(environment, "HOME").value_or("");
  // The service manager's variable, else the user's base directory, else the given default.
  const auto choose = [&](const char* service, const char* base, const std::string& fallback) {
    if (const auto directory = serviceDirectory(environment, service)) return *directory;
    if (const auto directory = userDirectory(environment, base)) return *directory;
    return fallback;
  };

  const Directories defaults = system();
  Directories chosen;
  chosen.runtime = choose("RUNTIME_DIRECTORY", "XDG_RUNTIME_DIR",
                          isRoot ? defaults.runtime : "/run/user/" + std::to_string(user) + kName);
  chosen.state =
      choose("STATE_DIRECTORY", "XDG_STATE_HOME", isRoot ? defaults.state : home + "/.local/state" + kName);
  chosen.configuration = choose("CONFIGURATION_DIRECTORY", "XDG_CONFIG_HOME",
                                isRoot ? defaults.configuration : home + "/.config" + kName);
  // When root's state directory is not the default, the logs go below it and not into the system's directory.
  const std::string defaultLogs =
      isRoot && chosen.state == defaults.state ? defaults.logs : chosen.state + "/logs";
  chosen.logs = serviceDirectory(environment, "LOGS_DIRECTORY").value_or(defaultLogs);
  return chosen;
}

Directories Directories::system() {
  return {"/run/tonewerk", "/var/lib/tonewerk", "/var/log/tonewerk", "/etc/tonewerk"};
}

}  // namespace tonewerk
