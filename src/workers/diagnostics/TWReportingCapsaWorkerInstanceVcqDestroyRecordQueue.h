// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "workers/diagnostics/TWReportingSessionCapsaWorkerInstance.h"
#include "workers/diagnostics/WorkerInstanceState.h"

namespace tonewerk {

// Stands for a symptom that no message shows yet, so it is never interested in a message. Single-message
// sessions do not get this instance.
class TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue final
    : public TWReportingSessionCapsaWorkerInstance {
 public:
  static const TWReportingSessionCapsaWorkerInstanceClass kInstanceClass;
  const TWReportingSessionCapsaWorkerInstanceClass& instanceClass() const override { return kInstanceClass; }

  [[nodiscard]] static std::unique_ptr<TWReportingSessionCapsaWorkerInstance> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  WorkerInstanceState& workerState() override { return state_; }
  bool interestedInMessage(const TWReportingSessionMessage& message) override;
  void handleMessage(const TWReportingSessionMessage& message) override;

 private:
  WorkerInstanceState state_;
};

}  // namespace tonewerk
