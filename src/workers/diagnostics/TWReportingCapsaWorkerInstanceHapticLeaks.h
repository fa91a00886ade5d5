// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "workers/diagnostics/TWReportingSessionCapsaWorkerInstance.h"

namespace tonewerk {

// Recognises haptics hardware that stays active. It has diagnostics captured at once when messages have
// reported active hardware for more than a minute. The messages of all sessions in the process are counted
// together.
class TWReportingCapsaWorkerInstanceHapticLeaks final : public TWReportingSessionCapsaWorkerInstance {
 public:
  static const TWReportingSessionCapsaWorkerInstanceClass kInstanceClass;
  const TWReportingSessionCapsaWorkerInstanceClass& instanceClass() const override { return kInstanceClass; }

  [[nodiscard]] static std::unique_ptr<TWReportingSessionCapsaWorkerInstance> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);
  explicit TWReportingCapsaWorkerInstanceHapticLeaks(const std::shared_ptr<TWReportingSession>& session);

  WorkerInstanceState& workerState() override { return *state_; }
  bool interestedInMessage(const TWReportingSessionMessage& message) override;
  bool canFire() const override { return true; }
  void fire(const TWReportingSessionMessage& message) override;

 private:
  const std::weak_ptr<TWReportingSession> session_;
  const std::shared_ptr<WorkerInstanceState> state_;
};

}  // namespace tonewerk
