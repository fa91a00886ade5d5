// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TraceRun.h"

#include <cassert>
#include <utility>

#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "platform/Semaphore.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {

std::shared_ptr<TraceRun> TraceRun::make(const std::string& probeListPath) {
  auto run = std::make_shared<TraceRun>(probeListPath);
  run->traceSession()->setDelegate(run);
  return run;
}

TraceRun::TraceRun(const std::string& probeListPath)
    : mTraceDispatchSemaphore_(TWReportingContext::current().platform().semaphores.makeSemaphore()),
      traceSession_(TWReportingContext::current().platform().runtrace.makeSession(
          {.probeListPath = probeListPath, .compressesFinishedTrace = false})) {}

TraceRun::~TraceRun() = default;

void TraceRun::requestStart() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  traceSession()->startRuntrace();
}

bool TraceRun::waitForStart() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const Heartbeat::LongWork waiting(kStartTimeout);
  if (mTraceDispatchSemaphore_->wait(kStartTimeout)) return true;
  errorLog(TWReportingTraceCategory(), "timed out waiting for performance trace to start");
  const auto session = traceSession();
  if (session != nullptr && session->isValid()) session->stopRuntrace();
  return false;
}

bool TraceRun::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto session = traceSession();
  if (session == nullptr) return false;
  session->stopRuntrace();
  const Heartbeat::LongWork waiting(kStopTimeout);
  if (mTraceDispatchSemaphore_->wait(kStopTimeout)) return true;
  errorLog(TWReportingTraceCategory(),
           "timed out waiting for performance trace to stop.  No bdj file wil be generated. ");
  return false;
}

std::optional<std::string> TraceRun::finalTraceURL() const {
  const MutexLock lock(mutex_);
  return finalTraceURL_;
}

// Calls setDelegate() without the lock: setDelegate() waits for a running callback, and a callback may take
// the lock.
void TraceRun::abandon() {
  if (const auto session = dropTraceSession()) session->setDelegate({});
}

void TraceRun::runtraceDidStart(const RuntraceError& error) {
  if (error) {
    static_cast<void>(dropTraceSession());
    errorLog(TWReportingTraceCategory(), "runtraceDidStart %@", *error);
  } else {
    infoLog(TWReportingTraceCategory(), "Performance Trace Started");
  }
  // Signals once, because a second answer would end the next wait too early.
  if (!hasStarted_.exchange(true)) mTraceDispatchSemaphore_->signal();
}

// Does not signal, because stop() waits for the completion that follows.
void TraceRun::runtraceDidStop(const RuntraceError& error) {
  if (error) {
    static_cast<void>(dropTraceSession());
    errorLog(TWReportingTraceCategory(), "runtraceDidStop %@", *error);
  } else {
    infoLog(TWReportingTraceCategory(), "Performance Trace Stopped");
  }
}

void TraceRun::runtraceDidComplete(const std::string& traceLocation, const RuntraceToken& token,
                                   const RuntraceError& error) {
  if (const auto session = dropTraceSession()) session->setDelegate({});
  if (error) {
    errorLog(TWReportingTraceCategory(), "runtraceDidComplete %@", *error);
  } else {
    {
      const MutexLock lock(mutex_);
      finalTraceURL_ = traceLocation;
      token_ = token;
    }
    infoLog(TWReportingTraceCategory(), "Performance Trace Completed: %@", traceLocation);
  }
  if (!hasCompleted_.exchange(true)) mTraceDispatchSemaphore_->signal();
}

std::shared_ptr<RuntraceSession> TraceRun::traceSession() const {
  const MutexLock lock(mutex_);
  return traceSession_;
}

std::shared_ptr<RuntraceSession> TraceRun::dropTraceSession() {
  const MutexLock lock(mutex_);
  return std::exchange(traceSession_, nullptr);
}

}  // namespace tonewerk
