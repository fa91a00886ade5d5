// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/TWReportingSessionWorkerClass.h"
#include "values/Value.h"

namespace tonewerk {

// Passes the haptics engine's reports on to the power log: how long it was on, whether it is on, and sessions
// that keep it on too long. Handles only messages of type Energybook. Keeps nothing.
class TWReportingSessionEnergybookWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr MessageTypes kHandledTypes = MessageTypes::only(kTypeEnergybook);
  static constexpr bool startOnInit() { return true; }
  static constexpr bool handleSingleMessageSession() { return true; }

  explicit TWReportingSessionEnergybookWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Sends an event for each of these three that the message reports. Always false.
  bool handleMessage(const TWReportingSessionMessage& message) override;

 private:
  void handleEngineOnDurationMessage(const ValueMap& message) const;
  void handleEngineStateMessage(const ValueMap& message) const;
  static void handleLongRunningMessage(const ValueMap& message);
  SharedString applicationName() const;
};

}  // namespace tonewerk
