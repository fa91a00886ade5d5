// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>

#include "platform/Platform.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/StoreDiagwire.h"
#include "platform/linux/store/StoreEnergybook.h"
#include "platform/linux/store/StoreMetricon.h"
#include "platform/linux/store/StoreSessionBook.h"
#include "session/TWReportingContext.h"
#include "tools/offline/OfflineClock.h"
#include "tools/offline/OfflineConnections.h"
#include "tools/offline/OfflineDevice.h"
#include "tools/offline/OfflineQueues.h"
#include "tools/offline/OfflineServices.h"
#include "tools/recording/Recording.h"

namespace tonewerk {

class JsonService;
class LogCategory;
class TWReportingService;

// The daemon's own service, sessions and workers with its own report store, on the clock and the device of a
// recording. It runs on the caller's thread, so the same recording gives the same rows on every machine; only
// the store writes on a thread of its own, whose timing the rows do not show.
//
// There may be one at a time, and no other daemon in the process.
class OfflineDaemon {
 public:
  // The user of the daemon, and of clients about whom the recording says nothing.
  static constexpr std::uint32_t kUser = 1000;
  static constexpr const char* kProcess = "recording";
  // The time at the beginning of a recording that does not say it: 2026-01-01T00:00:00Z.
  static constexpr double kStartsAt = 1'767'225'600.0;

  // `device`: the properties of the recording's first line, if that is about the device. The store is made in
  // `directory`. `json`, `log`, which takes the store's errors, and `isInterrupted` outlive it.
  OfflineDaemon(const std::string& directory, const ValueMap& device, JsonService& json,
                const LogCategory& log, OfflineConnections::Refusal refusal,
                const std::atomic<bool>& isInterrupted);
  OfflineDaemon(const OfflineDaemon&) = delete;
  OfflineDaemon& operator=(const OfflineDaemon&) = delete;
  // Without end(), drops the sessions as they are.
  ~OfflineDaemon();

  // Moves the clock to the step's time, or less far once it is interrupted, and takes the step, which
  // outlives the object. Does nothing after a request that ended the daemon.
  void take(const RecordedStep& step);
  // Returns when the rows so far are in the store's file. False when they cannot be written.
  [[nodiscard]] bool flush();
  // Ends the daemon in order, after its sessions. Does nothing after a request that ended the daemon, because
  // that stops no session.
  void end();

 private:
  Platform platform();
  std::shared_ptr<TWReportingService> makeService(const ValueMap& device);
  void runUntil(double seconds);
  void connect(std::int64_t client, const ValueMap& properties);
  void change(const ValueMap& device);
  // Every client is treated as lost, so that its started sessions stop and report.
  void endSessions();

  const std::atomic<bool>& isInterrupted_;
  const std::uint32_t user_;
  OfflineLog log_;
  OfflineClock clock_;
  OfflineQueues queues_;
  OfflineTimers timers_;
  OfflineSemaphores semaphores_;
  Accounts accounts_;
  OfflineProcesses processes_;
  OfflineSystem system_;
  OfflineFacts facts_;
  OfflinePreferences preferences_;
  OfflineNotifications notifications_;
  OfflineChanmeter chanmeter_;
  OfflineTracePoints tracePoints_;
  OfflineFiles files_;
  OfflineCapsa capsa_;
  OfflineRuntrace runtrace_;
  OfflineKolvi kolvi_;
  OfflineBenchfile benchfile_;
  OfflineIssueDrafts issueDrafts_;
  OfflineWhirlcaps whirlcaps_;
  OfflineCommands commands_;
  OfflineThreads threads_;
  JsonService& json_;
  ReportStore store_;
  StoreMetricon metricon_;
  StoreSessionBook sessionBook_{store_};
  StoreEnergybook energybook_;
  StoreDiagwire diagwire_;
  OfflineLinkReport linkReport_;
  bool hasEnded_ = false;
  TWReportingContext context_;
  std::shared_ptr<TWReportingService> service_;
  OfflineConnections connections_;
};

}  // namespace tonewerk
