// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TraceRun.h"

#include <utility>

#include "platform/Log.h"
#include "platform/Semaphore.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {

std::shared_ptr<TraceRun> TraceRun::make(const std::string& probeListPath) {
  RuntraceConfiguration traceConfig{.probeListPath = probeListPath};
  traceConfig.compressesFinishedTrace = false;
  auto run = std::make_shared<TraceRun>();
  run->traceSession_ = TWReportingContext::current().platform().runtrace.makeSession(traceConfig);
  run->traceSession_->setDelegate(run);
  return run;
}

TraceRun::TraceRun()
    : mTraceDispatchSemaphore_(TWReportingContext::current().platform().semaphores.makeSemaphore()) {}

TraceRun::~TraceRun() = default;

void TraceRun::requestStart() { traceSession()->startRuntrace(); }

bool TraceRun::waitForStart() {
  if (mTraceDispatchSemaphore_->wait(kStartTimeout)) return true;
  errorLog(TWReportingTraceCategory(), "timed out waiting for performance trace to start");
  const auto session = traceSession();
  if (session != nullptr && session->isValid()) session->stopRuntrace();
  return false;
}

bool TraceRun::stop() {
  const auto session = traceSession();
  if (session == nullptr) return false;
  session->stopRuntrace();
  if (mTraceDispatchSemaphore_->wait(kStopTimeout)) return true;
  errorLog(TWReportingTraceCategory(),
           "timed out waiting for performance trace to stop.  No bdj file wil be generated. ");
  return false;
}

std::optional<std::string> TraceRun::finalTraceURL() const {
  const std::lock_guard lock(mutex_);
  return finalTraceURL_;
}

// Without the lock, which a callback that is waited for may want.
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
  if (isFirst(hasStarted_)) mTraceDispatchSemaphore_->signal();
}

// Nobody waits for this: the completion follows.
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
      const std::lock_guard lock(mutex_);
      finalTraceURL_ = traceLocation;
      token_ = token;
    }
    infoLog(TWReportingTraceCategory(), "Performance Trace Completed: %@", traceLocation);
  }
  if (isFirst(hasCompleted_)) mTraceDispatchSemaphore_->signal();
}

std::shared_ptr<RuntraceSession> TraceRun::traceSession() const {
  const std::lock_guard lock(mutex_);
  return traceSession_;
}

std::shared_ptr<RuntraceSession> TraceRun::dropTraceSession() {
  const std::lock_guard lock(mutex_);
  return std::exchange(traceSession_, nullptr);
}

// A service that says something twice must not end a wait for something else.
bool TraceRun::isFirst(bool& happened) {
  const std::lock_guard lock(mutex_);
  return !std::exchange(happened, true);
}

}  // namespace tonewerk
