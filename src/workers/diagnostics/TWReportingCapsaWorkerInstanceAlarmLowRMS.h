// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "workers/diagnostics/TWReportingSessionCapsaWorkerInstance.h"

namespace tonewerk {

// An alarm that can hardly be heard: captures when the session goes on for so long after it was noticed that
// nobody seems to have heard it. A session that stops before cancels the capture. Not for sessions of single
// messages.
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
