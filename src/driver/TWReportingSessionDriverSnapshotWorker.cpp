// SPDX-License-Identifier: Apache-2.0
#include "driver/TWReportingSessionDriverSnapshotWorker.h"

#include <cassert>

#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {

const TWReportingSessionWorkerClass TWReportingSessionDriverSnapshotWorker::kWorkerClass =
    workerClassOf<TWReportingSessionDriverSnapshotWorker>("TWReportingSessionDriverSnapshotWorker");

std::optional<bool> TWReportingSessionDriverSnapshotWorker::start() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto& utility = TWReportingContext::current().singletons().get<TWReportingDriverUtility>();
  driverSnapShot_ = utility.getSnapShot();
  return true;
}

void TWReportingSessionDriverSnapshotWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto* utility = TWReportingContext::current().singletons().find<TWReportingDriverUtility>();
  if (utility == nullptr) return;  // no worker of this class has started yet in this process
  utility->sendDriverLogsForSession(session.lock().get(), driverSnapShot_ ? &*driverSnapShot_ : nullptr);
  driverSnapShot_.reset();
}

}  // namespace tonewerk
