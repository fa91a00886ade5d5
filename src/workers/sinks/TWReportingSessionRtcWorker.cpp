// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionRtcWorker.h"

#include <cassert>
#include <utility>

#include "platform/Log.h"
#include "session/StrandPool.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "workers/sinks/RtcReporter.h"

namespace tonewerk {

const TWReportingSessionWorkerClass TWReportingSessionRtcWorker::kWorkerClass =
    workerClassOf<TWReportingSessionRtcWorker>("TWReportingSessionRtcWorker");

std::shared_ptr<TWReportingSessionRtcWorker> TWReportingSessionRtcWorker::initWithSession(
    const std::shared_ptr<TWReportingSession>& session) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (session->serviceType() == kServiceTest) return nullptr;
  auto worker = std::make_shared<TWReportingSessionRtcWorker>();
  worker->session = session;
  return worker;
}

bool TWReportingSessionRtcWorker::shouldBatchLinkReportEventsForServiceType(AudioServiceType serviceType) {
  return serviceType != kServiceApiUsage;
}

std::uint16_t TWReportingSessionRtcWorker::retrieveLinkReportCategoryFromCategory(
    AudioEventCategory category) {
  return static_cast<std::uint16_t>(category & 0xFFFF);
}

void TWReportingSessionRtcWorker::makeQueueOnFirstUse() {
  if (linkReportQueue_ != nullptr) return;
  linkReportQueue_ = TWReportingContext::current().linkReportQueues().makeStrand();
  reporter_ = std::make_shared<RtcReporter>(linkReportQueue_);
}

std::optional<bool> TWReportingSessionRtcWorker::start() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr || owner->serviceType() == kServiceTest) return false;
  RtcReporter::Start start;
  start.configuration = owner->configuration();
  start.serviceName = owner->serviceName() + "_session";
  start.serviceType = owner->serviceType();
  start.reporterID = owner->reporterID();
  start.isSingleMessageSession = owner->isSingleMessageSession();
  makeQueueOnFirstUse();
  const std::size_t bytes = sizeof(start) + start.configuration.bytes();
  isStartDropped_ = !linkReportQueue_->submit(
      bytes, [reporter = reporter_, held = std::move(start)] { reporter->start(held); });
  if (!isStartDropped_) ++starts_;
  return true;
}

bool TWReportingSessionRtcWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (isStartDropped_) return false;
  makeQueueOnFirstUse();
  if (reporter_->isQuick() && linkReportQueue_->runAtOnce([&] { reporter_->handleMessage(message); })) {
    return false;
  }
  auto record = std::make_unique<TWReportingSessionMessage>(message.message, message.category, message.type);
  const std::size_t bytes = sizeof(TWReportingSessionMessage) + record->message.bytes();
  linkReportQueue_->submit(
      bytes, [reporter = reporter_, held = std::move(record)] { reporter->handleMessage(*held); });
  return false;
}

void TWReportingSessionRtcWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr || std::exchange(isStartDropped_, false)) return;
  makeQueueOnFirstUse();
  // Without backends there is no summary, and so nothing to copy; only a debug line says that a message is.
  const bool needsCopies =
      !reporter_->isSilentSince(starts_) || TWReportingSessionCategory()->isEnabled(LogLevel::kDebug);
  if (!needsCopies && linkReportQueue_->runAtOnce([&] { reporter_->stop(); })) return;
  TWReportingSessionMessages copies;
  copies.reserve(owner->messages().size());
  std::size_t bytes = 0;
  for (const auto& message : owner->messages()) {
    copies.push_back(message->copyWithZone());
    bytes += sizeof(TWReportingSessionMessage) + message->message.bytes();
  }
  // Without room for the summary it is dropped, but the session is ended in any case: it would stay open, and
  // the next start would find it. There is one such piece for each start that was taken.
  linkReportQueue_->submit(
      bytes, [reporter = reporter_, held = std::move(copies), serviceType = owner->serviceType(),
              reporterID = owner->reporterID()] { reporter->sendSummary(held, serviceType, reporterID); });
  linkReportQueue_->post([reporter = reporter_] { reporter->stop(); });
}

}  // namespace tonewerk
