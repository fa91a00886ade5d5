// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionCapsaWorkerInstance.h"

#include <utility>

#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"
#include "session/WeakQueueRef.h"
#include "workers/diagnostics/TWReportingSessionCapsaWorker.h"
#include "workers/diagnostics/WorkerInstanceState.h"

namespace tonewerk {

LogSite TWReportingSessionCapsaWorkerInstance::logSite(int line) {
  return {TWReportingCapsaLogCategory(), "TWReportingSessionCapsaWorker", line};
}

// Everything on the work queue may use the state, so the answer goes there, and the state needs no lock. The
// handler holds the state weakly: an answer that never comes must not keep it alive.
FaultsignReporter::Reply TWReportingSessionCapsaWorkerInstance::replyHandler(
    const std::shared_ptr<WorkerInstanceState>& state, LogReply log) {
  return [gate = TWReportingContext::current().reportingServerQueueRef(), weak = std::weak_ptr(state),
          log = std::move(log)](const std::optional<ValueMap>& response) {
    // False once the daemon ends. The answer is not needed then.
    (void)gate->run([weak, log, response] {
      const std::string identifier =
          TWReportingSessionCapsaWorker::getSessionIdentifierFromResponse(response);
      if (const auto alive = weak.lock()) alive->currentCapsaSessionIdentifier = identifier;
      log(identifier, response);
    });
  };
}

}  // namespace tonewerk
