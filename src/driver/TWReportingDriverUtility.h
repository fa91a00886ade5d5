// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "driver/TWReportingIOChannelSubscription.h"
#include "platform/Chanmeter.h"
#include "values/ValueMap.h"

namespace tonewerk {

class TWReportingSession;

// Samples the channels of a fixed set of audio and haptic drivers and reports what changed between two
// samples: counters, histograms and the residencies of states. Each channel becomes one entry of a flat map.
//
//   TWReportingDriverUtility utility;                      subscribes, once in the process
//   auto before = utility.getSnapShot();                   when a session starts
//   utility.sendDriverLogsForSession(session, &before);    when it stops
//
// Any thread may use it, because nothing changes after the constructor. When the channel library refuses a
// request, its error code is logged and that driver is left out. Drivers that appear later are not sampled.
class TWReportingDriverUtility {
 public:
  // Samples by the driver's description. Drivers that could not be sampled have no entry.
  using Snapshot = std::map<std::string, Chanmeter::Samples>;
  // Values by composed key: integers for counters, texts for histograms and states.
  using DriverStatsMap = ValueMap;

  // Subscribes through the current context's channel library.
  TWReportingDriverUtility();
  TWReportingDriverUtility(const TWReportingDriverUtility&) = delete;
  TWReportingDriverUtility& operator=(const TWReportingDriverUtility&) = delete;

  const std::vector<TWReportingIOChannelSubscription>& ioChannelSubscriptions() const {
    return ioChannelSubscriptions_;
  }

  Snapshot getSnapShot() const;
  // What a snapshot holds of its own: lists of references to records. The records belong to their sources.
  static std::uint64_t ownBytesOf(const Snapshot& snapshot);

  // Sends what changed since `driverSnapShot`: one message for counters, then one for histograms, then one
  // for states, and none for a kind without entries. If either argument is null, it takes samples and sends
  // nothing.
  void sendDriverLogsForSession(TWReportingSession* session, const Snapshot* driverSnapShot) const;

  // Each of the following three adds at most one entry.
  //
  // A change below 1 adds no entry.
  static void processSimpleData(const ChanmeterSample& sample, DriverStatsMap& driverStats);
  // Adds a text like "count=4,lower=0,upper=30,min=1,max=29,unit=us::10-20:5;20-30:1", which lists only the
  // buckets with hits. Without such a bucket it adds no entry. `lower` is at most 0, `upper` at least 0.
  static void processHistogramData(const ChanmeterSample& sample, DriverStatsMap& driverStats);
  // Adds a text of one piece like "name:on,transition:1,residency:200,duty_cycle:0.500000;" for each state
  // with a residency. Without such a state it adds an empty text.
  static void processStateData(const ChanmeterSample& sample, DriverStatsMap& driverStats);

  // Joins driver, group, subgroup, type and channel with underscores, as in
  // "AmpDrv_Speaker_Simple_RailVolts", and leaves out names that the sample does not have. Blanks and
  // underscores are removed from the names, and the driver's name ends before its first "<".
  static std::string getDriverStatsKey(const ChanmeterSample& sample, std::string_view type);

 private:
  struct Stats;

  void subscribe(const TWReportingDriver& driver);
  void collectChanges(const TWReportingIOChannelSubscription& source, const Chanmeter::Reading& reading,
                      const Snapshot* driverSnapShot, Stats& stats) const;
  static void process(const ChanmeterSample& sample, Stats& stats);

  Chanmeter& chanmeter_;
  std::vector<TWReportingIOChannelSubscription> ioChannelSubscriptions_;
};

}  // namespace tonewerk
