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

// Watches a session's messages for known symptoms and has diagnostics captured when a symptom has been seen
// often enough over a long enough time. Each instance recognises one symptom. The worker owns the session's
// instances and counts for them. It exists on internal builds only and lives on the work queue.
class TWReportingSessionCapsaWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr bool kIsForLiveSessions = true;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool handleSingleMessageSession() { return true; }
  bool handleRedundantMessages() const override { return true; }

  // Returns null on a build that is not internal.
  [[nodiscard]] static std::shared_ptr<TWReportingSessionCapsaWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  // Adds an instance of the class. Adds none when the class does not apply to the session, or when the
  // session is a single-message session and the class does not handle those.
  void addInstance(const TWReportingSessionCapsaWorkerInstanceClass& instanceClass);

  // Returns true always.
  [[nodiscard]] std::optional<bool> start() override;
  // Returns false always.
  bool handleMessage(const TWReportingSessionMessage& message) override;
  void stop() override;

  const std::vector<std::unique_ptr<TWReportingSessionCapsaWorkerInstance>>& instances() const {
    return instances_;
  }

  // Returns the session identifier in the service's answer, or "NONE_RETURNED". Logs what the answer says.
  [[nodiscard]] static std::string getSessionIdentifierFromResponse(const std::optional<ValueMap>& response);
  // Describes a capture by the session's service, the message's category and type, and the client's process.
  static FaultsignSignature signatureFromMessage(const TWReportingSessionMessage& message,
                                                 const TWReportingSession& session,
                                                 FaultsignReporter& symptomReporter);

 private:
  // Counts the message and fires when the thresholds are reached. Ignores a message with the same payload as
  // the last interesting one.
  static void countUnlessRepeated(TWReportingSessionCapsaWorkerInstance& instance,
                                  const TWReportingSessionMessage& message, const TWReportingSession& owner);
  static void fire(TWReportingSessionCapsaWorkerInstance& instance, const TWReportingSessionMessage& message,
                   const TWReportingSession& owner);

  std::vector<std::unique_ptr<TWReportingSessionCapsaWorkerInstance>> instances_;
};

}  // namespace tonewerk
