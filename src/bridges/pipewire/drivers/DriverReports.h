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

// Adds up what the profiler tells of the graph's drivers, keeps the published channels in step, and tells
// streams of their overloads: a stream of its own, and every stream that a driver serves of the driver's.
//
// For the loop's thread.
class DriverReports final : public ProfileObserver {
 public:
  // All outlive this, and `model` tells of its drivers no more when this is gone.
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
