// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingContext.h"

#include <atomic>
#include <cassert>

#include "platform/DeviceFacts.h"
#include "platform/Log.h"
#include "platform/accounts/TurnQueue.h"
#include "session/TWReportingUtility.h"
#include "session/WeakQueueRef.h"

namespace tonewerk {
namespace {

constexpr std::string_view kSubsystem = "com.orvane.tonewerk";

// The daemon's only global object.
std::atomic<TWReportingContext*> currentContext = nullptr;

constexpr AudioEventType kLastTypeWithText = 18;  // "MemoryLog" (19) is shown but not read back

}  // namespace

TWReportingContext::LogCategories::LogCategories(Log& log)
    : client(log, kSubsystem, "twrc"),
      serviceDelegate(log, kSubsystem, "twrs"),
      session(log, kSubsystem, "twrr"),
      linkReport(log, kSubsystem, "twri"),
      driverUtility(log, kSubsystem, "twrd"),
      trace(log, kSubsystem, "twrt"),
      energybook(log, kSubsystem, "twrp"),
      diagwire(log, kSubsystem, "twra"),
      capsa(log, kSubsystem, "twrb"),
      summary(log, kSubsystem, "twru"),
      dp(log, kSubsystem, "twrl") {}

TWReportingContext::TWReportingContext(const Platform& platform,
                                       std::vector<const TWReportingSessionWorkerClass*> workerClasses)
    : logCategories(platform.log),
      platform_(platform),
      journal_(platform.journal, platform.clock),
      workerClasses_(std::move(workerClasses)) {
  [[maybe_unused]] TWReportingContext* before = currentContext.exchange(this);
  assert(before == nullptr);
}

TWReportingContext::~TWReportingContext() {
  endReportingServerQueue();
  endLinkReportQueues();
  fileSinkQueue_.reset();
  currentContext = nullptr;
}

TWReportingContext& TWReportingContext::current() {
  TWReportingContext* context = currentContext.load(std::memory_order_relaxed);
  assert(context != nullptr);
  return *context;
}

SerialQueue& TWReportingContext::reportingServerQueue() {
  std::call_once(reportingServerQueueOnce_, [this] {
    reportingServerQueue_ = platform_.queues.makeSerialQueue("com.orvane.tonewerk.reporting.server",
                                                             QueuePriority::kUserInteractive);
    reportingServerQueueRef_ = std::make_shared<WeakQueueRef>(*reportingServerQueue_);
    turns_ = std::make_shared<TurnQueue>(*reportingServerQueue_, platform_.clock, platform_.timers);
    livingReportingServerQueue_ = reportingServerQueue_.get();
  });
  return *livingReportingServerQueue_;
}

TurnQueue& TWReportingContext::turns() {
  reportingServerQueue();
  return *turns_;
}

bool TWReportingContext::isOnReportingServerQueue() const {
  const SerialQueue* queue = livingReportingServerQueue_;
  return queue == nullptr || queue->ownsThisThread();
}

std::shared_ptr<WeakQueueRef> TWReportingContext::reportingServerQueueRef() {
  reportingServerQueue();
  return reportingServerQueueRef_;
}

void TWReportingContext::endReportingServerQueue() {
  if (reportingServerQueueRef_ != nullptr) reportingServerQueueRef_->close();
  if (turns_ != nullptr) {
    turns_->finish();
    turns_->close();
  }
  reportingServerQueue_.reset();  // runs what is still queued, which may ask for the queue
  livingReportingServerQueue_ = nullptr;
}

SinkQueue& TWReportingContext::fileSinkQueue() {
  std::call_once(fileSinkQueueOnce_, [this] {
    fileSinkQueue_ = std::make_unique<SinkQueue>(
        platform_.queues.makeSerialQueue("com.orvane.tonewerk.reporting.files", QueuePriority::kUtility),
        "jsonFiles", logCategories.summary);
    sinks_.add([this] { return fileSinkQueue_->status(); });
  });
  return *fileSinkQueue_;
}

StrandPool& TWReportingContext::linkReportQueues() {
  std::call_once(linkReportQueuesOnce_, [this] {
    linkReportQueues_ = std::make_unique<StrandPool>(
        platform_.queues.makeSerialQueue("com.orvane.tonewerk.session.linkreport", QueuePriority::kUtility),
        "linkReport", logCategories.linkReport);
    sinks_.add([this] { return linkReportQueues_->status(); });
  });
  return *linkReportQueues_;
}

// Work that still waits for backends is lost, since no answer can come any more. Logs how much it was.
void TWReportingContext::endLinkReportQueues() {
  if (linkReportQueues_ == nullptr) return;
  linkReportQueues_->drain();
  const std::uint64_t lost = linkReportQueues_->droppedCount() + linkReportQueues_->heldCount();
  linkReportQueues_.reset();
  if (lost == 0) return;
  errorLog(logCategories.linkReport, "real-time-communication work dropped that waited for backends: %lu",
           lost);
}

bool TWReportingContext::isInternalBuild() {
  std::call_once(internalBuildOnce_, [this] {
    isInternalBuild_ = platform_.deviceFacts.boolean("InternalBuild").value_or(false);
  });
  return isInternalBuild_;
}

const TWReportingSessionWorkerRegistry& TWReportingContext::workerRegistry() {
  std::call_once(workerRegistryOnce_, [this] { workerRegistry_.emplace(workerClasses_); });
  return *workerRegistry_;
}

const TWReportingContext::Lookup& TWReportingContext::categoryLookup() {
  std::call_once(categoryLookupOnce_, [this] {
    for (AudioEventCategory category = 1; category <= 16; ++category) {
      categoryLookup_[TWReportingUtilityCategoryString(category)] = category;
    }
    categoryLookup_["Unknown"] = kCategoryUnknown;
  });
  return categoryLookup_;
}

const TWReportingContext::Lookup& TWReportingContext::typeLookup() {
  std::call_once(typeLookupOnce_, [this] {
    for (AudioEventType type = 0; type <= kLastTypeWithText; ++type) {
      typeLookup_[TWReportingUtilityTypeString(type)] = type;
    }
    typeLookup_["Unknown"] = kTypeUnknown;
  });
  return typeLookup_;
}

}  // namespace tonewerk
