// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "platform/Runtrace.h"
#include "values/Mutex.h"

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
  [[nodiscard]] static std::shared_ptr<TraceRun> make(const std::string& probeListPath);

  explicit TraceRun(const std::string& probeListPath);
  TraceRun(const TraceRun&) = delete;
  TraceRun& operator=(const TraceRun&) = delete;
  ~TraceRun() override;

  void requestStart();
  // True when the service has answered, whatever it said. Otherwise the trace is stopped if it still can be.
  [[nodiscard]] bool waitForStart();
  // True when the trace has completed, well or not; false without a trace session or in time.
  [[nodiscard]] bool stop();
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

  const std::unique_ptr<Semaphore> mTraceDispatchSemaphore_;
  std::atomic<bool> hasStarted_ = false;
  std::atomic<bool> hasCompleted_ = false;
  mutable Mutex mutex_;
  std::shared_ptr<RuntraceSession> traceSession_ GUARDED_BY(mutex_);
  std::optional<std::string> finalTraceURL_ GUARDED_BY(mutex_);
  RuntraceToken token_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
