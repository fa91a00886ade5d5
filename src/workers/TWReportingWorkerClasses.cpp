// SPDX-License-Identifier: Apache-2.0
#include "workers/TWReportingWorkerClasses.h"

#include "driver/TWReportingSessionDriverSnapshotWorker.h"
#include "monitor/TWReportingSessionSystemMonitorWorker.h"
#include "workers/diagnostics/TWReportingSessionCapsaWorker.h"
#include "workers/diagnostics/TWReportingSessionIssueDraftWorker.h"
#include "workers/diagnostics/TWReportingSessionMemoryLogWorker.h"
#include "workers/diagnostics/TWReportingSessionTraceWorker.h"
#include "workers/producers/TWReportingSessionGatherMessagesWorker.h"
#include "workers/producers/TWReportingSessionInputMessagesWorker.h"
#include "workers/producers/TWReportingSessionVolumeMessagesWorker.h"
#include "workers/sinks/TWReportingSessionDPWorker.h"
#include "workers/sinks/TWReportingSessionDiagwireWorker.h"
#include "workers/sinks/TWReportingSessionEnergybookWorker.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"
#include "workers/sinks/TWReportingSessionRtcWorker.h"
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"
#include "workers/sinks/TWReportingSessionSummaryWorker.h"

namespace tonewerk {

// The JSON file worker is neither a producer nor a consumer. A session therefore stops it last, and it finds
// the messages that producers and consumers added. The orientation producer is left out on purpose: it cannot
// be made.
std::vector<const TWReportingSessionWorkerClass*> allWorkerClasses() {
  return {
      &TWReportingSessionTraceWorker::kWorkerClass,
      &TWReportingSessionVolumeMessagesWorker::kWorkerClass,
      &TWReportingSessionGatherMessagesWorker::kWorkerClass,
      &TWReportingSessionSummaryWorker::kWorkerClass,
      &TWReportingSessionInputMessagesWorker::kWorkerClass,
      &TWReportingSessionMetriconWorker::kWorkerClass,
      &TWReportingSessionEnergybookWorker::kWorkerClass,
      &TWReportingSessionMemoryLogWorker::kWorkerClass,
      &TWReportingSessionDiagwireWorker::kWorkerClass,
      &TWReportingSessionDriverSnapshotWorker::kWorkerClass,
      &TWReportingSessionSystemMonitorWorker::kWorkerClass,
      &TWReportingSessionCapsaWorker::kWorkerClass,
      &TWReportingSessionDPWorker::kWorkerClass,
      &TWReportingSessionSummaryJsonFileWorker::kWorkerClass,
      &TWReportingSessionRtcWorker::kWorkerClass,
      &TWReportingSessionIssueDraftWorker::kWorkerClass,
  };
}

}  // namespace tonewerk
