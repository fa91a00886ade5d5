// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string_view>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

class TWReportingDefaults;

// Requests a stall trace when the audio stack reports an I/O overload on a buffer that is large enough: at
// most one every ten seconds and session. Posts a notification for each request. Works on internal builds
// only, when the reporting defaults switch it on.
class TWReportingSessionDPWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr bool kIsForLiveSessions = true;
  static constexpr MessageTypes kSlowTypes = MessageTypes::only(kTypeError);
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  // The longest wait before a request, even when "wait_time" is longer: nothing else happens meanwhile.
  static constexpr std::chrono::seconds kMaxWaitTime{10};

  // Reads the settings of all workers again. Null when it is not switched on.
  static std::shared_ptr<TWReportingSessionDPWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  std::optional<bool> start() override;

  // Whether the message reports an I/O overload.
  bool interestedInMessage(const TWReportingSessionMessage& message) const;

  // Always false. Before a request it sleeps on the work queue for the time in the settings, as the settings
  // ask: the trace is to show what comes after the overload.
  bool handleMessage(const TWReportingSessionMessage& message) override;

  // The reporting defaults, and their value of a key: false, 0 or 0.0 when they have none.
  static const TWReportingDefaults& getUserDefaults();
  static bool getEnableFlag(std::string_view key);
  static std::int32_t getRunTimeDefaults(std::string_view key);
  static double getDoubleRunTimeDefaults(std::string_view key);

 private:
  bool meetsConditions(const TWReportingSessionMessage& message, double now) const;

  double lastMessageTime_ = 0.0;  // the last request, in seconds since 1970; 0 when there was none
};

}  // namespace tonewerk
