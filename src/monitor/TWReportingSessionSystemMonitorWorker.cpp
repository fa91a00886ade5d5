// SPDX-License-Identifier: Apache-2.0
#include "monitor/TWReportingSessionSystemMonitorWorker.h"

#include <cassert>
#include <utility>

#include "monitor/TWReportingSystemMonitor.h"
#include "platform/JournalPosition.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr std::string_view kLastUpdated = "last_updated";

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionSystemMonitorWorker::kWorkerClass =
    workerClassOf<TWReportingSessionSystemMonitorWorker>("TWReportingSessionSystemMonitorWorker");

TWReportingSessionSystemMonitorWorker::TWReportingSessionSystemMonitorWorker(
    const std::shared_ptr<TWReportingSession>& owner)
    : features_(TWReportingSystemMonitor::getFeatures()) {
  session = owner;
}

std::optional<bool> TWReportingSessionSystemMonitorWorker::start() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (features_.states == nullptr) return true;
  const auto observer = std::make_shared<const ObservableMap::Observer>(
      [this](std::string_view changed) { observeValueForKeyPath(changed); });
  observations_.reserve(features_.names->size());
  for (const SharedString& key : *features_.names) {
    observeValueForKeyPath(key);  // sends the current state
    observations_.push_back(ObservableMap::observe(features_.states, key, observer));
  }
  return true;
}

void TWReportingSessionSystemMonitorWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  observations_.clear();
}

void TWReportingSessionSystemMonitorWorker::observeValueForKeyPath(std::string_view key) {
  const std::optional<ValueMap> state = features_.states->find(key);
  handleChange(state ? &*state : nullptr);
}

void TWReportingSessionSystemMonitorWorker::handleChange(const ValueMap* state) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (state == nullptr) return;
  ValueMap payload = *state;
  if (const Value* readAt = payload.find(TWReportingInternalEventEpochTime)) {
    payload.set(kLastUpdated, Value(*readAt));  // a copy, because set() may move the entries of the map
    // The session adds the time at which the message is sent.
    payload.erase(TWReportingInternalEventEpochTime);
    payload.erase(TWReportingInternalEventSystemUptimeSec);
  }
  const auto owner = session.lock();
  if (payload.empty() || owner == nullptr) return;
  JournalPosition ofNoRequest;  // a played session has no such message
  const JournalPosition::Scope scope(ofNoRequest);
  owner->sendMessage(
      std::make_shared<TWReportingSessionMessage>(std::move(payload), kCategorySetup, kTypeSetup));
}

}  // namespace tonewerk
