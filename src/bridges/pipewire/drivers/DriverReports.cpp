// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/DriverReports.h"

#include <set>

namespace tonewerk {

DriverReports::DriverReports(GraphModel& model, DriverStatistics& statistics, GlitchReports& glitches,
                             ChannelPublisher& publisher)
    : model_(model), statistics_(statistics), glitches_(glitches), publisher_(publisher) {
  model_.watchDrivers([this] { driversChanged(); });
}

DriverReports::~DriverReports() {
  model_.watchDrivers([] {});
}

void DriverReports::profiled(const std::vector<ProfiledCycle>& cycles) {
  for (const ProfiledCycle& cycle : cycles) {
    const CycleXruns xruns = xruns_.update(cycle);
    if (const std::optional<DriverNode> driver = model_.driverAt(cycle.driver)) {
      statistics_.count(*driver, cycle, xruns);
    }
  }
  glitches_.profiled(cycles);
  publisher_.changed();
}

void DriverReports::driversChanged() {
  std::set<DriverNode> present;
  std::set<std::uint32_t> nodes;
  for (const auto& [node, driver] : model_.drivers()) {
    present.insert(driver);
    nodes.insert(node);
  }
  // The graph reuses the numbers of nodes that have left.
  xruns_.retain(nodes);
  glitches_.retain(nodes);
  statistics_.setPresent(present);
  publisher_.changed();
}

}  // namespace tonewerk
