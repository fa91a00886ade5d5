// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>

#include "driver/TWReportingDriverUtility.h"
#include "platform/accounts/Account.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Reads the drivers' channels when its session starts and again when it stops, and sends the session what
// changed in between. All sessions share one sampler, which the first start in the process makes. Lives on
// the work queue.
class TWReportingSessionDriverSnapshotWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr bool kIsForLiveSessions = true;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionDriverSnapshotWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Takes the snapshot, which replaces an earlier one, and charges it to the user for whom the thread works.
  // When that user's share has no room, there is no snapshot. Returns true always.
  [[nodiscard]] std::optional<bool> start() override;
  // Sends the session what changed since the snapshot, then drops the snapshot. Sends nothing without a
  // snapshot.
  void stop() override;

  // nullopt before start() and after stop(), and when there was no room for it.
  const std::optional<TWReportingDriverUtility::Snapshot>& driverSnapShot() const { return driverSnapShot_; }

 private:
  void dropSnapshot();

  Charge charge_;  // for the snapshot, and so destroyed after it
  std::optional<TWReportingDriverUtility::Snapshot> driverSnapShot_;
};

}  // namespace tonewerk
