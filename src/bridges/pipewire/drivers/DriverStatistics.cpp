// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/DriverStatistics.h"

#include <algorithm>
#include <utility>

#include "values/Value.h"

namespace tonewerk {

namespace {

std::string_view groupOf(DriverNode::Direction direction) {
  return direction == DriverNode::kSink ? "Tx" : "Rx";
}

}  // namespace

void DriverStatistics::setPresent(const std::set<DriverNode>& drivers) {
  for (const DriverNode& driver : drivers) {
    if (drivers_.contains(driver)) continue;
    if (drivers_.size() >= kMaxDrivers && !makeRoom(drivers)) return;
    drivers_.try_emplace(driver);
  }
}

void DriverStatistics::count(const DriverNode& driver, const ProfiledCycle& cycle, const CycleXruns& xruns) {
  totals_[driver.direction].count(cycle, xruns);
  const auto found = drivers_.find(driver);
  if (found != drivers_.end()) found->second.count(cycle, xruns);
}

ValueMap DriverStatistics::channelsOf(std::string_view driverName, const std::vector<NodeLoad>& nodes) const {
  ValueArray channels;
  for (const DriverNode::Direction direction : {DriverNode::kSink, DriverNode::kSource}) {
    totals_[direction].describe(channels, groupOf(direction), {});
  }
  for (const auto& [driver, statistics] : drivers_) {
    statistics.describe(channels, groupOf(driver.direction), driver.name);
  }
  appendNodeChannels(channels, nodes);
  return {{"driver", driverName}, {"channels", std::move(channels)}};
}

bool DriverStatistics::makeRoom(const std::set<DriverNode>& present) {
  const auto gone = std::find_if(drivers_.begin(), drivers_.end(),
                                 [&](const auto& entry) { return !present.contains(entry.first); });
  if (gone == drivers_.end()) return false;
  drivers_.erase(gone);
  return true;
}

}  // namespace tonewerk
