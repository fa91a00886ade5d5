// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <set>

#include "bridges/pipewire/graph/ProfiledCycle.h"

namespace tonewerk {

// Says how many xruns of its nodes a cycle adds.
struct CycleXruns {
  bool isRepeat = false;     // the profiler has reported the cycle before
  std::uint32_t driver = 0;  // xruns of the driver itself
  // Xruns by follower, without those that have none. An xrun is a cycle not finished in time.
  std::map<std::uint32_t, std::uint32_t> followers;
};

// Finds out, cycle by cycle, which nodes have new xruns.
//
// A driver counts its xruns itself. A follower does so only in later releases of PipeWire. Without its count,
// each cycle that it leaves unfinished is an xrun, but only after it has finished one: a node that is being
// started is not late. Xruns from before a node was first seen are not counted. A count that went back
// started again from 0.
class XrunWatch {
 public:
  static constexpr std::size_t kMaxDrivers = 64;

  CycleXruns update(const ProfiledCycle& cycle);
  // Forgets all drivers but these.
  void retain(const std::set<std::uint32_t>& drivers);

 private:
  struct Follower {
    bool hasEverFinished = false;
    std::optional<std::uint32_t> xruns;
  };
  // A driver's state in its latest cycle, which holds the followers of that cycle only.
  struct Driver {
    std::uint32_t xruns = 0;
    std::uint64_t position = 0;
    bool isUnfinished = false;
    std::map<std::uint32_t, Follower> followers;
  };

  std::map<std::uint32_t, Driver> drivers_;
};

}  // namespace tonewerk
