// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <span>
#include <vector>

#include "bridges/pipewire/graph/ProfiledCycle.h"

namespace tonewerk {

// One node's part of a kept cycle. Times are nanoseconds since the cycle's begin; kNever for what did not
// happen in it.
struct KeptNode {
  static constexpr std::int32_t kNever = INT32_MIN;

  std::uint32_t node = 0;
  NodeTimes::Stage stage = NodeTimes::kWaiting;
  std::int32_t signal = kNever;
  std::int32_t awake = kNever;
  std::int32_t finish = kNever;
};

struct KeptCycle {
  std::uint64_t number = 0;           // of the driver's cycles that the profiler counted
  std::uint64_t position = 0;         // of the driver's clock, in frames
  std::chrono::nanoseconds begin{0};  // monotonic
  std::chrono::nanoseconds period{0};
  std::uint32_t frames = 0;
  std::uint32_t hertz = 0;
  std::uint32_t xruns = 0;    // of the driver since it was made
  bool isUnfinished = false;  // a node had not finished when the report was made
  // The driver had finished early, without waiting for that node: one that was late in the cycle before had
  // given its answer to this one.
  bool isCutShort = false;

  std::chrono::nanoseconds end() const { return begin + period; }
};

// Keeps the last cycles of one driver. All memory is taken when it is made: kMaxCycles cycles, which together
// have kMaxParts nodes; the oldest cycles make room.
//
// A cycle that is reported twice is kept once, with the better times of the second report.
class CycleHistory {
 public:
  static constexpr std::size_t kMaxCycles = 512;
  static constexpr std::size_t kMaxParts = 8192;
  static constexpr std::size_t kMaxNodes = 256;  // in one cycle; further ones are left out

  CycleHistory();

  enum class Added { kNew, kAgain, kNothing };
  // Adds a cycle or replaces the newest one. Nothing without a time.
  Added add(const ProfiledCycle& cycle);

  std::size_t size() const { return count_; }
  // From 0, the oldest, to size() - 1.
  const KeptCycle& cycle(std::size_t index) const { return at(index).cycle; }
  std::span<const KeptNode> nodes(std::size_t index) const;
  std::optional<KeptNode> find(std::size_t index, std::uint32_t node) const;

 private:
  struct Slot {
    KeptCycle cycle;
    std::size_t first = 0;  // of its nodes in parts_
    std::size_t count = 0;
    bool isAgain = false;  // has been reported twice
  };

  const Slot& at(std::size_t index) const { return slots_[(oldest_ + index) % kMaxCycles]; }
  Slot& at(std::size_t index) { return slots_[(oldest_ + index) % kMaxCycles]; }
  void dropOldest();
  // `isLate`: the cycle is known to be unfinished.
  void keep(const ProfiledCycle& cycle, std::chrono::nanoseconds begin, bool isLate);

  std::vector<Slot> slots_;
  std::vector<KeptNode> parts_;  // the nodes of a cycle are neighbours
  std::size_t oldest_ = 0;
  std::size_t count_ = 0;
  std::size_t nextPart_ = 0;
};

}  // namespace tonewerk
