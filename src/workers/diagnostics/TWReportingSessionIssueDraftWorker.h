// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string_view>

#include "platform/IssueDraftService.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

class TWReportingDefaults;

// Offers a draft of a bug report when a video call hands invalid coordinates to the audio layer, at most one
// every back-off period on the whole device, restarts included. On internal builds whose reporting defaults
// set such a period.
//
//   first message: 5 s of settling -> watching -> a draft was offered -> [stopped: may offer one again]
class TWReportingSessionIssueDraftWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool handleSingleMessageSession() { return true; }

  // None without a back-off period.
  [[nodiscard]] static std::shared_ptr<TWReportingSessionIssueDraftWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  // Whether the message deserves a draft now. Yes is said once a back-off period: who asks has had it.
  [[nodiscard]] bool interestedInMessage(const TWReportingSessionMessage& message);

  // Always false.
  bool handleMessage(const TWReportingSessionMessage& message) override;

  void stop() override;

  // Whether the time kept under `defaultsKey` is less than `seconds` ago; if not, it now is. Two sessions
  // that ask one after the other can so never both be told no.
  [[nodiscard]] bool hasRunInTimeframe(double seconds, std::string_view defaultsKey);

  static TrackletDraft trackletDraftForVidroXYerror();

 private:
  static TWReportingDefaults& defaults();

  bool hasRun_ = false;
  double backOffTime_ = 0.0;          // seconds
  double minimumMessageTime_ = -1.0;  // end of the settling, in seconds since 1970
};

}  // namespace tonewerk
