// SPDX-License-Identifier: Apache-2.0
#pragma once

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

// Samples the counters of a fixed set of audio and haptic drivers, and reports what changed between two
// times: counters, histograms and states' residencies, each channel as one entry of a flat map.
//
//   TWReportingDriverUtility utility;                      subscribes, once for the process
//   auto before = utility.getSnapShot();                   when a session starts
//   utility.sendDriverLogsForSession(session, &before);    when it stops
//
// Any thread: nothing changes after the constructor. What the channel library refuses is logged with its code
// and left out; a driver that comes later is not seen.
class TWReportingDriverUtility {
 public:
  // By driver's description. A driver that could not be sampled is not in it.
  using Snapshot = std::map<std::string, Chanmeter::Samples>;
  // Composed keys; integers for counters, texts for histograms and states.
  using DriverStatsMap = ValueMap;

  // Subscribes through the current context's channel library.
  TWReportingDriverUtility();
  TWReportingDriverUtility(const TWReportingDriverUtility&) = delete;
  TWReportingDriverUtility& operator=(const TWReportingDriverUtility&) = delete;

  const std::vector<TWReportingIOChannelSubscription>& ioChannelSubscriptions() const {
    return ioChannelSubscriptions_;
  }

  Snapshot getSnapShot() const;

  // Sends what changed since `driverSnapShot`: counters, then histograms, then states, each in one message
  // if there are any. Null for a snapshot: samples are taken, nothing is sent. Null for a session: likewise.
  void sendDriverLogsForSession(TWReportingSession* session, const Snapshot* driverSnapShot) const;

  // Each adds at most one entry.
  //
  // A change below 1 adds none.
  static void processSimpleData(const ChanmeterSample& sample, DriverStatsMap& driverStats);
  // "count=4,lower=0,upper=30,min=1,max=29,unit=us::10-20:5;20-30:1"; the buckets with hits alone, and no
  // entry without such. `lower` is never above 0, `upper` never below.
  static void processHistogramData(const ChanmeterSample& sample, DriverStatsMap& driverStats);
  // "name:on,transition:1,residency:200,duty_cycle:0.500000;" for each state with a residency; an entry also
  // without such.
  static void processStateData(const ChanmeterSample& sample, DriverStatsMap& driverStats);

  // "AmpDrv_Speaker_Simple_RailVolts": driver, group, subgroup, type and channel, as far as there are such;
  // without blanks and underscores of their own, the driver's name up to its first "<".
  static std::string getDriverStatsKey(const ChanmeterSample& sample, std::string_view type);

 private:
  struct Stats;

  void subscribe(const TWReportingDriver& driver);
  void collectChanges(const TWReportingIOChannelSubscription& from, const Snapshot* driverSnapShot,
                      Stats& stats) const;
  static void process(const ChanmeterSample& sample, Stats& stats);

  Chanmeter& chanmeter_;
  std::vector<TWReportingIOChannelSubscription> ioChannelSubscriptions_;
};

}  // namespace tonewerk
