// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineDaemon.h"

#include <chrono>
#include <utility>

#include "monitor/TWReportingSystemMonitor.h"
#include "platform/JsonService.h"
#include "platform/accounts/TurnQueue.h"
#include "service/TWReportingService.h"
#include "tools/recording/RecordedProperties.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kFlushTimeout{60};

// The thread of the store takes rows only when it is told to flush. Where one batch ends and the next begins
// then depends on the recording alone. It has room for whatever is recorded meanwhile.
ReportStore::Limits storeLimits() {
  ReportStore::Limits limits;
  limits.rows = std::size_t{1} << 32;
  limits.bytes = std::size_t{1} << 48;
  limits.gather = std::chrono::hours(24);
  limits.batchRows = limits.rows;
  limits.batchBytes = limits.bytes;
  return limits;
}

double numberOr(double otherwise, std::string_view key, const ValueMap& map) {
  const Value* found = map.find(key);
  return found == nullptr ? otherwise : found->number();
}

std::uint32_t userOf(const ValueMap& map, std::uint32_t otherwise) {
  return static_cast<std::uint32_t>(numberOr(otherwise, recorded::kUser, map));
}

ValueMap factsOf(const ValueMap& device) {
  const Value* facts = device.find(recorded::kFacts);
  return facts == nullptr ? ValueMap() : *facts->asMap();
}

}  // namespace

OfflineDaemon::OfflineDaemon(const std::string& directory, const ValueMap& device, JsonService& json,
                             const LogCategory& log, OfflineConnections::Refusal refusal,
                             const std::atomic<bool>& isInterrupted)
    : isInterrupted_(isInterrupted),
      user_(userOf(device, kUser)),
      clock_(numberOr(kStartsAt, recorded::kStartsAt, device)),
      timers_(clock_),
      semaphores_(clock_, timers_),
      accounts_(user_, clock_),
      system_(clock_, numberOr(0.0, recorded::kUptime, device)),
      facts_(factsOf(device)),
      chanmeter_(json),
      json_(json),
      store_(directory, json, preferences_, clock_, accounts_, log, storeLimits()),
      metricon_(store_, preferences_, clock_, log),
      energybook_(store_, clock_),
      diagwire_(store_, clock_),
      linkReport_(store_, preferences_, clock_),
      context_(platform(), allWorkerClasses()),
      service_(makeService(device)),
      connections_(*service_, std::move(refusal)) {
  // The store's thread has then made the file and read the clock, which the replay is about to move.
  (void)store_.flush(kFlushTimeout);  // a failure is there at the next flush, too
}

OfflineDaemon::~OfflineDaemon() { TWReportingSystemMonitor::reset(); }

// The device is as the first line says before anything of the daemon asks for it.
std::shared_ptr<TWReportingService> OfflineDaemon::makeService(const ValueMap& device) {
  change(device);
  return TWReportingService::make([this] { hasEnded_ = true; });
}

Platform OfflineDaemon::platform() {
  return {.log = log_,
          .accounts = accounts_,
          .tracePoints = tracePoints_,
          .clock = clock_,
          .queues = queues_,
          .timers = timers_,
          .semaphores = semaphores_,
          .processes = processes_,
          .system = system_,
          .deviceFacts = facts_,
          .preferences = preferences_,
          .notifications = notifications_,
          .files = files_,
          .json = json_,
          .metricon = metricon_,
          .energybook = energybook_,
          .diagwire = diagwire_,
          .linkReport = linkReport_,
          .capsa = capsa_,
          .runtrace = runtrace_,
          .kolvi = kolvi_,
          .benchfile = benchfile_,
          .issueDrafts = issueDrafts_,
          .whirlcaps = whirlcaps_,
          .chanmeter = chanmeter_,
          .commands = commands_,
          .threads = threads_,
          .sessionBook = &sessionBook_,
          .logsDirectory = "/logs",
          .temporaryDirectory = "/tmp"};
}

void OfflineDaemon::take(const RecordedStep& step) {
  if (hasEnded_) return;
  runUntil(step.at);
  switch (step.kind) {
    case RecordedStep::Kind::kConnect:
      connect(step.client, step.properties);
      break;
    case RecordedStep::Kind::kDisconnect:
      connections_.disconnect(step.client);
      break;
    case RecordedStep::Kind::kDevice:
      change(step.properties);
      break;
    case RecordedStep::Kind::kRestart:
      endSessions();
      break;
    case RecordedStep::Kind::kCall:
      if (!connections_.has(step.client)) connect(step.client, {});
      queues_.runAll();
      connections_.send(step, clock_.now());
      break;
  }
  if (!hasEnded_) queues_.runAll();
}

void OfflineDaemon::runUntil(double seconds) {
  const auto time = std::chrono::round<std::chrono::nanoseconds>(std::chrono::duration<double>(seconds));
  while (!isInterrupted_ && timers_.runNextUntil(time)) queues_.runAll();
}

void OfflineDaemon::connect(std::int64_t client, const ValueMap& properties) {
  const Value* process = properties.find(recorded::kProcess);
  connections_.connect(client, processes_.add(process == nullptr ? kProcess : process->text()),
                       accounts_.of(userOf(properties, user_)));
}

void OfflineDaemon::change(const ValueMap& device) {
  system_.change(device);
  preferences_.change(device);
  if (device.contains(recorded::kPreferences)) metricon_.readConsumersAgain();
  (void)chanmeter_.change(device);  // checked before the replay
  notifications_.change(device);
}

bool OfflineDaemon::flush() { return store_.flush(kFlushTimeout); }

void OfflineDaemon::endSessions() {
  while (const auto client = connections_.first()) {
    connections_.disconnect(*client);
    queues_.runAll();
  }
  context_.reportingServerQueue().async([this] { service_->stopSingleMessageSessions(); });
  queues_.runAll();
}

void OfflineDaemon::end() {
  if (hasEnded_) return;
  endSessions();
  context_.turns().finish();
  hasEnded_ = true;
}

}  // namespace tonewerk
