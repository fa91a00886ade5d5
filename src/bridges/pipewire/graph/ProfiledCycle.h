// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <vector>

namespace tonewerk {

// How far a node had come with a cycle, and when. All times are monotonic. A time that belongs to an earlier
// cycle is left out. A node that is still busy with an earlier cycle when it is signalled may finish both at
// once: it then finished this one, but did not wake in it.
struct NodeTimes {
  enum Stage : std::uint8_t {
    kWaiting,    // for the nodes before it
    kSignalled,  // but it has not woken
    kAwake,      // and computes
    kFinished
  };

  Stage stage = kWaiting;
  std::optional<std::chrono::nanoseconds> signal;
  std::optional<std::chrono::nanoseconds> awake;
  std::optional<std::chrono::nanoseconds> finish;

  friend bool operator==(const NodeTimes&, const NodeTimes&) = default;
};

// Describes a node that a driver woke in a cycle.
struct ProfiledFollower {
  std::uint32_t node = 0;
  bool hasFinished = false;            // before the cycle's end
  std::optional<std::uint32_t> xruns;  // since the node was made; none where PipeWire does not count them
  NodeTimes times{};

  friend bool operator==(const ProfiledFollower&, const ProfiledFollower&) = default;
};

// Describes one cycle of a driver, as the graph's profiler reported it. A cycle that its followers did not
// finish is reported again, with the same position, when the next one begins. The first of the two reports
// has the begin of the cycle before it, and its own begin in place of the driver's finish.
struct ProfiledCycle {
  std::uint32_t driver = 0;            // number of its node
  std::uint64_t number = 0;            // how many cycles of the driver the profiler counted before
  std::uint32_t xruns = 0;             // of the driver since it was made
  std::uint64_t position = 0;          // of the driver's clock, in frames
  std::uint32_t frames = 0;            // length of the cycle
  std::chrono::nanoseconds period{0};  // duration of these frames
  std::uint32_t hertz = 0;             // frames in a second
  // Monotonic time; none for a cycle that had begun before the profiler was started.
  std::optional<std::chrono::nanoseconds> begin;
  std::optional<std::chrono::nanoseconds> processing;  // from the begin until the driver had finished
  std::vector<ProfiledFollower> followers;
};

}  // namespace tonewerk
