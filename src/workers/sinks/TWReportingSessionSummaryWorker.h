// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include "session/TWReportingSessionWorkerClass.h"
#include "values/Value.h"

namespace tonewerk {

// Counts how long a session's audio was active and how often it overloaded. When the session stops, it sends
// one summary message with these, the session's message counts and the device's state.
//
// The counts continue after a stop: a session that is started again reports the totals of all its runs.
class TWReportingSessionSummaryWorker final : public TWReportingSessionWorkerProducerProtocol,
                                              public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionSummaryWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  std::optional<bool> start() override { return true; }
  void stop() override;
  bool handleMessage(const TWReportingSessionMessage& message) override;

 private:
  ValueMap summaryOf(const TWReportingSession& owner) const;

  double totalActiveTime_ = 0.0;  // seconds
  std::uint32_t activeCount_ = 0;
  std::uint32_t overloadCount_ = 0;
};

}  // namespace tonewerk
