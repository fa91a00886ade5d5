// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string_view>

#include "platform/IssueDraftService.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

class TWReportingDefaults;

// Offers a draft of a bug report when a video call passes invalid coordinates to the audio layer. The whole
// device offers at most one in each back-off period, also across restarts of the daemon. The worker exists on
// internal builds whose reporting defaults set such a period. It lives on the work queue.
//
//   first message: ignores errors for 5 s -> watches -> has offered a draft -> [stopped: may offer one again]
class TWReportingSessionIssueDraftWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr bool kIsForLiveSessions = true;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool handleSingleMessageSession() { return true; }

  // Returns null on a build that is not internal and without a back-off period.
  [[nodiscard]] static std::shared_ptr<TWReportingSessionIssueDraftWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  // True if a draft should be offered for the message now. It returns true once in each back-off period, so
  // the caller that gets true has used the period.
  [[nodiscard]] bool interestedInMessage(const TWReportingSessionMessage& message);

  // Returns false always.
  bool handleMessage(const TWReportingSessionMessage& message) override;

  void stop() override;

  // True if the time stored under `defaultsKey` is less than `seconds` ago. Otherwise it stores the current
  // time, so that of two sessions that ask one after the other only the first gets false.
  [[nodiscard]] bool hasRunInTimeframe(double seconds, std::string_view defaultsKey);

  static TrackletDraft trackletDraftForVidroXYerror();

 private:
  static TWReportingDefaults& defaults();

  bool hasRun_ = false;
  double backOffTime_ = 0.0;          // seconds
  double minimumMessageTime_ = -1.0;  // errors after it count; in seconds since 1970
};

}  // namespace tonewerk
