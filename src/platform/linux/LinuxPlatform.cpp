// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxPlatform.h"

#include <filesystem>
#include <string>
#include <unistd.h>
#include <utility>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/channels/LinuxChanmeter.h"
#include "platform/linux/commands/LinuxCommandRunner.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/diagnostics/LinuxCapsa.h"
#include "platform/linux/diagnostics/LinuxIssueDraftService.h"
#include "platform/linux/diagnostics/LinuxWhirlcapRequest.h"
#include "platform/linux/diagnostics/collectors/StandardCollectors.h"
#include "platform/linux/directories/Directories.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/json/JsonBenchfile.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/log/CondensingLog.h"
#include "platform/linux/log/EscapingLog.h"
#include "platform/linux/log/FairLog.h"
#include "platform/linux/log/QueuedLog.h"
#include "platform/linux/log/RecentLines.h"
#include "platform/linux/log/RememberingLog.h"
#include "platform/linux/log/StandardLog.h"
#include "platform/linux/log/TroubleLog.h"
#include "platform/linux/messaging/AllocatorReclaimer.h"
#include "platform/linux/notifications/InotifyNotificationService.h"
#include "platform/linux/preferences/PreferenceWatcher.h"
#include "platform/linux/preferences/TomlDeviceFacts.h"
#include "platform/linux/preferences/TomlPreferenceStore.h"
#include "platform/linux/system/AccountPreferences.h"
#include "platform/linux/system/LinuxProcessInformation.h"
#include "platform/linux/system/LinuxSystemInformation.h"
#include "platform/linux/threads/LinuxDetachedThreads.h"
#include "platform/linux/threads/SystemClock.h"
#include "platform/linux/threads/ThreadQueueFactory.h"
#include "platform/linux/threads/ThreadSemaphores.h"
#include "platform/linux/threads/TimerThread.h"
#include "platform/linux/tracing/Tracing.h"
#include "platform/linux/tracing/UsdtTracePoints.h"

namespace tonewerk {
namespace {

// Returns `path` unchanged if the working directory does not exist any more.
std::string absolutePath(const std::string& path) {
  std::error_code error;
  const std::filesystem::path absolute = std::filesystem::absolute(path, error);
  return error ? path : absolute.string();
}

std::string temporaryDirectory() {
  std::error_code error;
  const std::filesystem::path path = std::filesystem::temp_directory_path(error);
  return error ? "/tmp" : path.string();
}

std::unique_ptr<QueuedLog> makeQueuedLog(const Clock& clock, QueuedLog*& made) {
  auto log = std::make_unique<QueuedLog>(makeStandardLog(clock), clock);
  log->writeLinesBeforeFatalSignals();
  made = log.get();
  return log;
}

// A line takes the way from below to above: lines that are held back cost nothing more, and whatever is
// written or kept is escaped.
std::unique_ptr<Log> makeLog(std::unique_ptr<QueuedLog> queuedLog, const Clock& clock,
                             const std::shared_ptr<RecentLines>& recentLines,
                             const std::shared_ptr<RecentTroubles>& troubles) {
  std::unique_ptr<Log> log = std::make_unique<RememberingLog>(std::move(queuedLog), recentLines, clock);
  log = std::make_unique<CondensingLog>(std::move(log), clock);
  log = std::make_unique<TroubleLog>(std::move(log), troubles, clock);
  log = std::make_unique<EscapingLog>(std::move(log));
  return std::make_unique<FairLog>(std::move(log), clock);
}

}  // namespace

struct LinuxPlatform::Adapters {
  explicit Adapters(const Directories& directories)
      : logsDirectory(absolutePath(directories.logs)),
        deviceFacts(directories.configuration + "/device-facts.toml", category),
        preferences(directories.configuration + "/preferences", directories.state + "/preferences", category),
        notifications(directories.runtime + "/notifications", timers, category),
        diagnostics(directories.state, makeStandardCollectors(logLines), json, preferences, clock, category,
                    {}),
        chanmeter(directories.runtime + "/channels", category, {}, &accounts) {}

