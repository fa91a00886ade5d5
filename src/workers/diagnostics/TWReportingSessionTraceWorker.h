// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

class TraceRun;

// Records a performance trace for the whole life of a test session on internal builds, and makes a benchmark
// data file of it at stop: how long the intervals of the signposts took that a probe list names.
//
//   idle -> tracing (start() was confirmed within 15 s) -> stopping (at most 180 s) -> file written
//
// The session's configuration says what is traced and where the file goes. Both calls block the work queue
// while they wait, by design: a test waits for its trace.
class TWReportingSessionTraceWorker final : public TWReportingSessionWorkerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
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
  static bool traces(const TWReportingSession& session);

  bool startedTracing_ = false;    // from a start request until stop(); stays after one that timed out
  std::shared_ptr<TraceRun> run_;  // the last one, until its trace was processed
};

}  // namespace tonewerk
