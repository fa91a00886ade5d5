// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Posts each issue-detector message to the metric service when it arrives. Keeps nothing.
class TWReportingSessionDiagwireWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr MessageTypes kHandledTypes = MessageTypes::only(kTypeIssueDetector);
  static constexpr bool startOnInit() { return true; }
  static constexpr bool handleSingleMessageSession() { return true; }

  explicit TWReportingSessionDiagwireWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Always false. A key that the message lacks is logged, and the record is posted without it.
  bool handleMessage(const TWReportingSessionMessage& message) override;
};

}  // namespace tonewerk
