// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string_view>
#include <vector>

#include "monitor/ObservableMap.h"
#include "monitor/TWReportingSystemMonitor.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Sends a session the state of the system's features in messages of category and type Setup: the state of
// each feature when the session starts, then every state that the system monitor stores. The message's
// "last_updated" says when the state was read.
//
// Lives on the work queue. Messages are sent while the lock of the monitor's map is held.
class TWReportingSessionSystemMonitorWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr bool kIsForLiveSessions = true;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  // Uses the monitor that exists now. Without a monitor the worker does nothing.
  explicit TWReportingSessionSystemMonitorWorker(const std::shared_ptr<TWReportingSession>& owner);

  // Returns true always.
  [[nodiscard]] std::optional<bool> start() override;
  void stop() override;

  // Sends a feature's state. Sends nothing when it is null or empty.
  void handleChange(const ValueMap* state);

 private:
  void observeValueForKeyPath(std::string_view key);

  const TWReportingSystemMonitor::Features features_;     // null when there was no monitor
  std::vector<ObservableMap::Observation> observations_;  // last, so that they end before the members above
};

}  // namespace tonewerk
