// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>

#include "driver/TWReportingDriverUtility.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Reads the drivers' counters when its session starts and when it stops, and has the session told what
// changed in between. All sessions share one sampler, which the first start in the process makes.
class TWReportingSessionDriverSnapshotWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionDriverSnapshotWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Takes the snapshot, in place of one that is there. Always true.
  [[nodiscard]] std::optional<bool> start() override;
  // Sends the session what changed since the snapshot, and drops it. Without a snapshot nothing is sent.
  void stop() override;

  // None before start and after stop.
  const std::optional<TWReportingDriverUtility::Snapshot>& driverSnapShot() const { return driverSnapShot_; }

 private:
  std::optional<TWReportingDriverUtility::Snapshot> driverSnapShot_;
};

}  // namespace tonewerk
