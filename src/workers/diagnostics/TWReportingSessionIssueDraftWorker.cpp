// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionIssueDraftWorker.h"

#include <cassert>
#include <optional>
#include <string>
#include <utility>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingDefaults.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionWorkerUtility.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr std::string_view kBackOffSeconds = "VidroInvalidXyBackOffSeconds";
constexpr std::string_view kLastRun = "VidroInvalidXyIDRlastRun";
constexpr std::string_view kComponentIdentifier = "VidroComponentIdentifier";

constexpr double kSettlingSeconds = 5.0;

// Values of the bug tracker's enumerations.
constexpr std::int32_t kReproducibility = 6;
constexpr std::int32_t kClassification = 7;

ReporterID identifierOf(const std::weak_ptr<TWReportingSession>& session) {
  const auto owner = session.lock();
  return owner == nullptr ? 0 : owner->reporterID();
}

// The handler only logs. It uses nothing that the context owns, because the answer may come after the context
// has ended. The platform's log outlives both.
IssueDraftService::CompletionHandler loggingHandler() {
  const LogCategory& own = *TWReportingSessionCategory();
  auto category = std::make_shared<LogCategory>(TWReportingContext::current().platform().log, own.subsystem(),
                                                own.code());
  return [category = std::move(category)](const std::optional<std::string>& error) {
    if (error) {
      errorLog(*category, "Error creating draft - %@", *error);
    } else {
      infoLog(*category, "Successfully created draft");
    }
  };
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionIssueDraftWorker::kWorkerClass =
    workerClassOf<TWReportingSessionIssueDraftWorker>("TWReportingSessionIssueDraftWorker");

std::shared_ptr<TWReportingSessionIssueDraftWorker> TWReportingSessionIssueDraftWorker::initWithSession(
    const std::shared_ptr<TWReportingSession>& session) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (!TWReportingUtilityIsInternalBuild()) return nullptr;
  const std::optional<Value> backOff = defaults().read(kBackOffSeconds);
  if (!backOff) {
    debugLog(TWReportingSessionCategory(), "%@ default not set. Skipping worker. reporterID=%lli",
             kBackOffSeconds, session->reporterID());
    return nullptr;
  }
  auto worker = std::make_shared<TWReportingSessionIssueDraftWorker>();
  worker->session = session;
  worker->backOffTime_ = backOff->number();
  return worker;
}

bool TWReportingSessionIssueDraftWorker::interestedInMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const double time = TWReportingSession::getEpochTimeFromTWReportingStateMessage(message);
  if (minimumMessageTime_ <= 0.0) {
    minimumMessageTime_ = time + kSettlingSeconds;
    return false;
  }
  if (!(time > minimumMessageTime_)) return false;
  if (!TWReportingSessionWorkerUtility::isVidroXYerrorMessage(message)) return false;
  return !hasRunInTimeframe(backOffTime_, kLastRun);
}

bool TWReportingSessionIssueDraftWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (!interestedInMessage(message)) return false;
  if (hasRun_) {
    debugLog(TWReportingSessionCategory(),
             "Issue draft has already run for VidroXYerrorMessage reporterID=%lli", identifierOf(session));
    return false;
  }
  hasRun_ = true;
  defaultLog(TWReportingSessionCategory(), "Starting issue draft for VidroXYerrorMessage reporterID=%lli",
             identifierOf(session));
  const auto owner = session.lock();
  TWReportingContext::current().platform().issueDrafts.createDraft(
      trackletDraftForVidroXYerror(), owner == nullptr ? std::nullopt : owner->clientProcessName(),
      "a Vidro spatial positioning error occurred", loggingHandler());
  return false;
}

void TWReportingSessionIssueDraftWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  debugLog(TWReportingSessionCategory(), "Resetting hasRun to false. reporterID=%lli", identifierOf(session));
  hasRun_ = false;
}

bool TWReportingSessionIssueDraftWorker::hasRunInTimeframe(double seconds, std::string_view defaultsKey) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const double now = TWReportingContext::current().platform().clock.now();
  const std::optional<Value> lastRun = defaults().read(defaultsKey);
  if (lastRun && lastRun->number() > now - seconds) {
    debugLog(TWReportingSessionCategory(), "Issue draft has run. key=%@ lastRun=%@", defaultsKey, *lastRun);
    return true;
  }
  debugLog(TWReportingSessionCategory(), "Issue draft has not run. key=%@ backoffSeconds=%f", defaultsKey,
           seconds);
  std::string problem;
  if (defaults().write(defaultsKey, now, &problem)) {
    errorLog(TWReportingSessionCategory(), "cannot keep %@: %@", defaultsKey, problem);
  }
  return false;
}

TrackletDraft TWReportingSessionIssueDraftWorker::trackletDraftForVidroXYerror() {
  const std::optional<Value> identifier = defaults().read(kComponentIdentifier);
  return {
      .title = "Invalid x/y coordinates during a Vidro call (IDR)",
      .problemDescription =
          "Invalid coordinates were provided to the audio layer during a Vidro call, making it impossible "
          "to render spatial audio correctly. Filing this tracklet will help determine what went wrong.",
      .component = {.name = "Vidro Core - Ringwork",
                    .version = "All",
                    .identifier = identifier ? identifier->integer() : 0},
      .reproducibility = kReproducibility,
      .classification = kClassification,
      .diagnosticExtensionIDs = {"com.orvane.DiagnosticExtensions.audio"}};
}

TWReportingDefaults& TWReportingSessionIssueDraftWorker::defaults() {
  TWReportingContext& context = TWReportingContext::current();
  return context.singletons().get<TWReportingDefaults>(context.platform().preferences);
}

}  // namespace tonewerk
