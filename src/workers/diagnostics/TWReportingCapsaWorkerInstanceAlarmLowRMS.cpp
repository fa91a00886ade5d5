// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceAlarmLowRMS.h"

#include <cassert>
#include <string>
#include <string_view>

#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"
#include "values/ValueView.h"
#include "workers/diagnostics/TWReportingSessionCapsaWorker.h"
#include "workers/diagnostics/WorkerInstanceState.h"

namespace tonewerk {
namespace {

constexpr std::string_view kIssueTypeKey = "issue_type";
const Value kLowRms("LowRMS");

constexpr std::int64_t kThresholdCount = 3;
constexpr double kThresholdDurationSeconds = 15.0;

std::shared_ptr<WorkerInstanceState> makeState() {
  auto state = std::make_shared<WorkerInstanceState>();
  state->interestThresholdCount = kThresholdCount;
  state->interestThresholdDurationSeconds = kThresholdDurationSeconds;
  state->oncePerSession = true;
  return state;
}

}  // namespace

const TWReportingSessionCapsaWorkerInstanceClass TWReportingCapsaWorkerInstanceAlarmLowRMS::kInstanceClass{
    "TWReportingCapsaWorkerInstanceAlarmLowRMS", false, &initWithSession};

std::unique_ptr<TWReportingSessionCapsaWorkerInstance>
TWReportingCapsaWorkerInstanceAlarmLowRMS::initWithSession(
    const std::shared_ptr<TWReportingSession>& session) {
  if (session->isSingleMessageSession()) return nullptr;
  return std::make_unique<TWReportingCapsaWorkerInstanceAlarmLowRMS>(session);
}

TWReportingCapsaWorkerInstanceAlarmLowRMS::TWReportingCapsaWorkerInstanceAlarmLowRMS(
    const std::shared_ptr<TWReportingSession>& session)
    : session_(session), state_(makeState()) {}

bool TWReportingCapsaWorkerInstanceAlarmLowRMS::interestedInMessage(
    const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (message.category != kCategoryError || message.type != kTypeIssueDetector) return false;
  const auto session = session_.lock();
  if (session == nullptr) return false;
  if (session->serviceType() != kServiceAlarms && session->serviceType() != kServiceTest) return false;
  const ValueView issue = message.message.view(kIssueTypeKey);
  return issue && issue == ValueView(kLowRms);
}

void TWReportingCapsaWorkerInstanceAlarmLowRMS::fire(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto session = session_.lock();
  if (session == nullptr) return;
  FaultsignReporter& reporter = *state_->symptomReporter;
  const bool isAccepted = reporter.startSessionWithSignature(
      TWReportingSessionCapsaWorker::signatureFromMessage(message, *session, reporter),
      capsaAlarmLowRmsDuration, std::nullopt, std::nullopt, std::nullopt,
      replyHandler(state_, [](const std::string& identifier, const std::optional<ValueMap>& response) {
        infoLog(logSite(), "Started Capsa session for alarm Low RMS. sessionId=%@ timeout=%f response=%@",
                identifier, capsaAlarmLowRmsDuration, response);
      }));
  if (isAccepted) {
    infoLog(logSite(),
            "Parameters to Capsa session for alarm Low RMS accepted. Will fire if not cancelled. timeout=%f.",
            capsaAlarmLowRmsDuration);
  } else {
    errorLog(logSite(), "Capsa session for alarm Low RMS failed to start.");
  }
}

// Cancels also the identifier that stands for no session: the service does not know it and logs that.
void TWReportingCapsaWorkerInstanceAlarmLowRMS::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (!state_->currentCapsaSessionIdentifier) return;
  const std::string& identifier = *state_->currentCapsaSessionIdentifier;
  infoLog(logSite(), "Stop called. Cancelling Capsa session for alarm Low RMS. sessionId=%@ timeout=%f",
          identifier, capsaAlarmLowRmsDuration);
  state_->symptomReporter->cancelSession(identifier);
}

}  // namespace tonewerk
