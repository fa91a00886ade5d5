// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionOrientationMessagesWorker.h"

namespace tonewerk {

const TWReportingSessionWorkerClass TWReportingSessionOrientationMessagesWorker::kWorkerClass =
    workerClassOf<TWReportingSessionOrientationMessagesWorker>("TWReportingSessionOrientationMessagesWorker");

std::shared_ptr<TWReportingSessionOrientationMessagesWorker>
TWReportingSessionOrientationMessagesWorker::initWithSession(
    const std::shared_ptr<TWReportingSession>& /*session*/) {
  return nullptr;
}

}  // namespace tonewerk
