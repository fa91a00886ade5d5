// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <map>
#include <set>
#include <string_view>

#include "bridges/pipewire/drivers/CycleStatistics.h"
#include "bridges/pipewire/graph/DriverNode.h"
#include "values/ValueMap.h"

namespace tonewerk {

// The statistics of a graph's drivers, as channels of the reporting daemon's drivers: sinks under the group
// "Tx", sources under "Rx", each under a subgroup of its name; and under no subgroup those of all sinks and
// of all sources. These are there before any driver is: whoever subscribes to channels once, early, then
// still hears of a headset that comes later.
//
// A driver that left keeps its numbers, so that it goes on counting when it comes back, until its room is
// needed.
class DriverStatistics {
 public:
  // What comes past them counts under its direction only.
  static constexpr std::size_t kMaxDrivers = 32;

  // Which drivers there are now. One that is new gets its channels.
  void setPresent(const std::set<DriverNode>& drivers);
  void count(const DriverNode& driver, const ProfiledCycle& cycle, const CycleXruns& xruns);

  // A published file's whole content.
  ValueMap channelsOf(std::string_view driverName) const;

 private:
  [[nodiscard]] bool makeRoom(const std::set<DriverNode>& present);

  std::array<CycleStatistics, 2> totals_;  // by direction
  std::map<DriverNode, CycleStatistics> drivers_;
};

}  // namespace tonewerk
