// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "monitor/ObservableMap.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Tells a session the state of the system's features: each one's when the session starts, and from then on
// every one that the system monitor stores, as a message of category and type Setup. When the state was read
// stands in its "last_updated".
//
// Messages are sent from inside the monitor's map lock.
class TWReportingSessionSystemMonitorWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  // Takes part in the monitor that there is now. Without one the worker has nothing to do.
  explicit TWReportingSessionSystemMonitorWorker(const std::shared_ptr<TWReportingSession>& owner);

  // Always true.
  [[nodiscard]] std::optional<bool> start() override;
  void stop() override;

  // Sends a feature's state; nothing when it is null or empty.
  void handleChange(const ValueMap* state);

 private:
  void observeValueForKeyPath(std::string_view key);

  const std::shared_ptr<ObservableMap> systemMonitorDictionary_;  // null when there was no monitor
  const std::vector<std::string> featureKeys_;
  std::vector<ObservableMap::Observation> observations_;  // last: nothing is observed once the rest goes
};

}  // namespace tonewerk
