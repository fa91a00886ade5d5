// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionTraceWorker.h"

#include <cassert>

#include "platform/FileSystem.h"
#include "platform/Log.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "workers/diagnostics/TraceBenchfile.h"
#include "workers/diagnostics/TraceRun.h"

namespace tonewerk {

const TWReportingSessionWorkerClass TWReportingSessionTraceWorker::kWorkerClass =
    workerClassOf<TWReportingSessionTraceWorker>("TWReportingSessionTraceWorker");

TWReportingSessionTraceWorker::TWReportingSessionTraceWorker(
    const std::shared_ptr<TWReportingSession>& owner) {
  session = owner;
}

TWReportingSessionTraceWorker::~TWReportingSessionTraceWorker() {
  if (run_ != nullptr) run_->abandon();
}

std::string TWReportingSessionTraceWorker::TWReportingTracingLogsDirectory() {
  return TWReportingContext::current().platform().logsDirectory + "/Audio/Traces";
}

bool TWReportingSessionTraceWorker::shouldTrace(const TWReportingSession& session) {
  return session.serviceType() == kServiceTest && TWReportingUtilityIsInternalBuild();
}

std::optional<bool> TWReportingSessionTraceWorker::start() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (startedTracing_ || owner == nullptr || !shouldTrace(*owner)) return started;
  const ValueMap configuration = owner->configuration();
  const Value* probeList = configuration.find(TWReportingKolviPlistFilePath);
  const std::string path = probeList == nullptr ? "" : probeList->text();
  if (!TWReportingContext::current().platform().files.exists(path)) {
    errorLog(TWReportingTraceCategory(),
             "Could not start Runtrace. TWReportingKolviPlistFilePath: %@ is not a valid path", probeList);
    return started;
  }
  if (run_ != nullptr) run_->abandon();
  run_ = TraceRun::make(path);
  startedTracing_ = true;
  run_->requestStart();
  if (!run_->waitForStart()) return false;
  started = true;
  return started;
}

void TWReportingSessionTraceWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr || !startedTracing_ || !shouldTrace(*owner)) return;
  startedTracing_ = false;
  if (!run_->stop()) return;
  TraceBenchfile(*owner).processTraceKolvi(run_->finalTraceURL());
  run_->abandon();
  run_.reset();  // deletes the trace, which may be large
}

}  // namespace tonewerk
