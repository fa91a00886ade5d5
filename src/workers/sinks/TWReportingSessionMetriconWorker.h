// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Sends every message to the analytics service when it arrives, under two event names: one for the framework
// and one for the session's service. Keeps nothing.
class TWReportingSessionMetriconWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool startOnInit() { return true; }
  static constexpr bool handleSingleMessageSession() { return true; }

  explicit TWReportingSessionMetriconWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Always false.
  bool handleMessage(const TWReportingSessionMessage& message) override;
};

}  // namespace tonewerk
