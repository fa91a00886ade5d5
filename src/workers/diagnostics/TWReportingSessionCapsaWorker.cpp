// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionCapsaWorker.h"

#include <array>
#include <cassert>
#include <cstdint>
#include <string_view>
#include <utility>

#include "platform/Clock.h"
#include "platform/DeviceFacts.h"
#include "platform/Log.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"
#include "workers/diagnostics/SharedWorkerInstanceStates.h"
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceAlarmLowRMS.h"
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceHapticLeaks.h"
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue.h"
#include "workers/diagnostics/WorkerInstanceState.h"

namespace tonewerk {
namespace {

constexpr std::string_view kHapticLeakCaptureProperty = "HapticLeakCapture";
constexpr std::string_view kSignatureDomain = "AudioAnalytics";
constexpr std::string_view kNoneReturned = "NONE_RETURNED";

struct Reason {
  FaultsignError error;
  std::string_view name;
};

constexpr std::array<Reason, 10> kReasons{{
    {kFaultsignErrorNone, "kFaultsignErrorNone"},
    {kFaultsignErrorServiceNotReady, "kFaultsignErrorServiceNotReady"},
    {kFaultsignErrorNotSupported, "kFaultsignErrorNotSupported"},
    {kFaultsignErrorServiceUnavailable, "kFaultsignErrorServiceUnavailable"},
    {kFaultsignErrorServiceInterrupted, "kFaultsignErrorServiceInterrupted"},
    {kFaultsignErrorInvalidParameters, "kFaultsignErrorInvalidParameters"},
    {kFaultsignErrorDailyLimitExceeded, "kFaultsignErrorDailyLimitExceeded"},
    {kFaultsignErrorRandomizedSuppression, "kFaultsignErrorRandomizedSuppression"},
    {kFaultsignErrorSessionNotFound, "kFaultsignErrorSessionNotFound"},
    {kFaultsignErrorRequestThrottled, "kFaultsignErrorRequestThrottled"},
}};

void logReason(std::int64_t error) {
  for (const Reason& reason : kReasons) {
    if (reason.error != error) continue;
    // A failure without a reason is a fault of the service.
    const LogLevel level = error == kFaultsignErrorNone ? LogLevel::kError : LogLevel::kInfo;
    logLine(level, TWReportingCapsaLogCategory(), "Failed starting capsa session. reason=%@", reason.name);
    return;
  }
  infoLog(TWReportingCapsaLogCategory(), "Failed starting capsa session. reason=%d", error);
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionCapsaWorker::kWorkerClass =
    workerClassOf<TWReportingSessionCapsaWorker>("TWReportingSessionCapsaWorker");

std::shared_ptr<TWReportingSessionCapsaWorker> TWReportingSessionCapsaWorker::initWithSession(
    const std::shared_ptr<TWReportingSession>& session) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (!TWReportingUtilityIsInternalBuild()) return nullptr;
  auto worker = std::make_shared<TWReportingSessionCapsaWorker>();
  worker->session = session;
  TWReportingContext& context = TWReportingContext::current();
  context.singletons().get<SharedWorkerInstanceStates>();
  if (context.platform().deviceFacts.boolean(kHapticLeakCaptureProperty).value_or(false)) {
    worker->addInstance(TWReportingCapsaWorkerInstanceHapticLeaks::kInstanceClass);
  }
  worker->addInstance(TWReportingCapsaWorkerInstanceAlarmLowRMS::kInstanceClass);
  worker->addInstance(TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue::kInstanceClass);
  return worker;
}

void TWReportingSessionCapsaWorker::addInstance(
    const TWReportingSessionCapsaWorkerInstanceClass& instanceClass) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr) return;
  if (owner->isSingleMessageSession() && !instanceClass.handleSingleMessageSession) return;
  auto instance = instanceClass.initWithSession(owner);
  if (instance != nullptr) instances_.push_back(std::move(instance));
}

std::optional<bool> TWReportingSessionCapsaWorker::start() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  started = true;
  for (const auto& instance : instances_) instance->start();
  return started;
}

void TWReportingSessionCapsaWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  for (const auto& instance : instances_) instance->stop();
  started = false;
}

bool TWReportingSessionCapsaWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr || message.message.empty()) return false;
  for (const auto& instance : instances_) {
    if (instance->interestedInMessage(message)) countUnlessRepeated(*instance, message, *owner);
  }
  return false;
}

void TWReportingSessionCapsaWorker::countUnlessRepeated(TWReportingSessionCapsaWorkerInstance& instance,
                                                        const TWReportingSessionMessage& message,
                                                        const TWReportingSession& owner) {
  WorkerInstanceState& state = instance.workerState();
  const ValueDigest payload = ValueDigest::of(message.message);
  if (payload == state.lastMessage) return;
  debugLog(TWReportingCapsaLogCategory(), "Interested in message. instance=%@, %@", instance.instanceClass(),
           message);
  const double now = TWReportingContext::current().platform().clock.now();
  ++state.interestedCount;
  if (!state.interestFirstSeen) state.interestFirstSeen = Date{now};
  instance.handleMessage(message);
  state.lastMessage = payload;

  const bool isOften = state.interestThresholdCount <= state.interestedCount;
  const bool isLong = now - state.interestFirstSeen->seconds > state.interestThresholdDurationSeconds;
  if (!instance.canFire() || !isOften || !isLong) return;
  if (state.firedCount != 0 && state.oncePerSession) return;
  fire(instance, message, owner);
}

void TWReportingSessionCapsaWorker::fire(TWReportingSessionCapsaWorkerInstance& instance,
                                         const TWReportingSessionMessage& message,
                                         const TWReportingSession& owner) {
  WorkerInstanceState& state = instance.workerState();
  state.symptomReporter = TWReportingContext::current().platform().capsa.makeReporter();
  ++state.firedCount;
  if (owner.serviceType() == kServiceTest) {
    infoLog(TWReportingCapsaLogCategory(), "Skipping actual fire, as we are running in test mode.");
  } else {
    instance.fire(message);
  }
  state.lastMessage.reset();
  state.interestFirstSeen.reset();
  state.interestedCount = 0;
}

std::string TWReportingSessionCapsaWorker::getSessionIdentifierFromResponse(
    const std::optional<ValueMap>& response) {
  const ValueMap reply = response.value_or(ValueMap());
  if (reply.boolean(kFaultsignReplySuccess)) {
    if (const Value* identifier = reply.find(kFaultsignReplySessionID)) {
      infoLog(TWReportingCapsaLogCategory(), "Started Capsa session. sessionId=%@", identifier->text());
      return identifier->text();
    }
    errorLog(TWReportingCapsaLogCategory(), "Started Capsa session, but no sessionId found!");
    return std::string(kNoneReturned);
  }
  if (!reply.contains(kFaultsignReplyReason)) {
    errorLog(TWReportingCapsaLogCategory(), "Failed starting capsa session. Unknown reason.");
  }
  logReason(reply.integer(kFaultsignReplyReason));
  return std::string(kNoneReturned);
}

FaultsignSignature TWReportingSessionCapsaWorker::signatureFromMessage(
    const TWReportingSessionMessage& message, const TWReportingSession& session,
    FaultsignReporter& symptomReporter) {
  return symptomReporter.signatureWithDomain(
      std::string(kSignatureDomain),
      TWReportingUtilityGenerateServiceNameFromServiceType(session.serviceType()),
      TWReportingUtilityCategoryString(message.category), TWReportingUtilityTypeString(message.type),
      session.clientProcessName(), std::nullopt);
}

}  // namespace tonewerk
