// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

#include <cassert>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "session/LocalTime.h"
#include "session/MessageShapes.h"
#include "session/SinkQueue.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "workers/sinks/SummaryJsonFile.h"

namespace tonewerk {
namespace {

struct Entry {
  AudioEventCategory category;
  AudioEventType type;
  ValueMap payload;
};

// Made once, so that a message gets one without an allocation.
const Value kYes("YES");
const Value kNo("NO");

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionSummaryJsonFileWorker::kWorkerClass =
    workerClassOf<TWReportingSessionSummaryJsonFileWorker>("TWReportingSessionSummaryJsonFileWorker");

std::shared_ptr<TWReportingSessionSummaryJsonFileWorker>
TWReportingSessionSummaryJsonFileWorker::initWithSession(const std::shared_ptr<TWReportingSession>& session) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (session->serviceType() != kServiceTest && !TWReportingUtilityIsInternalBuild()) return nullptr;
  auto worker = std::make_shared<TWReportingSessionSummaryJsonFileWorker>();
  worker->session = session;
  worker->started = true;
  return worker;
}

std::string TWReportingSessionSummaryJsonFileWorker::TWReportingLogsDirectory() {
  return TWReportingContext::current().platform().logsDirectory + "/Audio/Reporting";
}

std::string TWReportingSessionSummaryJsonFileWorker::fileNameFor(const TWReportingSession& session) {
  const Clock& clock = TWReportingContext::current().platform().clock;
  const double now = clock.now();
  return localTimeText(now, clock.utcOffset(now)) + "-" + std::to_string(session.reporterID()) + "-" +
         TWReportingUtilityRetrieveAppName(session.configuration()).string() + "-" +
         TWReportingUtilityGenerateServiceNameFromServiceType(session.serviceType()) + ".json";
}

void TWReportingSessionSummaryJsonFileWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr || owner->messages().empty()) return;
  std::vector<Entry> entries;
  entries.reserve(owner->messages().size());
  std::size_t bytes = 0;
  for (const auto& message : owner->messages()) {
    if (message->isRedundant) continue;
    setForAll(message->message,
              {TWReportingMessageKeyIsSessionStarted, message->isSessionStarted ? kYes : kNo},
              owner->shapes());
    bytes += sizeof(Entry) + message->message.bytes();
    entries.push_back({message->category, message->type, message->message});
  }
  TWReportingContext::current().fileSinkQueue().submit(
      bytes, [file = std::make_unique<SummaryJsonFile>(TWReportingLogsDirectory(), fileNameFor(*owner)),
              entries = std::move(entries)] {
        for (const Entry& entry : entries) file->writeMessage(entry.category, entry.type, entry.payload);
        file->closeFile();
      });
}

}  // namespace tonewerk
