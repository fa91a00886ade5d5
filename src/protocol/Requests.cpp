// SPDX-License-Identifier: Apache-2.0
#include "protocol/Requests.h"

namespace tonewerk::requests {

const RequestSet& all() {
  static const RequestSet set{{kCreateReportingSession, kSetServiceType, kGetServiceNameForReporterID,
                               kSetConfiguration, kStartReportingSessionForID, kSendMessage,
                               kStopReportingSessionForID, kDestroyReportingSession, kReporterIDValid,
                               kGetAllReporters, kKillService, kObserve, kWatchSessions, kWatchOpenMessages,
                               kWatchNextMessages}};
  return set;
}

}  // namespace tonewerk::requests
