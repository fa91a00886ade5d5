// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/DriverReports.h"

#include <algorithm>
#include <chrono>
#include <map>
#include <set>

#include "bridges/pipewire/sessions/Overload.h"

namespace tonewerk {

namespace {

// Profiles arrive about a second late. A cycle older than this comes from a clock that is not the system's
// monotonic one.
constexpr std::chrono::nanoseconds kMaxAge = std::chrono::seconds(10);

void addTo(std::map<std::uint32_t, Overload>& overloads, std::uint32_t stream, const Overload& overload) {
  const auto [entry, isNew] = overloads.try_emplace(stream, overload);
  if (!isNew) entry->second.add(overload);
}

std::uint32_t xrunsOf(const CycleXruns& xruns, std::uint32_t follower) {
  const auto own = xruns.followers.find(follower);
  return xruns.driver + (own == xruns.followers.end() ? 0 : own->second);
}

}  // namespace

DriverReports::DriverReports(GraphModel& model, DriverStatistics& statistics, StreamReports& streams,
                             ChannelPublisher& publisher, const Clock& clock)
    : model_(model), statistics_(statistics), streams_(streams), publisher_(publisher), clock_(clock) {
  model_.watchDrivers([this] { driversChanged(); });
}

DriverReports::~DriverReports() {
  model_.watchDrivers([] {});
}

void DriverReports::profiled(const std::vector<ProfiledCycle>& cycles) {
  std::map<std::uint32_t, Overload> overloads;
  for (const ProfiledCycle& cycle : cycles) {
    const CycleXruns xruns = xruns_.update(cycle);
    if (const std::optional<DriverNode> driver = model_.driverAt(cycle.driver)) {
      statistics_.count(*driver, cycle, xruns);
    }
    if (xruns.driver == 0 && xruns.followers.empty()) continue;
    for (const ProfiledFollower& follower : cycle.followers) {
      const std::uint32_t count = xrunsOf(xruns, follower.node);
      if (count == 0) continue;
      addTo(overloads, follower.node, {wallTimeOf(cycle), cycle.frames, cycle.number, count});
    }
  }
  for (const auto& [stream, overload] : overloads) streams_.streamOverloaded(stream, overload);
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
  statistics_.setPresent(present);
  publisher_.changed();
}

double DriverReports::wallTimeOf(const ProfiledCycle& cycle) const {
  const std::chrono::nanoseconds now = clock_.monotonic();
  const std::chrono::nanoseconds age = now - cycle.begin.value_or(now);
  if (age < std::chrono::nanoseconds(0) || age > kMaxAge) return clock_.now();
  return clock_.now() - std::chrono::duration<double>(age).count();
}

}  // namespace tonewerk
