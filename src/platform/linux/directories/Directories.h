// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <sys/types.h>

namespace tonewerk {

// Names the directories of the daemon and its tools. Paths end without a slash; no directory is created here.
// docs/configuration.md describes the rules.
struct Directories {
  std::string runtime;  // the socket, notifications, published channels; gone after a restart of the device
  std::string state;    // the store, written preferences, diagnostics
  std::string logs;     // reports and traces
  std::string configuration;  // the device's preferences and facts

  // Reads an environment variable; none when it is not set.
  using Environment = std::function<std::optional<std::string>(const std::string& name)>;

  // For this process: from its environment and effective user.
  static Directories fromEnvironment();
  // A variable that is set but empty counts as not set. Without HOME in the environment, the home directory
  // is "/".
  static Directories from(const Environment& environment, uid_t user);
  // The directories of a daemon that runs as the system's service. Ignores the environment.
  static Directories system();

  friend bool operator==(const Directories&, const Directories&) = default;
};

}  // namespace tonewerk
