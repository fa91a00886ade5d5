// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/TWReportingSessionWorkerClass.h"
#include "values/Value.h"

namespace tonewerk {

// Passes on to the power log what the haptics engine reports: how long it was on, whether it is on, and
// sessions that keep it on for too long. Looks at messages of type Energybook only. Keeps nothing.
class TWReportingSessionEnergybookWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool startOnInit() { return true; }
  static constexpr bool handleSingleMessageSession() { return true; }

  explicit TWReportingSessionEnergybookWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Sends an event for each of the three that the message speaks of. Always false.
  bool handleMessage(const TWReportingSessionMessage& message) override;

 private:
  void handleEngineOnDurationMessage(const ValueMap& message) const;
  void handleEngineStateMessage(const ValueMap& message) const;
  static void handleLongRunningMessage(const ValueMap& message);
  SharedString applicationName() const;
};

}  // namespace tonewerk
