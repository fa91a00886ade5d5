// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/Tool.h"
#include "values/Value.h"

namespace tonewerk {

// What a daemon says of itself, or why none does.
struct DaemonReport {
  bool answers = false;
  std::string problem;  // why it does not answer
  // A daemon listens, but did not answer, or with an error.
  bool isConnected = false;
  // A daemon listens, but did not answer at all.
  bool isSilent = false;

  ValueMap daemon;  // empty from a daemon that is too old to say it
  ValueArray accounts;
  std::int64_t users = 0;  // how many accounts there are
  // For trusted users only; none for others.
  std::optional<ValueArray> sinks;
  std::optional<ValueArray> endpoints;
  std::optional<ValueArray> troubles;
  std::optional<ValueArray> sessions;

  // Its state and configuration directory, or else those of the tool.
  Directories directoriesOr(const Directories& own) const;
};

// Asks the daemon that the tool's socket paths find. Waits at most 10 s for each of two
// answers, and 1 s for the connection's end, and prints nothing.
[[nodiscard]] DaemonReport askDaemon(const Tool& tool);

// Reads an answer to watch.accounts.
[[nodiscard]] DaemonReport reportOf(const ValueMap& listing);

// Returns whose directories a daemon has that says "user" and "state": "system", "user" (those of its user,
// as without variables), or "private".
std::string daemonMode(const ValueMap& daemon);

// Returns the maps in an array, and leaves out what is no map.
std::vector<ValueMap> mapsIn(const ValueArray& array);

}  // namespace tonewerk
