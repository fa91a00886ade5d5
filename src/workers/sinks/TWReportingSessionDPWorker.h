// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string_view>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

class TWReportingDefaults;

// Requests a stall trace when the audio stack reports an I/O overload on a buffer that is large enough, at
// most one every ten seconds and session, and posts a notification for each. On internal builds where the
// reporting defaults switch it on.
class TWReportingSessionDPWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  // No pause before a request is longer, whatever "wait_time" says: nothing else happens meanwhile.
  static constexpr std::chrono::seconds kMaxWaitTime{10};

  // Reads the settings of all workers anew. None unless it is switched on.
  static std::shared_ptr<TWReportingSessionDPWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  std::optional<bool> start() override;

  // Whether the message reports an I/O overload.
  bool interestedInMessage(const TWReportingSessionMessage& message) const;

  // Always false. Before a request it sleeps for the time that the settings ask for, on the work queue, which
  // is what they ask for: the trace is to show what comes after the overload.
  bool handleMessage(const TWReportingSessionMessage& message) override;

  // The reporting defaults, and what they hold under a key: false, 0 or 0.0 when it is not there.
  static const TWReportingDefaults& getUserDefaults();
  static bool getEnableFlag(std::string_view key);
  static std::int32_t getRunTimeDefaults(std::string_view key);
  static double getDoubleRunTimeDefaults(std::string_view key);

 private:
  bool meetsConditions(const TWReportingSessionMessage& message, double now) const;

  double lastMessageTime_ = 0.0;  // of the last request, in seconds since 1970; 0 before it
};

}  // namespace tonewerk
