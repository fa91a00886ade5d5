// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "monitor/ObservableMap.h"
#include "platform/NotificationService.h"
#include "values/Value.h"

namespace tonewerk {

class SerialQueue;

// Keeps the state of a few features of the system in one shared map, which sessions' workers observe: the
// spatial-audio accessory feature and the device's name out of the preferences, the ringer switch out of a
// notification's state. A notification says when to look again.
//
//   TWReportingSystemMonitor::initializeWithQueue(queue);
//   const auto map = TWReportingSystemMonitor::getSystemMonitorDictionary();
//   ... map->find("ringerstate") ...
//   TWReportingSystemMonitor::reset();   // before the queue ends
//
// There is one in the process, kept by TWReportingContext. The static functions may be called from any
// thread, initializeWithQueue() and reset() not by whoever holds the map's lock.
class TWReportingSystemMonitor : public std::enable_shared_from_this<TWReportingSystemMonitor> {
  struct Private {};

 public:
  // Makes the one monitor, which reads all features and registers for their changes; the handlers run on
  // `queue`. Does nothing when there is one.
  static void initializeWithQueue(SerialQueue& queue);
  // The monitor's own map, by feature; null without a monitor. It outlives the monitor, but does not change
  // any more then.
  static std::shared_ptr<ObservableMap> getSystemMonitorDictionary();
  // The names of all features, in the order of the table; empty without a monitor.
  static std::vector<std::string> getSystemMonitorKeys();
  // Ends the registrations and drops the monitor. On its queue, or with nothing running there.
  static void reset();

  [[nodiscard]] static std::shared_ptr<TWReportingSystemMonitor> initWithQueue(SerialQueue& queue);
  TWReportingSystemMonitor(Private, SerialQueue& queue);
  TWReportingSystemMonitor(const TWReportingSystemMonitor&) = delete;
  TWReportingSystemMonitor& operator=(const TWReportingSystemMonitor&) = delete;
  ~TWReportingSystemMonitor();

  // What the daemon's own preferences say now: "device_name" when it is set, and "disable_reporting", 0 when
  // it is not.
  static ValueMap TWReportingDefaults();
  // The same as of the monitor's making.
  const ValueMap& getDefaults() const { return defaults_; }

  void populateInitialValues();
  void listenForFeatureStateChanges();
  // Reads a feature: its value under its name, and when it was read. None for what is no feature and for one
  // without a value.
  std::optional<ValueMap> getFeatureState(std::string_view name) const;
  // Ends every registration.
  void clear();

 private:
  void featureChanged(std::string_view name, NotificationService::Token token);
  const ValueMap* descriptorOf(std::string_view name) const REQUIRES(systemMonitorDictionary_->mutex());
  void listenFor(const std::string& name, const std::string& notification)
      REQUIRES(systemMonitorDictionary_->mutex());

  const ValueMap defaults_;
  SerialQueue& queue_;
  NotificationService& notifications_;
  const std::shared_ptr<ObservableMap> systemMonitorDictionary_ = std::make_shared<ObservableMap>();
  const std::vector<std::string> featureNames_;  // in the order of the table
  // A descriptor a feature, by its name.
  ValueMap features_ GUARDED_BY(systemMonitorDictionary_->mutex());
};

}  // namespace tonewerk
