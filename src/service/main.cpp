// SPDX-License-Identifier: Apache-2.0
//
// twreportingd: puts the daemon together and runs it until a signal or the kill request ends it.

#include <algorithm>
#include <array>
#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <initializer_list>
#include <iostream>
#include <memory>
#include <optional>
#include <pthread.h>
#include <string>
#include <string_view>
#include <sys/resource.h>
#include <system_error>
#include <unistd.h>

#include "monitor/TWReportingSystemMonitor.h"
#include "platform/DaemonStatus.h"
#include "platform/Heartbeat.h"
#include "platform/JournalPreferences.h"
#include "platform/Log.h"
#include "platform/MemoryReserve.h"
#include "platform/Platform.h"
#include "platform/SinkStatus.h"
#include "platform/TimerService.h"
#include "platform/accounts/TurnQueue.h"
#include "platform/linux/LinuxPlatform.h"
#include "platform/linux/dbus/DbusListener.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/diagnostics/LinuxCapsa.h"
#include "platform/linux/directories/Directories.h"
#include "platform/linux/directories/SocketPaths.h"
#include "platform/linux/journal/BatchedJournal.h"
#include "platform/linux/journal/PlayedClock.h"
#include "platform/linux/journal/RecoveryAttempts.h"
#include "platform/linux/journal/SegmentJournal.h"
#include "platform/linux/messaging/AllocatorReclaimer.h"
#include "platform/linux/notifications/DirectoryWatcher.h"
#include "platform/linux/otlp/CurlHttpClient.h"
#include "platform/linux/otlp/LinuxLinkReport.h"
#include "platform/linux/socket/ServerSocket.h"
#include "platform/linux/socket/UnixSocketListener.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/StoreDiagwire.h"
#include "platform/linux/store/StoreEnergybook.h"
#include "platform/linux/store/StoreMetricon.h"
#include "platform/linux/store/StoreSessionBook.h"
#include "platform/linux/system/Heartbeats.h"
#include "platform/linux/system/ServiceManager.h"
#include "platform/linux/system/WatchdogFeeder.h"
#include "platform/linux/threads/WakingClock.h"
#include "platform/linux/tracing/Tracing.h"
#include "platform/linux/tracing/TracingSetup.h"
#include "protocol/Requests.h"
#include "recovery/SessionRecovery.h"
#include "service/JournalUpkeep.h"
#include "service/TWReportingClientServerInstance.h"
#include "service/TWReportingService.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"
#include "values/Mutex.h"
#include "workers/TWReportingWorkerClasses.h"
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

namespace tonewerk {
namespace {

constexpr int kSuccess = 0;
constexpr int kFailure = 1;
constexpr int kUsage = 2;
constexpr int kKilled = 2;

// How long the end of the daemon waits for a disk that does not answer.
constexpr std::chrono::seconds kFlushTimeout{10};
// How long it waits for network endpoints.
constexpr std::chrono::seconds kNetworkTimeout{5};
// How long it waits for a log that takes no lines.
constexpr std::chrono::seconds kLogTimeout{2};
// After this time the end waits for nothing any more: a thread of the daemon hangs.
constexpr std::chrono::seconds kLongestEnd{60};
// How long the next part of a recovery may take, until the next word of progress.
constexpr std::chrono::seconds kRecoveryStep{60};
// How long it still collects evidence.
constexpr std::chrono::seconds kDiagnosticsTimeout{3};

constexpr std::string_view kHelp =
    "Usage: twreportingd [--help | --version]\n"
    "\n"
    "The reporting daemon: takes what audio processes report on a Unix socket and turns it into reports.\n"
    "It ends in order on SIGTERM and SIGINT, at once on a second one. SIGHUP has preferences and device "
    "facts\n"
    "read again, SIGUSR1 a line of status logged.\n"
    "\n"
    "Variables: RUNTIME_DIRECTORY, STATE_DIRECTORY, LOGS_DIRECTORY and CONFIGURATION_DIRECTORY say where "
    "things\n"
    "are, TONEWERK_LOG what is logged (debug, info, default, error, or a list such as twrr=debug,default).\n";

// The messaging thread feeds the service manager's watchdog, if there is one, while the heartbeats are alive.
std::unique_ptr<WatchdogFeeder> watchdogOf(const ServiceManager& manager, const Clock& clock,
                                           Heartbeats& heartbeats) {
  const auto interval = manager.pingInterval();
  if (!interval) return nullptr;
  const auto ping = [&manager] { manager.ping(); };
  return std::make_unique<WatchdogFeeder>(*interval, clock, ping, &heartbeats);
}

// The journal logs wrong values.
JournalUpkeep::Bounds journalBounds(const PreferenceStore& preferences) {
  std::string problems;
  const JournalPreferences read = readJournalPreferences(preferences, problems);
  const auto interval = std::chrono::ceil<std::chrono::seconds>(read.syncInterval);
  return {.interval = std::max(interval, std::chrono::seconds(1)), .bytes = read.bytes};
}

DbusNames dbusNames() {
  return {"com.orvane.tonewerk.reporting", "/com/orvane/tonewerk/reporting",
          "com.orvane.tonewerk.TWReportingServiceProtocol"};
}

// Tells the service manager and the log from time to time how far a recovery is.
class RecoveryProgress {
 public:
  RecoveryProgress(const ServiceManager& manager, const LogCategory& log) : manager_(manager), log_(log) {}

