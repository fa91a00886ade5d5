// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/Log.h"
#include "platform/accounts/TurnQueue.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/journal/BatchedJournal.h"
#include "platform/linux/journal/PlayedClock.h"
#include "platform/linux/journal/RecoveryAttempts.h"
#include "platform/linux/journal/SegmentJournal.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/StoreMetricon.h"
#include "recovery/SessionRecovery.h"
#include "service/JournalUpkeep.h"
#include "service/TWReportingService.h"
#include "session/TWReportingContext.h"
#include "support/TestPlatform.h"
#include "support/memory/MemoryMessaging.h"
#include "workers/TWReportingWorkerClasses.h"
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

namespace tonewerk {

// The daemon's parts that keep something on the disk, with the core, put together as main() does it: the
// journal, the store and the JSON files. The rest is in memory, and everything but the store's thread runs on
// the calling thread, so that the same requests make the same system calls.
//
// The constructor recovers what an earlier daemon left in the directory. Without endInOrder() the daemon ends
// like one that is killed, for who copies the directory before it is destroyed.
class FaultedDaemon {
 public:
  // At `now`, in seconds since 1970.
  FaultedDaemon(const std::string& directory, double now)
      : directory_(directory),
        attempts_(journalDirectory(), log_),
        segments_(std::make_unique<LinuxJournalDirectory>(journalDirectory()), test_.preferences, log_,
                  kSegments),
        store_(directory + "/state", json_, test_.preferences, test_.clock, test_.accounts, log_,
               storeLimits(), [this] { (void)journal_.write(); }),
        marks_(store_.marks()),
        metricon_(store_, test_.preferences, clock_, log_),
        context_(platform(), allWorkerClasses()),
        service_(TWReportingService::make([] {})) {
    test_.clock.setNow(now);
    // Segments that are not needed are renamed and not removed.
    test_.preferences.configure(ReportStore::kPreferenceDomain, "journal_days", 1);
    TWReportingSessionSummaryJsonFileWorker::tidyDirectory();
    run();
    recover();
    upkeep_ = std::make_unique<JournalUpkeep>(
        journal_, context_,
        JournalUpkeep::Reports{.recorded = [this] { return store_.recordedRows(); },
                               .areWritten = [this](std::uint64_t rows) { return store_.hasWritten(rows); },
                               .sync = [this] { return store_.sync(); }},
        [] { return JournalUpkeep::Bounds(); });
    messaging_.setDelegate(*service_);
    messaging_.resume();
  }
  FaultedDaemon(const FaultedDaemon&) = delete;
  FaultedDaemon& operator=(const FaultedDaemon&) = delete;
  ~FaultedDaemon() {
    messaging_.shutDown();
    run();
  }

  [[nodiscard]] std::unique_ptr<MemoryClient> connect(std::uint32_t user) {
    return messaging_.connect(static_cast<std::int32_t>(user), user);
  }
  // Does what is due on the queues.
  void run() { test_.queues.runAll(); }
  void advance(double seconds) {
    test_.clock.advance(seconds);
    run();
  }
  double now() const { return test_.clock.now(); }

  // Whether the kernel has all requests so far, as before an answer.
  [[nodiscard]] bool write() { return journal_.write(); }
  // Whether the store has all rows so far.
  bool flush() { return store_.flush(kTimeout); }

  void endInOrder() {
    messaging_.shutDown();
    run();
    context_.turns().finish();
    context_.reportingServerQueue().async([this] { service_->stopSingleMessageSessions(); });
    run();
    if (flush() || flush()) upkeep_->dropNow();
  }

  // Whether an error with this text was logged.
  bool hasLogged(std::string_view text) const {
    const std::vector<std::string> errors = test_.log.textsAt(LogLevel::kError);
    return std::any_of(errors.begin(), errors.end(),
                       [text](const std::string& line) { return line.find(text) != std::string::npos; });
  }
  std::vector<std::string> errors() const { return test_.log.textsAt(LogLevel::kError); }

 private:
  static constexpr std::chrono::seconds kTimeout{30};
  static constexpr SegmentJournal::Limits kSegments{.segmentBytes = 4096};

  // The store's thread writes when it is told to flush.
  static ReportStore::Limits storeLimits() {
    ReportStore::Limits limits;
    limits.gather = std::chrono::hours(24);
    return limits;
  }
  std::string journalDirectory() const { return directory_ + "/state/journal"; }

  Platform platform() {
    return {.log = test_.log,
            .accounts = test_.accounts,
            .tracePoints = test_.tracePoints,
            .clock = clock_,
            .queues = test_.queues,
            .timers = test_.timers,
            .semaphores = test_.semaphores,
            .processes = test_.processes,
            .system = test_.system,
            .deviceFacts = test_.deviceFacts,
            .preferences = test_.preferences,
            .notifications = test_.notifications,
            .files = files_,
            .json = json_,
            .metricon = metricon_,
            .energybook = test_.energybook,
            .diagwire = test_.diagwire,
            .linkReport = test_.linkReport,
            .capsa = test_.capsa,
            .runtrace = test_.runtrace,
            .kolvi = test_.kolvi,
            .benchfile = test_.benchfile,
            .issueDrafts = test_.issueDrafts,
            .whirlcaps = test_.whirlcaps,
            .chanmeter = test_.chanmeter,
            .commands = test_.commands,
            .threads = test_.threads,
            .journal = &journal_,
            .logsDirectory = directory_ + "/logs",
            .temporaryDirectory = directory_};
  }

  void recover() {
    SessionRecovery recovery({journal_, attempts_, store_, test_.accounts, context_, *service_, log_});
    if (!recovery.begin(marks_)) return;
    context_.reportingServerQueue().async([&recovery] { recovery.play([](std::uint64_t) {}); });
    run();
    recovery.end();
    run();
    if (flush()) recovery.forget();
  }

  const std::string directory_;
  TestPlatform test_;
  const LogCategory log_{test_.log, "com.orvane.tonewerk", "twrs"};
  NlohmannJsonService json_;
  LinuxFileSystem files_;
  PlayedClock clock_{test_.clock};
  RecoveryAttempts attempts_;
  SegmentJournal segments_;
  BatchedJournal journal_{segments_};
  ReportStore store_;
  const std::optional<StoreMarks> marks_;
  StoreMetricon metricon_;
  TWReportingContext context_;
  std::shared_ptr<TWReportingService> service_;
  MemoryMessaging messaging_{&test_.accounts};
  std::unique_ptr<JournalUpkeep> upkeep_;
};

}  // namespace tonewerk