  const std::string logsDirectory;
  SystemClock clock;
  Accounts accounts{::geteuid(), clock};
  const std::shared_ptr<RecentLines> logLines = std::make_shared<RecentLines>();
  const std::shared_ptr<RecentTroubles> troubles = std::make_shared<RecentTroubles>();
  QueuedLog* queuedLog = nullptr;  // a part of the log
  std::unique_ptr<Log> log = makeLog(makeQueuedLog(clock, queuedLog), clock, logLines, troubles);
  LogCategory category{*log, "com.orvane.tonewerk", "twrs"};  // the adapters' own lines
  UsdtTracePoints tracePoints;
  ThreadQueueFactory queues;
  TimerThread timers;
  ThreadSemaphores semaphores;
  LinuxProcessInformation processes{clock};
  LinuxSystemInformation system{clock};
  TomlDeviceFacts deviceFacts;
  TomlPreferenceStore preferences;
  PreferenceWatcher preferenceWatcher{preferences, category};
  InotifyNotificationService notifications;
  LinuxFileSystem files;
  NlohmannJsonService json;
  DiagnosticsStore diagnostics;
  LinuxIssueDraftService issueDrafts{diagnostics, queues};
  LinuxWhirlcapRequest whirlcaps{diagnostics, category};
  LinuxCapsa capsa{diagnostics, preferences, queues, timers, clock, category};
  LinuxChanmeter chanmeter;
  LinuxCommandRunner commands;
  LinuxDetachedThreads threads;
  AllocatorReclaimer memory{timers};
  JsonBenchfile benchfile{clock};
};

LinuxPlatform::LinuxPlatform(const Directories& directories)
    : adapters_(std::make_unique<Adapters>(directories)) {
  applyAccountPreferences(adapters_->accounts, adapters_->preferences, adapters_->category);
}
LinuxPlatform::~LinuxPlatform() = default;

Log& LinuxPlatform::log() { return *adapters_->log; }
SinkStatus LinuxPlatform::logStatus() { return adapters_->queuedLog->status(); }
std::vector<LoggedTrouble> LinuxPlatform::troubles() const { return adapters_->troubles->all(); }
bool LinuxPlatform::flushLog(std::chrono::milliseconds timeout) {
  return adapters_->queuedLog->flush(timeout);
}
Accounts& LinuxPlatform::accounts() { return adapters_->accounts; }
Clock& LinuxPlatform::clock() { return adapters_->clock; }
SerialQueueFactory& LinuxPlatform::queues() { return adapters_->queues; }
TimerService& LinuxPlatform::timers() { return adapters_->timers; }
PreferenceStore& LinuxPlatform::preferences() { return adapters_->preferences; }
AllocatorReclaimer& LinuxPlatform::memory() { return adapters_->memory; }
JsonService& LinuxPlatform::json() { return adapters_->json; }
FileSystem& LinuxPlatform::files() { return adapters_->files; }
LinuxCapsa& LinuxPlatform::capsa() { return adapters_->capsa; }
DiagnosticsStore& LinuxPlatform::diagnostics() { return adapters_->diagnostics; }

void LinuxPlatform::readConfigurationAgain() {
  adapters_->deviceFacts.readAgain();
  adapters_->preferences.checkAllFiles();
  applyAccountPreferences(adapters_->accounts, adapters_->preferences, adapters_->category);
  adapters_->notifications.callAllHandlers();  // users of preferences read them again then
}

void LinuxPlatform::restoreRuntimeDirectory() { adapters_->notifications.makeDirectory(); }

Platform LinuxPlatform::platform(Clock& clock, Metricon& metricon, Energybook& energybook, Diagwire& diagwire,
                                 LinkReport& linkReport, const Tracing& tracing, Journal& journal) {
  Adapters& a = *adapters_;
  return {.log = *a.log,
          .accounts = a.accounts,
          .tracePoints = a.tracePoints,
          .clock = clock,
          .queues = a.queues,
          .timers = a.timers,
          .semaphores = a.semaphores,
          .processes = a.processes,
          .system = a.system,
          .deviceFacts = a.deviceFacts,
          .preferences = a.preferences,
          .notifications = a.notifications,
          .files = a.files,
          .json = a.json,
          .metricon = metricon,
          .energybook = energybook,
          .diagwire = diagwire,
          .linkReport = linkReport,
          .capsa = a.capsa,
          .runtrace = *tracing.runtrace,
          .kolvi = *tracing.kolvi,
          .benchfile = a.benchfile,
          .issueDrafts = a.issueDrafts,
          .whirlcaps = a.whirlcaps,
          .chanmeter = a.chanmeter,
          .commands = a.commands,
          .threads = a.threads,
          .journal = &journal,
          .logsDirectory = a.logsDirectory,
          .temporaryDirectory = temporaryDirectory()};
}

}  // namespace tonewerk
