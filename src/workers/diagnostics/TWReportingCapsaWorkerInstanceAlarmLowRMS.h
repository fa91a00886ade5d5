// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "workers/diagnostics/TWReportingSessionCapsaWorkerInstance.h"

namespace tonewerk {

// Recognises an alarm that is hardly audible. If the session still runs one minute later, the user has
// probably not heard the alarm, and diagnostics are captured. A session that stops earlier cancels the
// capture. Single-message sessions do not get this instance.
class TWReportingCapsaWorkerInstanceAlarmLowRMS final : public TWReportingSessionCapsaWorkerInstance {
 public:
  static constexpr double capsaAlarmLowRmsDuration = 60.0;  // seconds

  static const TWReportingSessionCapsaWorkerInstanceClass kInstanceClass;
  const TWReportingSessionCapsaWorkerInstanceClass& instanceClass() const override { return kInstanceClass; }

  [[nodiscard]] static std::unique_ptr<TWReportingSessionCapsaWorkerInstance> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);
  explicit TWReportingCapsaWorkerInstanceAlarmLowRMS(const std::shared_ptr<TWReportingSession>& session);

  WorkerInstanceState& workerState() override { return *state_; }
  bool interestedInMessage(const TWReportingSessionMessage& message) override;
  bool canFire() const override { return true; }
  void fire(const TWReportingSessionMessage& message) override;
  void stop() override;

 private:
  const std::weak_ptr<TWReportingSession> session_;
  const std::shared_ptr<WorkerInstanceState> state_;
};

}  // namespace tonewerk