  void played(std::uint64_t records) {
    const Time now = Time::clock::now();
    if (now < toldAt_ + kTellEvery) return;
    toldAt_ = now;
    const std::string text = "Recovering sessions: " + std::to_string(records) + " requests";
    manager_.tellProgress(text, kRecoveryStep);
    if (now < loggedAt_ + kLogEvery) return;
    loggedAt_ = now;
    defaultLog(log_, "recovering sessions: %llu requests so far", records);
  }

 private:
  using Time = std::chrono::steady_clock::time_point;
  static constexpr std::chrono::seconds kTellEvery{1};
  static constexpr std::chrono::seconds kLogEvery{10};

  const ServiceManager& manager_;
  const LogCategory& log_;
  Time loggedAt_ = Time::clock::now();
  Time toldAt_ = loggedAt_ - kTellEvery;  // at once, because one request may take long
};

// Holds the daemon's parts, in the order in which they depend on each other.
class Daemon {
 public:
  Daemon(const Directories& directories, std::unique_ptr<ServerSocket> socket, LinuxPlatform& linux,
         const ServiceManager& manager, const LogCategory& log)
      : manager_(manager),
        status_("Listening on " + socket->name()),
        linux_(linux),
        runtimeDirectory_(directories.runtime),
        log_(log),
        clock_(linux.clock()),
        daemonStatus_(statusOf(directories)),
        heartbeats_(log),
        attempts_(directories.state + "/journal", log),
        segments_(directories.state + "/journal", linux.preferences(), log),
        store_(directories.state, linux.json(), linux.preferences(), storeClock_, linux.accounts(), log, {},
               [this] { writeJournal(); }),
        metricon_(store_, linux.preferences(), clock_, log),
        energybook_(store_, clock_),
        diagwire_(store_, clock_),
        linkReport_(store_, linux.preferences(), linux.clock(), log, TONEWERK_VERSION,
                    [] { return std::make_unique<CurlHttpClient>("twreportingd/" TONEWERK_VERSION); }),
        tracing_(makeTracing({tracesDirectory(directories.state), signpostLibraryName(), traceReaderPath(),
                              linux.files(), linux.json(), linux.timers(), log})),
        capsa_(linux.capsa()),
        diagnostics_(linux.diagnostics()),
        context_(platformOf(linux, directories), allWorkerClasses()),
        service_(TWReportingService::make([this] { endOnKillRequest(); })),
        listener_(std::move(socket), log, linux.accounts(), watchdogOf(manager, linux.clock(), heartbeats_),
                  &linux.memory(), [this] { writeJournal(); }),
        dbusListener_(dbusNames(), requests::all(), dbusAddressFromEnvironment(), log, linux.accounts(),
                      &linux.memory()) {}

