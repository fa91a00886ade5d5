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

// Runs one performance trace for a trace worker, from the request to start it to its completion.
//
//   make() -> requestStart() -> waitForStart() -> ... -> stop() -> finalTraceURL()
//
// The worker uses it on the work queue, which waitForStart() and stop() block. The callbacks come on the
// trace service's threads; they only store results and signal. Each start makes a run of its own, so a late
// callback of an earlier run does not change it.
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
  // True when the service has answered, also with an error. After a timeout it returns false and stops the
  // trace if the trace is still valid.
  [[nodiscard]] bool waitForStart();
  // Stops the trace and waits for its completion. True when the trace has completed, also with an error.
  // False without a trace session and after a timeout.
  [[nodiscard]] bool stop();
  // The path of the completed trace, which exists as long as this object. nullopt without one.
  std::optional<std::string> finalTraceURL() const;
  // When it returns, the service does not call back any more. Any thread may call it.
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
