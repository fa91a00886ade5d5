// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {

// A line that the daemon has logged as an error.
struct LoggedTrouble {
  double lastAt = 0.0;  // seconds since 1970
  std::string category;
  std::string text;
  std::uint64_t times = 1;            // how often it came
  std::optional<std::uint32_t> user;  // whose request caused it; none for the daemon's own
};

// How a network endpoint stands.
struct EndpointStatus {
  std::string url;
  std::uint64_t waiting = 0;   // records that are not sent yet
  std::uint64_t dropped = 0;   // records that were lost since the daemon's start
  std::chrono::seconds hangs;  // how long none has left while one waits; 0 when they move
  std::string problem;         // why the last sending failed; empty after one that did not
};

// What the daemon says of itself to people. The functions may be called on any thread.
struct DaemonStatus {
  std::string version;
  std::int32_t processIdentifier = 0;
  std::uint32_t user = 0;
  double startedAt = 0.0;                                 // seconds since 1970, by the clock of then
  std::chrono::steady_clock::time_point startedAtSteady;  // does not jump
  std::string runtimeDirectory;
  std::string stateDirectory;
  std::string configurationDirectory;
  std::function<std::vector<EndpointStatus>()> endpoints;
  std::function<std::vector<LoggedTrouble>()> troubles;  // newest first
};

}  // namespace tonewerk