  // Recovers what the last daemon left, and serves clients. False when the system gives no descriptors for
  // that, which it logs. Then nothing was recovered, and there is nothing to end in order.
  [[nodiscard]] bool start() {
    if (!canServe(listener_.problem()) || !canServe(dbusListener_.problem())) return false;
    diagnostics_.removeLeftovers();  // this daemon has the socket, so no other one writes there
    TWReportingSessionSummaryJsonFileWorker::tidyDirectory();
    // Read once here, so that reading the device facts again later does not change it.
    hasSignposts_ = context_.isInternalBuild() && isTracingBuiltIn();
    recover();
    if (journalBounds(linux_.preferences()).bytes == 0) context_.journal().turnOff();
    upkeep_ = std::make_unique<JournalUpkeep>(
        journal_, context_,
        JournalUpkeep::Reports{.recorded = [this] { return store_.recordedRows(); },
                               .areWritten = [this](std::uint64_t rows) { return store_.hasWritten(rows); },
                               .sync = [this] { return store_.sync(); }},
        [this] { return journalBounds(linux_.preferences()); });
    watchHeartbeats();
    addSinks();
    listener_.setDelegate(*service_);
    listener_.resume();
    dbusListener_.setDelegate(*service_);
    dbusListener_.resume();
    runtimeWatcher_ = std::make_unique<DirectoryWatcher>(
        runtimeDirectory_, [](std::string_view) {}, [this] { restoreRuntimeDirectory(); }, log_);
    restoreRuntimeDirectory();  // it may have been removed before it was watched
    manager_.tellReady(status_);
    return true;
  }

  // Reads the preferences and device facts again, and restores the runtime directory with the socket.
  void reload() {
    manager_.tellReloading();
    linux_.readConfigurationAgain();
    metricon_.readConsumersAgain();
    store_.readBoundsAgain();
    restoreRuntimeDirectory();
    defaultLog(log_, "preferences and device facts are read again");
    manager_.tellReady(status_);
  }

  // Logs one line of status.
  void logStatus() {
    context_.reportingServerQueue().async([this] {
      std::size_t sessions = 0;
      for (const auto& client : service_->getAllClients())
        sessions += client->clientReportingSessionMap().size();
      defaultLog(log_, "status: clients %zu, their sessions %zu", service_->getAllClients().size(), sessions);
    });
  }

  // Ends the daemon in order. Every client is treated as lost, so that its started sessions stop and report.
  // False when some reports could not be written.
  [[nodiscard]] bool endInOrder() {
    manager_.tellStopping("Finishing sessions and reports");
    runtimeWatcher_ = nullptr;
    listener_.shutDown();
    dbusListener_.shutDown();
    context_.turns().finish();
    SerialQueue& queue = context_.reportingServerQueue();
    queue.async([this] {
      service_->stopSingleMessageSessions();
      TWReportingSystemMonitor::reset();  // while the queue of its handlers exists
    });
    queue.drain();
    if (!flushSinks()) return false;
    queue.async([this] { upkeep_->dropNow(); });
    queue.drain();
    return true;
  }

  // Whether the destructor would wait for a disk that does not answer.
  bool hangs() {
    const std::array statuses{store_.status(), diagnostics_.status(), context_.fileSinkQueue().status(),
                              context_.linkReportQueues().status()};
    const auto hung = std::find_if(statuses.begin(), statuses.end(),
                                   [](const SinkStatus& status) { return status.hangs.count() > 0; });
    if (hung == statuses.end()) return false;
    errorLog(log_, "%@ hangs; what is not written is lost: %llu", hung->name, hung->waiting);
    return true;
  }

 private:
  bool canServe(const std::error_code& problem) const {
    if (problem) errorLog(log_, "cannot serve: %@", problem.message());
    return !problem;
  }

  void recover() {
    SessionRecovery recovery({journal_, attempts_, store_, linux_.accounts(), context_, *service_, log_});
    if (!recovery.begin(store_.marks())) return;
    SerialQueue& queue = context_.reportingServerQueue();
    queue.async([&] {
      RecoveryProgress progress(manager_, log_);
      recovery.play([&progress](std::uint64_t requests) { progress.played(requests); });
    });
    queue.drain();
    recovery.end();
    if (areReportsWritten()) recovery.forget();
  }

  // What was answered or stored must be in the journal. It logs a failure, and tries again with the next
  // record.
  void writeJournal() { (void)journal_.write(); }

