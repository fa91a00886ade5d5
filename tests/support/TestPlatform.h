// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "platform/DaemonStatus.h"
#include "platform/Platform.h"
#include "platform/accounts/Accounts.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualQueues.h"
#include "support/manual/ManualSemaphores.h"
#include "support/manual/ManualTimers.h"
#include "support/memory/MemoryChanmeter.h"
#include "support/memory/MemoryCommandRunner.h"
#include "support/memory/MemoryDetachedThreads.h"
#include "support/memory/MemoryDeviceFacts.h"
#include "support/memory/MemoryFileSystem.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryNotificationService.h"
#include "support/memory/MemoryPreferenceStore.h"
#include "support/memory/MemoryProcessInformation.h"
#include "support/memory/MemorySystemInformation.h"
#include "support/memory/MemoryTracePoints.h"
#include "support/memory/reports/MemoryBenchfile.h"
#include "support/memory/reports/MemoryCapsa.h"
#include "support/memory/reports/MemoryDiagwire.h"
#include "support/memory/reports/MemoryEnergybook.h"
#include "support/memory/reports/MemoryIssueDraftService.h"
#include "support/memory/reports/MemoryKolvi.h"
#include "support/memory/reports/MemoryLinkReport.h"
#include "support/memory/reports/MemoryMetricon.h"
#include "support/memory/reports/MemoryRuntrace.h"
#include "support/memory/reports/MemorySessionBook.h"
#include "support/memory/reports/MemoryWhirlcapRequest.h"

namespace tonewerk {

// Replaces the operating system in memory: it holds one of each double and makes a Platform of them.
//
//   TestPlatform test;
//   TWReportingService service(test.platform());
//   test.clock.advance(5.0);
//   test.queues.runAll();
//
// Declare it before its users, so that it is destroyed last.
struct TestPlatform {
  // The user that the daemon runs as.
  static constexpr std::uint32_t kOwner = 500;

  TestPlatform() = default;
  TestPlatform(const TestPlatform&) = delete;
  TestPlatform& operator=(const TestPlatform&) = delete;

  Platform platform() { return platformWith(capsa); }

  // Returns a Platform with another capture service.
  Platform platformWith(Capsa& otherCapsa) {
    return platformWith(log, tracePoints, clock, queues, metricon, linkReport, otherCapsa);
  }

  // Returns a Platform with other services in place of those that messages use, for benchmarks.
  Platform platformWith(Log& otherLog, TracePoints& otherTracePoints, Clock& otherClock,
                        SerialQueueFactory& otherQueues, Metricon& otherMetricon,
                        LinkReport& otherLinkReport) {
    return platformWith(otherLog, otherTracePoints, otherClock, otherQueues, otherMetricon, otherLinkReport,
                        capsa);
  }

  Platform platformWith(Log& otherLog, TracePoints& otherTracePoints, Clock& otherClock,
                        SerialQueueFactory& otherQueues, Metricon& otherMetricon, LinkReport& otherLinkReport,
                        Capsa& otherCapsa) {
    return {.log = otherLog,
            .accounts = accounts,
            .tracePoints = otherTracePoints,
            .clock = otherClock,
            .queues = otherQueues,
            .timers = timers,
            .semaphores = semaphores,
            .processes = processes,
            .system = system,
            .deviceFacts = deviceFacts,
            .preferences = preferences,
            .notifications = notifications,
            .files = files,
            .json = json,
            .metricon = otherMetricon,
            .energybook = energybook,
            .diagwire = diagwire,
            .linkReport = otherLinkReport,
            .capsa = otherCapsa,
            .runtrace = runtrace,
            .kolvi = kolvi,
            .benchfile = benchfile,
            .issueDrafts = issueDrafts,
            .whirlcaps = whirlcaps,
            .chanmeter = chanmeter,
            .commands = commands,
            .threads = threads,
            .journal = journal,
            .sessionBook = &sessionBook,
            .status = &status,
            .logsDirectory = "/logs",
            .temporaryDirectory = "/tmp"};
  }

  MemoryLog log;
  MemoryTracePoints tracePoints;
  ManualClock clock;
  Accounts accounts{kOwner, clock};
  ManualQueues queues;
  ManualTimers timers{clock};
  ManualSemaphores semaphores{clock};
  MemoryProcessInformation processes;
  MemorySystemInformation system;
  MemoryDeviceFacts deviceFacts;
  MemoryPreferenceStore preferences;
  MemoryNotificationService notifications;
  MemoryFileSystem files;
  MemoryJsonService json;
  MemoryMetricon metricon;
  MemoryEnergybook energybook;
  MemoryDiagwire diagwire;
  MemoryLinkReport linkReport;
  MemoryCapsa capsa;
  MemoryRuntrace runtrace{clock};
  MemoryKolvi kolvi;
  MemoryBenchfile benchfile{files};
  MemoryIssueDraftService issueDrafts;
  MemoryWhirlcapRequest whirlcaps;
  MemoryChanmeter chanmeter;
  MemoryCommandRunner commands;
  MemoryDetachedThreads threads;
  MemorySessionBook sessionBook;
  Journal* journal = nullptr;
  DaemonStatus status;  // empty
};

}  // namespace tonewerk
