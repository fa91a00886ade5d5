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

// Keeps the state of some features of the system in one shared map, which sessions' workers observe. It reads
// the spatial-audio accessory feature and the device's name from the preferences, and the ringer switch from
// a notification's state. A feature's notification makes it read the feature again.
//
//   TWReportingSystemMonitor::initializeWithQueue(queue);
//   const auto map = TWReportingSystemMonitor::getSystemMonitorDictionary();
//   ... map->find("ringerstate") ...
//   TWReportingSystemMonitor::reset();   // before the queue ends
//
// The process has one, which TWReportingContext keeps. Any thread may call the static functions, but a thread
// that holds the map's lock must not call initializeWithQueue() or reset().
class TWReportingSystemMonitor : public std::enable_shared_from_this<TWReportingSystemMonitor> {
  struct Private {};

 public:
  // Makes the process's monitor, which reads all features and registers for their notifications. The handlers
  // run on `queue`. Does nothing when there is a monitor already.
  static void initializeWithQueue(SerialQueue& queue);
  // The monitor's map of features' states by feature name. Null without a monitor. A caller may keep it after
  // the monitor has ended, but then it does not change any more.
  static std::shared_ptr<ObservableMap> getSystemMonitorDictionary();
  // The names of all features in the order of the feature table. Empty without a monitor.
  static std::vector<std::string> getSystemMonitorKeys();
  // The monitor's map and the names of all features, without copies. Both null without a monitor.
  struct Features {
    std::shared_ptr<ObservableMap> states;
    std::shared_ptr<const std::vector<SharedString>> names;
  };
  static Features getFeatures();
  // Ends the registrations and drops the monitor. Call it on the monitor's queue, or while that runs nothing.
  static void reset();

  [[nodiscard]] static std::shared_ptr<TWReportingSystemMonitor> initWithQueue(SerialQueue& queue);
  TWReportingSystemMonitor(Private, SerialQueue& queue);
  TWReportingSystemMonitor(const TWReportingSystemMonitor&) = delete;
  TWReportingSystemMonitor& operator=(const TWReportingSystemMonitor&) = delete;
  ~TWReportingSystemMonitor();

  // Reads the daemon's own preferences: "device_name" if it is set, and "disable_reporting", which is 0 if it
  // is not set.
  static ValueMap TWReportingDefaults();
  // The same preferences as they were when the monitor was made.
  const ValueMap& getDefaults() const { return defaults_; }

  void populateInitialValues();
  void listenForFeatureStateChanges();
  // Reads a feature. The result holds its value under its name, and the times at which it was read. Returns
  // nullopt when `name` names no feature and when the feature has no value.
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
  const std::shared_ptr<const std::vector<SharedString>> featureNames_;  // in the order of the feature table
  // One descriptor for each feature, by its name.
  ValueMap features_ GUARDED_BY(systemMonitorDictionary_->mutex());
};

}  // namespace tonewerk
