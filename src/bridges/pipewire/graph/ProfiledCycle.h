// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <vector>

namespace tonewerk {

// A node that a driver woke in a cycle.
struct ProfiledFollower {
  std::uint32_t node = 0;
  bool hasFinished = false;            // in time for the cycle's end
  std::optional<std::uint32_t> xruns;  // since the node was made, where the graph counts them

  friend bool operator==(const ProfiledFollower&, const ProfiledFollower&) = default;
};

// One cycle of a driver, as the graph's profiler saw it. A cycle that its followers did not finish is told
// again, with the same position, when the next one begins.
struct ProfiledCycle {
  std::uint32_t driver = 0;            // its node
  std::uint64_t number = 0;            // cycles of the driver that the profiler has counted before it
  std::uint32_t xruns = 0;             // of the driver, since it was made
  std::uint64_t position = 0;          // of the driver's clock, in frames
  std::uint32_t frames = 0;            // that the cycle handles
  std::chrono::nanoseconds period{0};  // the time these frames last
  // Monotonic time; none for a cycle that was already under way when the profiler began to look.
  std::optional<std::chrono::nanoseconds> begin;
  std::optional<std::chrono::nanoseconds> processing;  // from its begin until the driver was done
  std::vector<ProfiledFollower> followers;
};

}  // namespace tonewerk
