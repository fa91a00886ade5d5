// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "protocol/AudioEvent.h"
#include "session/TWReportingSessionMessage.h"

namespace tonewerk {

// Every key that the messages carried with all its values, as texts joined by commas in the messages' order:
// {"a": "1,2"}. "TW_Session_Summary_Event" begins with the service type. Left out is what was redundant, came
// before the session was started, or was meant for other workers than `workerClass`.
ValueMap rtcSummaryOf(const TWReportingSessionMessages& messages, AudioServiceType serviceType,
                      const TWReportingSessionWorkerClass& workerClass);

}  // namespace tonewerk
