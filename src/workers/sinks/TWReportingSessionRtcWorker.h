// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>

#include "protocol/AudioEvent.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

class Strand;
class RtcReporter;

// Forwards a session's messages to the real-time-communication reporting service as they arrive, and when the
// session stops one summary of every key that they carried. Not for sessions of the "test" service.
//
// The work queue only queues: everything with the service happens on a private serial queue. Its first piece
// waits up to nine seconds for the service's backends, and messages and the stop wait behind it. The
// framework's `started` is the session's business and not changed by the backends' answer.
class TWReportingSessionRtcWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool handleSingleMessageSession() { return true; }

  // Null for a session of the "test" service.
  static std::shared_ptr<TWReportingSessionRtcWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  // False when the session has become one of the "test" service.
  std::optional<bool> start() override;
  // Always false.
  bool handleMessage(const TWReportingSessionMessage& message) override;
  void stop() override;

  // Whether the service may gather events before it sends them.
  static bool shouldBatchLinkReportEventsForServiceType(AudioServiceType serviceType);
  // The base category; the domain is never sent.
  static std::uint16_t retrieveLinkReportCategoryFromCategory(AudioEventCategory category);

 private:
  void makeQueueOnFirstUse();

  std::shared_ptr<Strand> linkReportQueue_;
  std::shared_ptr<RtcReporter> reporter_;  // shared with the queue's work
};

}  // namespace tonewerk