  // The messaging thread needs none: it feeds the watchdog itself.
  void watchHeartbeats() {
    heartbeats_.watch("the store", store_.heartbeat());
    heartbeats_.watch("D-Bus", dbusListener_.heartbeat());
    context_.reportingServerQueue().async(
        [this] { heartbeats_.watch("the work queue", Heartbeat::ofThisThread()); });
  }

  void addSinks() {
    SinkList& sinks = context_.sinks();
    sinks.add([this] { return store_.status(); });
    sinks.add([this] { return diagnostics_.status(); });
    sinks.add([this] { return linkReport_.status(); });
    sinks.add([this] { return linux_.logStatus(); });
  }

  void markSignposts() {
    if (const std::error_code error = setSignpostMark(runtimeDirectory_, hasSignposts_)) {
      errorLog(log_, "cannot tell programs about signposts: %@", error.message());
    }
  }

  // Restores what the daemon keeps in the directory, which may have been removed and made again without it.
  void restoreRuntimeDirectory() {
    listener_.restoreSocket();
    std::error_code error;
    if (!std::filesystem::is_directory(runtimeDirectory_, error)) return;
    linux_.restoreRuntimeDirectory();
    markSignposts();
  }

  DaemonStatus statusOf(const Directories& directories) {
    return {.version = TONEWERK_VERSION,
            .processIdentifier = ::getpid(),
            .user = ::geteuid(),
            .startedAt = linux_.clock().now(),
            .startedAtSteady = std::chrono::steady_clock::now(),
            .runtimeDirectory = directories.runtime,
            .stateDirectory = directories.state,
            .configurationDirectory = directories.configuration,
            .endpoints = [this] { return linkReport_.endpoints(); },
            .troubles = [this] { return linux_.troubles(); }};
  }

  Platform platformOf(LinuxPlatform& linux, const Directories& directories) {
    Platform platform =
        linux.platform(clock_, metricon_, energybook_, diagwire_, linkReport_, tracing_, journal_);
    platform.sessionBook = &sessionBook_;
    platform.status = &daemonStatus_;
    platform.logsDirectory = directories.logs;
    return platform;
  }

  // Ends the process without stopping sessions. What the sinks already have is written.
  [[noreturn]] void endOnKillRequest() {
    const MutexLock lock(killMutex_);
    manager_.tellStopping("Killed by a client; finishing reports");
    (void)flushSinks();
    (void)linux_.flushLog(kLogTimeout);
    ::_exit(kKilled);
  }

  // Waits until files and rows are written. False when the disk hangs, which is logged.
  bool areReportsWritten() {
    const bool areFilesWritten = context_.fileSinkQueue().drain(kFlushTimeout);
    if (!areFilesWritten) errorLog(log_, "files are not written: the disk hangs");
    return store_.flush(kFlushTimeout) && areFilesWritten;
  }

  // Sinks that hang are given up, each after a time of its own. What is flushed later, and the destructors,
  // may wait for them all the same, so the process ends after kLongestEnd. True when everything is written
  // that stays on the device.
  bool flushSinks() {
    endGuard_ = linux_.timers().repeat(kLongestEnd, [this] {
      errorLog(log_, "the end takes too long because something hangs; what is not written is lost");
      (void)linux_.flushLog(kLogTimeout);
      ::_exit(kFailure);
    });
    (void)context_.fileSinkQueue().drain(kFlushTimeout);
    (void)context_.linkReportQueues().drain(kFlushTimeout);
    (void)linkReport_.finish(kNetworkTimeout);  // the exporters log what is lost
    const bool areWritten = areReportsWritten();
    capsa_.finish();
    diagnostics_.finish(kDiagnosticsTimeout);
    return areWritten;
  }

