// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <map>
#include <set>
#include <string_view>
#include <vector>

#include "bridges/pipewire/drivers/CycleStatistics.h"
#include "bridges/pipewire/drivers/NodeChannels.h"
#include "bridges/pipewire/graph/DriverNode.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Holds the statistics of a graph's drivers and describes them as driver channels of the reporting daemon:
// sinks in the group "Tx", sources in the group "Rx", each driver in a subgroup of its name. The channels
// without a subgroup hold the totals of all sinks and of all sources. They exist before any driver does, so a
// program that subscribes once at its start still counts a headset that is connected later.
//
// A driver that has left keeps its numbers, and continues from them when it comes back, until a new driver
// needs its place.
class DriverStatistics {
 public:
  // Further drivers are counted in their direction's totals only.
  static constexpr std::size_t kMaxDrivers = 32;

  // Sets the drivers that are present now. A new one gets its channels.
  void setPresent(const std::set<DriverNode>& drivers);
  void count(const DriverNode& driver, const ProfiledCycle& cycle, const CycleXruns& xruns);

  // The whole content of a published file, with the channels of these nodes.
  ValueMap channelsOf(std::string_view driverName, const std::vector<NodeLoad>& nodes = {}) const;

 private:
  [[nodiscard]] bool makeRoom(const std::set<DriverNode>& present);

  std::array<CycleStatistics, 2> totals_;  // by direction
  std::map<DriverNode, CycleStatistics> drivers_;
};

}  // namespace tonewerk
