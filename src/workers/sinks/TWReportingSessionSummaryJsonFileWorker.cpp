// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

#include <cassert>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/JournalPosition.h"
#include "session/ForEachMessage.h"
#include "session/LocalTime.h"
#include "session/MessageShapes.h"
#include "session/SinkQueue.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "values/Prefetch.h"
#include "workers/sinks/SummaryDirectory.h"
#include "workers/sinks/SummaryJsonFile.h"

namespace tonewerk {
namespace {

struct Entry {
  AudioEventCategory category;
  AudioEventType type;
  ValueMap payload;
};

// Made once, so that a message gets one without an allocation.
const ValueMapEntry kStarted{TWReportingMessageKeyIsSessionStarted, "YES"};
const ValueMapEntry kNotStarted{TWReportingMessageKeyIsSessionStarted, "NO"};

// Returns whether the file is there. Frees each payload while its bytes are in the caches, and asks for later
// ones meanwhile.
bool writeFile(SummaryJsonFile& file, std::vector<Entry>& entries) {
  constexpr std::size_t kAhead = 8;
  constexpr std::size_t kPayloadBytes = 192;
  for (std::size_t at = 0; at < entries.size(); ++at) {
    if (at + kAhead < entries.size()) prefetch(entries[at + kAhead].payload, kPayloadBytes);
    Entry& entry = entries[at];
    file.writeMessage(entry.category, entry.type, entry.payload);
    entry.payload = ValueMap();
  }
  return file.closeFile();
}

SummaryDirectory& summaryDirectory() {
  return TWReportingContext::current().singletons().get<SummaryDirectory>(
      TWReportingSessionSummaryJsonFileWorker::TWReportingLogsDirectory());
}

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
  const JournalPosition request = JournalPosition::current();
  const double now = request.sequence() == 0 ? clock.now() : request.at();
  return localTimeText(now, clock.utcOffset(now)) + "-" + std::to_string(session.reporterID()) + "-" +
         TWReportingUtilityRetrieveAppName(session.configuration()).string() + "-" +
         TWReportingUtilityGenerateServiceNameFromServiceType(session.serviceType()) + ".json";
}

// During a recovery, the files of sessions that had stopped may be there.
bool TWReportingSessionSummaryJsonFileWorker::isWrittenAlready(const std::string& name) {
  TWReportingContext& context = TWReportingContext::current();
  const std::size_t number = context.journal().countReport(name);
  if (number == 0) return false;
  return context.platform().files.exists(TWReportingLogsDirectory() + "/" +
                                         SummaryJsonFile::numbered(name, number));
}

void TWReportingSessionSummaryJsonFileWorker::tidyDirectory() {
  TWReportingContext::current().fileSinkQueue().post([] { summaryDirectory().tidy(); });
}

void TWReportingSessionSummaryJsonFileWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr || owner->messages().empty()) return;
  std::string name = fileNameFor(*owner);
  if (isWrittenAlready(name)) return;
  std::vector<Entry> entries;
  entries.reserve(owner->messages().size());
  std::size_t bytes = 0;
  forEachMessage(owner->messages(), [&](std::size_t, TWReportingSessionMessage& message) {
    if (message.isRedundant) return;
    setForAll(message.message, message.isSessionStarted ? kStarted : kNotStarted, owner->shapes());
    bytes += sizeof(Entry) + message.message.bytes();
    entries.push_back({message.category, message.type, message.message});
  });
  SinkQueue& queue = TWReportingContext::current().fileSinkQueue();
  // The queue counts and logs a file that is dropped because the disk hangs.
  static_cast<void>(queue.submit(
      bytes, [&queue, file = std::make_unique<SummaryJsonFile>(TWReportingLogsDirectory(), std::move(name)),
              entries = std::move(entries)]() mutable {
        if (!writeFile(*file, entries)) return queue.countLost();
        if (file->bytes() > 0) summaryDirectory().added(file->bytes());
      }));
}

}  // namespace tonewerk