  const ServiceManager& manager_;
  const std::string status_;  // shown by the service manager
  LinuxPlatform& linux_;
  const std::string runtimeDirectory_;
  const LogCategory& log_;
  std::unique_ptr<Timer> endGuard_;  // made for the end; ends after what may hang
  bool hasSignposts_ = false;
  PlayedClock clock_;
  const DaemonStatus daemonStatus_;
  Heartbeats heartbeats_;
  RecoveryAttempts attempts_;
  SegmentJournal segments_;
  BatchedJournal journal_{segments_};  // outlives the store's thread, and the listeners
  WakingClock storeClock_;
  ReportStore store_;
  StoreMetricon metricon_;
  StoreSessionBook sessionBook_{store_};
  StoreEnergybook energybook_;
  StoreDiagwire diagwire_;
  LinuxLinkReport linkReport_;
  Tracing tracing_;
  LinuxCapsa& capsa_;
  DiagnosticsStore& diagnostics_;
  TWReportingContext context_;
  std::shared_ptr<TWReportingService> service_;
  UnixSocketListener listener_;
  DbusListener dbusListener_;
  std::unique_ptr<JournalUpkeep> upkeep_;
  Mutex killMutex_;                                   // both listeners may get the kill request at once
  std::unique_ptr<DirectoryWatcher> runtimeWatcher_;  // last, because it calls this object
};

sigset_t signalSet(std::initializer_list<int> numbers) {
  sigset_t signals;
  sigemptyset(&signals);
  for (const int number : numbers) sigaddset(&signals, number);
  return signals;
}

// The signals that are blocked in every thread, so that only main() receives them.
sigset_t handledSignals() { return signalSet({SIGTERM, SIGINT, SIGHUP, SIGUSR1}); }

// Handles signals until one of them ends the daemon.
void serveUntilEndSignal(Daemon& daemon) {
  const sigset_t signals = handledSignals();
  for (;;) {
    int signal = 0;
    if (sigwait(&signals, &signal) != 0) continue;
    if (signal == SIGTERM || signal == SIGINT) break;
    if (signal == SIGHUP) daemon.reload();
    if (signal == SIGUSR1) daemon.logStatus();
  }
  // A second end signal has its default action, which ends the process at once.
  std::signal(SIGTERM, SIG_DFL);
  std::signal(SIGINT, SIG_DFL);
  const sigset_t ends = signalSet({SIGTERM, SIGINT});
  pthread_sigmask(SIG_UNBLOCK, &ends, nullptr);
}

// Each client takes a file descriptor, and the usual soft limit is far below the hard limit.
void raiseDescriptorLimit() {
  rlimit limit{};
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  limit.rlim_cur = limit.rlim_max;
  static_cast<void>(setrlimit(RLIMIT_NOFILE, &limit));  // a failure leaves the old limit, which is usable
}

int run() {
  const sigset_t signals = handledSignals();
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  std::signal(SIGPIPE, SIG_IGN);
  std::signal(SIGXFSZ, SIG_IGN);  // writing past the file size limit then fails instead of ending the process
  raiseDescriptorLimit();
  static_cast<void>(MemoryReserve::putAside());  // without memory the daemon does not start anyway

  const Directories directories = Directories::fromEnvironment();
  LinuxPlatform linux(directories);
  const LogCategory log(linux.log(), "com.orvane.tonewerk", "twrs");
  std::string problem;
  auto socket = ServerSocket::open(socketPathOf(directories), problem);
  if (socket == nullptr) {
    errorLog(log, "cannot listen: %@", problem);
    return kFailure;
  }
  defaultLog(log, "listening on %@, state in %@", socket->name(), directories.state);
  const ServiceManager manager{};
  Daemon daemon(directories, std::move(socket), linux, manager, log);
  if (!daemon.start()) return kFailure;
  serveUntilEndSignal(daemon);
  const bool areReportsWritten = daemon.endInOrder();
  if (daemon.hangs()) {
    (void)linux.flushLog(kLogTimeout);
    ::_exit(kFailure);
  }
  return areReportsWritten ? kSuccess : kFailure;
}

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) {
  if (argc == 1) return tonewerk::run();
  const std::string_view option = argv[1];
  if (argc == 2 && option == "--help") {
    std::cout << tonewerk::kHelp;
    return tonewerk::kSuccess;
  }
  if (argc == 2 && option == "--version") {
    std::cout << "twreportingd " << TONEWERK_VERSION << "\n";
    return tonewerk::kSuccess;
  }
  std::cerr << "twreportingd: it takes no arguments but --help and --version\n";
  return tonewerk::kUsage;
}
