// SPDX-License-Identifier: Apache-2.0
#include "monitor/TWReportingSystemMonitor.h"

#include <cassert>
#include <cmath>
#include <utility>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "platform/SerialQueue.h"
#include "platform/SystemInformation.h"
#include "protocol/FeatureTable.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr std::string_view kDeviceName = "device_name";
constexpr std::string_view kDisableReporting = "disable_reporting";

// The state of the ringer's notification while the ringer is on.
constexpr std::uint64_t kRingerOn = 1;

const auto category = &TWReportingServiceDelegateCategory;

const Platform& platform() { return TWReportingContext::current().platform(); }

// Holds the process's monitor.
struct SharedMonitor {
  // Held while the monitor is made or dropped, so that there are never two. get() does not take it: its
  // caller may hold the map's lock, and making a monitor takes that lock.
  Mutex creationMutex;
  Mutex monitorMutex;  // no other lock is taken while it is held
  std::shared_ptr<TWReportingSystemMonitor> monitor GUARDED_BY(monitorMutex);

  static SharedMonitor& ofProcess() {
    return TWReportingContext::current().singletons().get<SharedMonitor>();
  }

  std::shared_ptr<TWReportingSystemMonitor> get() {
    const MutexLock lock(monitorMutex);
    return monitor;
  }
  std::shared_ptr<TWReportingSystemMonitor> exchange(std::shared_ptr<TWReportingSystemMonitor> other)
      REQUIRES(creationMutex) {
    const MutexLock lock(monitorMutex);
    return std::exchange(monitor, std::move(other));
  }
};

std::shared_ptr<const std::vector<SharedString>> namesOf(const ValueMap& features) {
  auto names = std::make_shared<std::vector<SharedString>>();
  for (const ValueMap::Entry& feature : features) names->push_back(feature.key);
  return names;
}

}  // namespace

void TWReportingSystemMonitor::initializeWithQueue(SerialQueue& queue) {
  SharedMonitor& shared = SharedMonitor::ofProcess();
  const MutexLock lock(shared.creationMutex);
  if (shared.get() == nullptr) shared.exchange(initWithQueue(queue));
}

std::shared_ptr<ObservableMap> TWReportingSystemMonitor::getSystemMonitorDictionary() {
  const auto monitor = SharedMonitor::ofProcess().get();
  return monitor == nullptr ? nullptr : monitor->systemMonitorDictionary_;
}

std::vector<std::string> TWReportingSystemMonitor::getSystemMonitorKeys() {
  const auto monitor = SharedMonitor::ofProcess().get();
  std::vector<std::string> keys;
  if (monitor == nullptr) return keys;
  for (const SharedString& name : *monitor->featureNames_) keys.push_back(name.string());
  return keys;
}

TWReportingSystemMonitor::Features TWReportingSystemMonitor::getFeatures() {
  const auto monitor = SharedMonitor::ofProcess().get();
  if (monitor == nullptr) return {};
  return {monitor->systemMonitorDictionary_, monitor->featureNames_};
}

void TWReportingSystemMonitor::reset() {
  SharedMonitor& shared = SharedMonitor::ofProcess();
  const MutexLock lock(shared.creationMutex);
  if (const auto monitor = shared.exchange(nullptr)) monitor->clear();
}

std::shared_ptr<TWReportingSystemMonitor> TWReportingSystemMonitor::initWithQueue(SerialQueue& queue) {
  auto monitor = std::make_shared<TWReportingSystemMonitor>(Private(), queue);
  monitor->populateInitialValues();
  monitor->listenForFeatureStateChanges();
  return monitor;
}

TWReportingSystemMonitor::TWReportingSystemMonitor(Private, SerialQueue& queue)
    : defaults_(TWReportingDefaults()),
      queue_(queue),
      notifications_(platform().notifications),
      featureNames_(namesOf(featureTable())),
      features_(featureTable()) {}

TWReportingSystemMonitor::~TWReportingSystemMonitor() { clear(); }

