// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "platform/Runtrace.h"

namespace tonewerk {

class Semaphore;

// One performance trace of a trace worker's, from the request to start it to its completion.
//
//   make() -> requestStart() -> waitForStart() -> ... -> stop() -> finalTraceURL()
//
// The worker calls from the work queue, which the waits block; the callbacks come from the trace service's
// threads, and only set what the lock guards and signal. Each start has a run of its own, so what an earlier
// one is told too late does not touch it.
class TraceRun final : public RuntraceSessionDelegate {
 public:
  static constexpr std::chrono::seconds kStartTimeout{15};
  static constexpr std::chrono::seconds kStopTimeout{180};

  // Makes the trace session for the probe list.
  static std::shared_ptr<TraceRun> make(const std::string& probeListPath);

  TraceRun();
  TraceRun(const TraceRun&) = delete;
  TraceRun& operator=(const TraceRun&) = delete;
  ~TraceRun() override;

  void requestStart();
  // True when the service has answered, whatever it said. Otherwise the trace is stopped if it still can be.
  bool waitForStart();
  // True when the trace has completed, well or not; false without a trace session or in time.
  bool stop();
  // Where the completed trace is, for as long as this lives.
  std::optional<std::string> finalTraceURL() const;
  // From its return on the service does not call back any more.
  void abandon();

  void runtraceDidStart(const RuntraceError& error) override;
  void runtraceDidStop(const RuntraceError& error) override;
  void runtraceDidComplete(const std::string& traceLocation, const RuntraceToken& token,
                           const RuntraceError& error) override;

 private:
  std::shared_ptr<RuntraceSession> traceSession() const;
  std::shared_ptr<RuntraceSession> dropTraceSession();
  bool isFirst(bool& happened);

  const std::unique_ptr<Semaphore> mTraceDispatchSemaphore_;
  mutable std::mutex mutex_;  // guards all below
  std::shared_ptr<RuntraceSession> traceSession_;
  bool hasStarted_ = false;
  bool hasCompleted_ = false;
  std::optional<std::string> finalTraceURL_;
  RuntraceToken token_;
};

}  // namespace tonewerk
