// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "bridges/pipewire/drivers/ChannelPublisher.h"
#include "bridges/pipewire/drivers/DriverStatistics.h"
#include "bridges/pipewire/drivers/XrunWatch.h"
#include "bridges/pipewire/graph/GraphModel.h"
#include "bridges/pipewire/graph/ProfileObserver.h"
#include "bridges/pipewire/sessions/StreamReports.h"
#include "platform/Clock.h"

namespace tonewerk {

// Adds up the profiler's data on the graph's drivers, keeps the published channels up to date, and reports
// overloads to the streams. A stream gets its own overloads and those of the driver that serves it.
//
// Used on the loop's thread only.
class DriverReports final : public ProfileObserver {
 public:
  // All arguments outlive this object. It watches the drivers of `model` until it is destroyed.
  DriverReports(GraphModel& model, DriverStatistics& statistics, StreamReports& streams,
                ChannelPublisher& publisher, const Clock& clock);
  DriverReports(const DriverReports&) = delete;
  DriverReports& operator=(const DriverReports&) = delete;
  ~DriverReports() override;

  void profiled(const std::vector<ProfiledCycle>& cycles) override;

 private:
  void driversChanged();
  double wallTimeOf(const ProfiledCycle& cycle) const;

  GraphModel& model_;
  DriverStatistics& statistics_;
  StreamReports& streams_;
  ChannelPublisher& publisher_;
  const Clock& clock_;
  XrunWatch xruns_;
};

}  // namespace tonewerk
