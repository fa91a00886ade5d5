// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/RtcReporter.h"

#include <cassert>
#include <new>
#include <string_view>
#include <utility>

#include "platform/Log.h"
#include "platform/MemoryReserve.h"
#include "platform/TimerService.h"
#include "session/StrandPool.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingUtility.h"
#include "values/CompactJson.h"
#include "workers/sinks/RtcSummary.h"
#include "workers/sinks/TWReportingSessionRtcWorker.h"

namespace tonewerk {
namespace {

const Value TWReportingClientNameTonewerk("com.orvane.tonewerk");
constexpr double TWReportingVersionNumber = 2.1;
constexpr std::int64_t kClientType = 19;
const SharedString kSessionIdentifierKey("TWReportingSessionID");
const FixedLogLine kMessageNeverStarted("Session never started. handleMessage");

std::string textOf(const LinkReportSession::Payload& payload) {
  std::string text;
  appendCompactJson(text, payload.entries, payload.hidden);
  return text;
}

}  // namespace

RtcReporter::RtcReporter(std::shared_ptr<Strand> queue) : queue_(std::move(queue)) {}

RtcReporter::~RtcReporter() = default;

void RtcReporter::start(const Start& start) {
  assert(queue_->ownsThisThread());
  debugLog(TWReportingSessionLinkReportCategory(), "entering linkreport %s", "start");
  LinkReport& service = TWReportingContext::current().platform().linkReport;
  linkReportAgentToken_ = service.newHierarchyTokenFromParentToken(std::nullopt);
  if (!linkReportAgentToken_) {
    errorLog(TWReportingSessionLinkReportCategory(),
             "newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. %s", "start");
    return;
  }
  linkReportSession_ =
      service.initWithSessionInfo(sessionInfoOf(start, *linkReportAgentToken_), userInfoOf(start), nullptr);
  waitForBackends();
}

ValueMap RtcReporter::sessionInfoOf(const Start& start, const std::string& token) {
  const bool batch =
      TWReportingSessionRtcWorker::shouldBatchLinkReportEventsForServiceType(start.serviceType);
  ValueMap info;
  info.reserve(7);
  info.add(kLinkReportSessionInfoClientType, kClientType);
  info.add(kLinkReportSessionInfoClientVersion, TWReportingVersionNumber);
  info.add(kLinkReportSessionInfoSessionID, start.reporterID);
  info.add(kLinkReportSessionInfoBatchEvent, batch);
  info.add(kLinkReportSessionInfoHierarchyToken, token);
  info.add(kLinkReportSessionInfoContainsRealtimeEvents, !batch);
  if (const Value* application = start.configuration.find(TWReportingApplicationName)) {
    info.add(kLinkReportSessionInfoClientBundleID, *application);
  }
  return info;
}

ValueMap RtcReporter::userInfoOf(const Start& start) {
  const std::string serviceName =
      start.isSingleMessageSession ? TWReportingUtilityGenerateServiceNameFromServiceType(start.serviceType)
                                   : start.serviceName;
  ValueMap info;
  info.reserve(3 + start.configuration.size());
  info.add(kLinkReportUserInfoClientName, TWReportingClientNameTonewerk);
  info.add(kSessionIdentifierKey, start.reporterID);
  info.add(kLinkReportUserInfoServiceName, serviceName);
  info.merge(start.configuration);
  return info;
}

// The wait holds the queue, not the thread: the queues of other sessions run on it.
void RtcReporter::waitForBackends() {
  const std::uint64_t run = ++run_;
  hasAnswer_ = false;
  linkReportSessionStarted_ = false;
  linkReportSession_->startConfigurationWithCompletionHandler(
      [weak = weak_from_this(), run](const LinkReportSession::Backends& backends) {
        const auto self = weak.lock();
        if (self == nullptr) return;
        self->queue_->interrupt([weak, run, backends] {
          if (const auto alive = weak.lock()) alive->takeBackends(run, backends);
        });
      });
  debugLog(TWReportingSessionLinkReportCategory(), "waiting to find backends");
  if (hasAnswer_) {
    endWait();
    return;
  }
  queue_->hold();
  timeout_ =
      TWReportingContext::current().platform().timers.repeat(kBackendTimeout, [weak = weak_from_this(), run] {
        const auto self = weak.lock();
        if (self == nullptr) return;
        self->queue_->interrupt([weak, run] {
          if (const auto alive = weak.lock()) alive->takeTimeout(run);
        });
      });
}

// An answer after the time-out still lets later messages be sent.
void RtcReporter::takeBackends(std::uint64_t run, const LinkReportSession::Backends& backends) {
  if (run != run_ || linkReportSession_ == nullptr) return;
  hasAnswer_ = true;
  linkReportSessionStarted_ = backends.has_value();
  silentSince_.store(backends ? 0 : run, std::memory_order_release);
  isQuick_.store(!backends || linkReportSession_->isQuick(), std::memory_order_relaxed);
  if (backends) {
    defaultLog(TWReportingSessionLinkReportCategory(), "list of backends %@", *backends);
  } else {
    errorLog(TWReportingSessionLinkReportCategory(),
             "no backends found, this session won't get sent to the server");
  }
  if (queue_->isHeld()) endWait();
}

void RtcReporter::takeTimeout(std::uint64_t run) {
  if (run != run_ || !queue_->isHeld()) return;
  errorLog(TWReportingSessionLinkReportCategory(), "timed out waiting for backends");
  resume();
}

void RtcReporter::endWait() {
  debugLog(TWReportingSessionLinkReportCategory(), "%s",
           linkReportSessionStarted_ ? "continuing with backends!" : "failed to find backend");
  resume();
}

void RtcReporter::resume() {
  timeout_.reset();
  if (const std::uint64_t dropped = queue_->takeDroppedCount(); dropped > 0) {
    errorLog(TWReportingSessionLinkReportCategory(),
             "dropped while waiting for backends, for want of room: %lu", dropped);
  }
  queue_->release();
}

void RtcReporter::handleMessage(const TWReportingSessionMessage& message) {
  assert(queue_->ownsThisThread());
  if (!linkReportSessionStarted_) {
    kMessageNeverStarted.write(LogLevel::kDefault, *TWReportingSessionLinkReportCategory());
    return;
  }
  sendMessage(message);
}

void RtcReporter::sendMessage(const TWReportingSessionMessage& message) {
  debugLog(TWReportingSessionLinkReportCategory(), "entering linkreport %s", "_sendMessage");
  const std::uint16_t category =
      TWReportingSessionRtcWorker::retrieveLinkReportCategoryFromCategory(message.category);
  LinkReportSession::Payload payload{message.message};
  if (!TWReportingUtilityIsInternalBuild()) payload.hidden = TWReportingInternalEventEpochTime;
  std::string problem;
  if (linkReportSession_->sendMessageWithCategory(category, message.type, payload, problem)) {
    debugLog(
        TWReportingSessionLinkReportCategory(), "LinkReportAgent %@ : message %@ : category %i : type %i",
        *linkReportSession_, [&payload] { return textOf(payload); }, category, message.type);
  } else if (!problem.empty()) {
    errorLog(TWReportingSessionLinkReportCategory(), "error sending message %@", problem);
  }
}

void RtcReporter::sendSummary(const TWReportingSessionMessages& messages, AudioServiceType serviceType,
                              ReporterID reporterID) {
  assert(queue_->ownsThisThread());
  if (!linkReportSessionStarted_ || messages.empty()) return;
  // It takes as much memory as all texts of the session, which may be what has made memory short.
  ValueMap texts;
  try {
    if (MemoryReserve::isShort()) throw std::bad_alloc();
    texts = rtcSummaryOf(messages, serviceType, TWReportingSessionRtcWorker::kWorkerClass);
  } catch (const std::bad_alloc&) {
    errorLog(TWReportingSessionLinkReportCategory(),
             "memory is short: the rtc summary event is left out. reporterID=%lli", reporterID);
    return;
  }
  const TWReportingSessionMessage summary(std::move(texts), kCategoryUnknown, kTypeUnknown);
  defaultLog(TWReportingSessionLinkReportCategory(), "sending rtc summary event. reporterID=%lli",
             reporterID);
  for (const ValueMap::Entry& entry : summary.message) {
    debugLog(TWReportingSessionLinkReportCategory(), "sending rtc summary event. reporterID=%lli %@=\"%@\"",
             reporterID, entry.key, entry.value);
  }
  sendMessage(summary);
}

void RtcReporter::stop() {
  assert(queue_->ownsThisThread());
  if (!linkReportSessionStarted_) {
    defaultLog(TWReportingSessionLinkReportCategory(), "Session never started. %s", "stop");
    return;
  }
  debugLog(TWReportingSessionLinkReportCategory(), "entering linkreport %s", "stop");
  linkReportSession_->flushMessages();
  linkReportSession_.reset();
  linkReportAgentToken_.reset();
  linkReportSessionStarted_ = false;
  debugLog(TWReportingSessionLinkReportCategory(), "stopping and setting session to nil");
}

}  // namespace tonewerk
