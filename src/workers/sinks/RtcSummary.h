// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "protocol/AudioEvent.h"
#include "session/TWReportingSessionMessage.h"

namespace tonewerk {

// Makes the summary of a session's messages: every key with all its values, as texts joined by commas in the
// order of the messages, like {"a": "1,2"}. "TW_Session_Summary_Event" begins with the service type.
// Redundant messages, those from before the session's start, and those for workers other than `workerClass`
// are left out.
ValueMap rtcSummaryOf(const TWReportingSessionMessages& messages, AudioServiceType serviceType,
                      const TWReportingSessionWorkerClass& workerClass);

}  // namespace tonewerk
