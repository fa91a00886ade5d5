// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <set>

#include "bridges/pipewire/graph/ProfiledCycle.h"

namespace tonewerk {

// What a cycle adds to the xruns of its nodes.
struct CycleXruns {
  bool isRepeat = false;     // the cycle was told before
  std::uint32_t driver = 0;  // the driver's own
  // Those of followers that have any: cycles that they did not finish in time.
  std::map<std::uint32_t, std::uint32_t> followers;
};

// Finds out, cycle by cycle, whose xrun count rises.
//
// A driver counts its xruns itself. Followers do in later releases of the graph only; else each cycle that
// one leaves unfinished is an xrun, from its first finished one on: a node that is being started is not late
// yet. What a node counted before it was first seen is not news; a count that went back began anew.
class XrunWatch {
 public:
  static constexpr std::size_t kMaxDrivers = 64;

  CycleXruns judge(const ProfiledCycle& cycle);
  // Forgets all other drivers.
  void retain(const std::set<std::uint32_t>& drivers);

 private:
  struct Follower {
    bool hasEverFinished = false;
    std::optional<std::uint32_t> xruns;
  };
  // As of its latest cycle; a follower that is not in a cycle is forgotten.
  struct Driver {
    std::uint32_t xruns = 0;
    std::uint64_t position = 0;
    bool isUnfinished = false;
    std::map<std::uint32_t, Follower> followers;
  };

  std::map<std::uint32_t, Driver> drivers_;
};

}  // namespace tonewerk
