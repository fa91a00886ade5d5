// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue.h"

#include "session/TWReportingSession.h"

namespace tonewerk {

const TWReportingSessionCapsaWorkerInstanceClass
    TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue::kInstanceClass{
        "TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue", false, &initWithSession};

std::unique_ptr<TWReportingSessionCapsaWorkerInstance>
TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue::initWithSession(
    const std::shared_ptr<TWReportingSession>& session) {
  if (session->isSingleMessageSession()) return nullptr;
  return std::make_unique<TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue>();
}

bool TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue::interestedInMessage(
    const TWReportingSessionMessage& /*message*/) {
  return false;
}

void TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue::handleMessage(
    const TWReportingSessionMessage& /*message*/) {}

}  // namespace tonewerk
