// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>

#include "protocol/AudioEvent.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

class Strand;
class RtcReporter;

// Forwards a session's messages to the real-time-communication reporting service when they arrive, and when
// the session stops one summary of all their keys. Sessions of the "test" service have no such worker.
//
// The service is used on a strand of the shared StrandPool. Its first piece waits up to nine seconds for the
// service's backends, and messages and the stop wait behind it. A message that nothing is ahead of has its
// turn on the strand at once, on the work queue's thread, when the service only hands it to the store:
// changing threads would cost more than that. Messages for a network go to the other thread.
// When the thread hangs and a start does not fit, nothing of the session until its stop is sent. A stop is
// never dropped.
// `started` belongs to the session; the backends' answer does not change it.
class TWReportingSessionRtcWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr bool kIsForLiveSessions = true;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool handleSingleMessageSession() { return true; }

  // Null for a session of the "test" service.
  static std::shared_ptr<TWReportingSessionRtcWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  // False when the session now has the "test" service.
  std::optional<bool> start() override;
  // Always false.
  bool handleMessage(const TWReportingSessionMessage& message) override;
  void stop() override;

  // Whether the service may collect events before it sends them.
  static bool shouldBatchLinkReportEventsForServiceType(AudioServiceType serviceType);
  // The category without its domain, which is never sent.
  static std::uint16_t retrieveLinkReportCategoryFromCategory(AudioEventCategory category);

 private:
  void makeQueueOnFirstUse();

  std::shared_ptr<Strand> linkReportQueue_;
  std::shared_ptr<RtcReporter> reporter_;  // the queue's work shares it
  std::uint64_t starts_ = 0;               // how many the reporter has been given
  bool isStartDropped_ = false;            // the last one had no room, until the stop
};

}  // namespace tonewerk
