// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "bridges/pipewire/drivers/ChannelPublisher.h"
#include "bridges/pipewire/drivers/DriverStatistics.h"
#include "bridges/pipewire/drivers/GlitchReports.h"
#include "bridges/pipewire/drivers/XrunWatch.h"
#include "bridges/pipewire/graph/GraphModel.h"
#include "bridges/pipewire/graph/ProfileObserver.h"

namespace tonewerk {

// Adds up the profiler's data on the graph's drivers, keeps the published channels up to date, and has
// overloads judged and reported.
//
// Used on the loop's thread only.
class DriverReports final : public ProfileObserver {
 public:
  // All arguments outlive this object. It watches the drivers of `model` until it is destroyed.
  DriverReports(GraphModel& model, DriverStatistics& statistics, GlitchReports& glitches,
                ChannelPublisher& publisher);
  DriverReports(const DriverReports&) = delete;
  DriverReports& operator=(const DriverReports&) = delete;
  ~DriverReports() override;

  void profiled(const std::vector<ProfiledCycle>& cycles) override;

 private:
  void driversChanged();

  GraphModel& model_;
  DriverStatistics& statistics_;
  GlitchReports& glitches_;
  ChannelPublisher& publisher_;
  XrunWatch xruns_;
};

}  // namespace tonewerk
