// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

class TraceRun;

// Records a performance trace while a test session is started, on internal builds only. At stop it makes a
// benchmark data file from the trace. The file says how long the intervals of those signposts took that a
// probe list names.
//
//   idle -> tracing (start() was confirmed within 15 s) -> stopping (at most 180 s) -> file written
//
// The session's configuration names the probe list and where the file is written. The worker lives on the
// work queue. start() and stop() block that queue while they wait, by design: a test waits for its trace.
class TWReportingSessionTraceWorker final : public TWReportingSessionWorkerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr bool kIsForLiveSessions = true;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionTraceWorker(const std::shared_ptr<TWReportingSession>& owner);
  TWReportingSessionTraceWorker(const TWReportingSessionTraceWorker&) = delete;
  TWReportingSessionTraceWorker& operator=(const TWReportingSessionTraceWorker&) = delete;
  ~TWReportingSessionTraceWorker() override;

  [[nodiscard]] std::optional<bool> start() override;
  void stop() override;

  // "<logs>/Audio/Traces".
  static std::string TWReportingTracingLogsDirectory();

 private:
  static bool shouldTrace(const TWReportingSession& session);

  bool startedTracing_ = false;    // from a start request until stop(), also when the start timed out
  std::shared_ptr<TraceRun> run_;  // the last run, until its trace has been processed
};

}  // namespace tonewerk
