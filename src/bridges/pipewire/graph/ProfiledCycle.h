// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <vector>

namespace tonewerk {

// Describes a node that a driver woke in a cycle.
struct ProfiledFollower {
  std::uint32_t node = 0;
  bool hasFinished = false;            // before the cycle's end
  std::optional<std::uint32_t> xruns;  // since the node was made; none where PipeWire does not count them

  friend bool operator==(const ProfiledFollower&, const ProfiledFollower&) = default;
};

// Describes one cycle of a driver, as the graph's profiler reported it. A cycle that its followers did not
// finish is reported again, with the same position, when the next one begins.
struct ProfiledCycle {
  std::uint32_t driver = 0;            // number of its node
  std::uint64_t number = 0;            // how many cycles of the driver the profiler counted before
  std::uint32_t xruns = 0;             // of the driver since it was made
  std::uint64_t position = 0;          // of the driver's clock, in frames
  std::uint32_t frames = 0;            // length of the cycle
  std::chrono::nanoseconds period{0};  // duration of these frames
  // Monotonic time; none for a cycle that had begun before the profiler was started.
  std::optional<std::chrono::nanoseconds> begin;
  std::optional<std::chrono::nanoseconds> processing;  // from the begin until the driver had finished
  std::vector<ProfiledFollower> followers;
};

}  // namespace tonewerk
