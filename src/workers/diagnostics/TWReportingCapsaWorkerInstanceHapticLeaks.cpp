// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceHapticLeaks.h"

#include <cassert>
#include <string>
#include <string_view>

#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"
#include "workers/diagnostics/SharedWorkerInstanceStates.h"
#include "workers/diagnostics/TWReportingSessionCapsaWorker.h"

namespace tonewerk {
namespace {

constexpr std::string_view kActiveTimeKey = "Haptic_Active_Hardware_Time_Seconds";
constexpr const char* kProcessFilterKey = "com.orvane.EnergybookCore.DESysLogFilterProcess";
constexpr const char* kProcessIdentifiersKey = "processIDs";

constexpr std::int64_t kThresholdCount = 2;
constexpr double kThresholdDurationSeconds = 60.0;

std::shared_ptr<WorkerInstanceState> sharedState() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  auto& states = TWReportingContext::current().singletons().get<SharedWorkerInstanceStates>().byClassName;
  auto& state = states[std::string(TWReportingCapsaWorkerInstanceHapticLeaks::kInstanceClass.name)];
  if (state == nullptr) {
    state = std::make_shared<WorkerInstanceState>();
    state->interestThresholdCount = kThresholdCount;
    state->interestThresholdDurationSeconds = kThresholdDurationSeconds;
  }
  return state;
}

// Names the processes whose log lines the capture should contain.
ValueMap payloadFor(const TWReportingSession& session) {
  ValueArray identifiers;
  for (const std::int32_t identifier : session.processIdentifiers()) identifiers.append(identifier);
  return {{kFaultsignKeyPayloadDEParameters,
           ValueMap{{kProcessFilterKey, ValueMap{{kProcessIdentifiersKey, identifiers}}}}}};
}

}  // namespace

const TWReportingSessionCapsaWorkerInstanceClass TWReportingCapsaWorkerInstanceHapticLeaks::kInstanceClass{
    "TWReportingCapsaWorkerInstanceHapticLeaks", true, &initWithSession};

std::unique_ptr<TWReportingSessionCapsaWorkerInstance>
TWReportingCapsaWorkerInstanceHapticLeaks::initWithSession(
    const std::shared_ptr<TWReportingSession>& session) {
  return std::make_unique<TWReportingCapsaWorkerInstanceHapticLeaks>(session);
}

TWReportingCapsaWorkerInstanceHapticLeaks::TWReportingCapsaWorkerInstanceHapticLeaks(
    const std::shared_ptr<TWReportingSession>& session)
    : session_(session), state_(sharedState()) {}

bool TWReportingCapsaWorkerInstanceHapticLeaks::interestedInMessage(
    const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  return message.type == kTypeEnergybook && message.message.contains(kActiveTimeKey);
}

void TWReportingCapsaWorkerInstanceHapticLeaks::fire(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto session = session_.lock();
  if (session == nullptr) return;
  FaultsignReporter& reporter = *state_->symptomReporter;
  const bool isAccepted = reporter.snapshotWithSignature(
      TWReportingSessionCapsaWorker::signatureFromMessage(message, *session, reporter), 0.0, std::nullopt,
      payloadFor(*session),
      replyHandler(state_, [](const std::string& identifier, const std::optional<ValueMap>& response) {
        infoLog(logSite(), "Started Capsa session for haptics leaks. sessionId=%@ response=%@", identifier,
                response);
      }));
  if (isAccepted) {
    infoLog(logSite(), "Parameters to Capsa session accepted.");
  } else {
    errorLog(logSite(), "Parameters to Capsa session not accepted!");
  }
}

}  // namespace tonewerk
