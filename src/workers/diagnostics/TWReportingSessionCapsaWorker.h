// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/FaultsignReporter.h"
#include "session/TWReportingSessionWorkerClass.h"
#include "workers/diagnostics/TWReportingSessionCapsaWorkerInstance.h"

namespace tonewerk {

// Watches a session's messages for known symptoms, and has diagnostics captured when one has been seen often
// enough for long enough. One instance knows one symptom; this owns the session's instances and counts for
// them. On internal builds only.
class TWReportingSessionCapsaWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool handleSingleMessageSession() { return true; }
  bool handleRedundantMessages() const override { return true; }

  // Null on a build that is not internal.
  [[nodiscard]] static std::shared_ptr<TWReportingSessionCapsaWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  // Adds nothing when the class does not want the session, or the session is of single messages and the class
  // does not do those.
  void addInstance(const TWReportingSessionCapsaWorkerInstanceClass& instanceClass);

  // True.
  [[nodiscard]] std::optional<bool> start() override;
  // Always false.
  bool handleMessage(const TWReportingSessionMessage& message) override;
  void stop() override;

  const std::vector<std::unique_ptr<TWReportingSessionCapsaWorkerInstance>>& instances() const {
    return instances_;
  }

  // The identifier in the service's answer, or "NONE_RETURNED"; logs what the answer says.
  [[nodiscard]] static std::string getSessionIdentifierFromResponse(const std::optional<ValueMap>& response);
  // What a capture is about: the session's service, the message's kind, the client's process.
  static FaultsignSignature signatureFromMessage(const TWReportingSessionMessage& message,
                                                 const TWReportingSession& session,
                                                 FaultsignReporter& symptomReporter);

 private:
  // And fires when it is enough. A repeat is one of the last interesting message's payload.
  static void countUnlessRepeated(TWReportingSessionCapsaWorkerInstance& instance,
                                  const TWReportingSessionMessage& message, const TWReportingSession& owner);
  static void fire(TWReportingSessionCapsaWorkerInstance& instance, const TWReportingSessionMessage& message,
                   const TWReportingSession& owner);

  std::vector<std::unique_ptr<TWReportingSessionCapsaWorkerInstance>> instances_;
};

}  // namespace tonewerk