ValueMap TWReportingSystemMonitor::TWReportingDefaults() {
  const ValueMap suite = platform().preferences.readAll(kReportingSuite);
  ValueMap defaults;
  if (suite.contains(kDeviceName)) defaults.set(kDeviceName, suite.text(kDeviceName));
  if (suite.contains(kDisableReporting)) {
    defaults.set(kDisableReporting, suite.boolean(kDisableReporting));
  } else {
    defaults.set(kDisableReporting, 0);
  }
  return defaults;
}

void TWReportingSystemMonitor::populateInitialValues() {
  const RecursiveMutexLock lock(systemMonitorDictionary_->mutex());
  infoLog(category(), "populateInitialValues %@", features_);
  for (const ValueMap::Entry& feature : features_) {
    if (const auto state = getFeatureState(feature.key)) systemMonitorDictionary_->set(feature.key, *state);
  }
}

void TWReportingSystemMonitor::listenForFeatureStateChanges() {
  // A handler that runs before its token is stored waits for this lock.
  const RecursiveMutexLock lock(systemMonitorDictionary_->mutex());
  infoLog(category(), "listening for features %@", features_);
  const ValueMap features = features_;
  for (const ValueMap::Entry& feature : features) {
    const std::string notification = feature.value.asMap()->text(kFeatureNotification);
    if (!notification.empty()) listenFor(feature.key.string(), notification);
  }
}

void TWReportingSystemMonitor::listenFor(const std::string& name, const std::string& notification) {
  const auto [status, token] = notifications_.registerHandler(
      notification, queue_, [weak = weak_from_this(), name](NotificationService::Token notified) {
        if (const auto monitor = weak.lock()) monitor->featureChanged(name, notified);
      });
  ValueMap descriptor = *descriptorOf(name);
  descriptor.set(kFeatureNotifyToken, token);
  features_.set(name, std::move(descriptor));
  defaultLog(category(), "notify setup result %i token %i", status, token);
}

void TWReportingSystemMonitor::featureChanged(std::string_view name, NotificationService::Token token) {
  assert(queue_.ownsThisThread());
  infoLog(category(), "feature changes featureName=%@ token=%i", name, token);
  const RecursiveMutexLock lock(systemMonitorDictionary_->mutex());
  std::optional<ValueMap> state = getFeatureState(name);
  if (state && state != systemMonitorDictionary_->find(name)) {
    systemMonitorDictionary_->set(name, std::move(*state));
  }
}

const ValueMap* TWReportingSystemMonitor::descriptorOf(std::string_view name) const {
  const Value* descriptor = features_.find(name);
  return descriptor == nullptr ? nullptr : descriptor->asMap();
}

std::optional<ValueMap> TWReportingSystemMonitor::getFeatureState(std::string_view name) const {
  defaultLog(category(), "getting feature %@", name);
  const RecursiveMutexLock lock(systemMonitorDictionary_->mutex());
  const ValueMap* descriptor = descriptorOf(name);
  if (descriptor == nullptr || !descriptor->contains(kFeatureDomain)) return std::nullopt;

  ValueMap state;
  if (descriptor->contains(kFeatureDefaultsDomain)) {
    const auto value = platform().preferences.read(descriptor->text(kFeatureDefaultsDomain), name);
    if (value) state.set(name, *value);
  } else if (descriptor->contains(kFeatureNotifyToken)) {
    const auto token = static_cast<NotificationService::Token>(descriptor->integer(kFeatureNotifyToken));
    const std::optional<std::uint64_t> posted = notifications_.state(token);
    if (posted) state.set(name, *posted == kRingerOn);
  }
  if (state.empty()) return std::nullopt;
  state.set(TWReportingInternalEventEpochTime, platform().clock.now());
  state.set(TWReportingInternalEventSystemUptimeSec,
            static_cast<std::int32_t>(std::lround(platform().system.uptimeSeconds())));
  return state;
}

void TWReportingSystemMonitor::clear() {
  const RecursiveMutexLock lock(systemMonitorDictionary_->mutex());
  for (const ValueMap::Entry& feature : features_) {
    const ValueMap* descriptor = feature.value.asMap();
    if (!descriptor->contains(kFeatureNotifyToken)) continue;
    notifications_.cancel(static_cast<NotificationService::Token>(descriptor->integer(kFeatureNotifyToken)));
  }
}

}  // namespace tonewerk
