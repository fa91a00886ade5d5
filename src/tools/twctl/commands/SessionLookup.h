// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>

#include "protocol/AudioEvent.h"

namespace tonewerk {

class DaemonCalls;

// Asks the daemon for the session of that identifier: its service type in `serviceType`, or none when nobody
// has it. 0, by which the answer says "nobody", is always found. False when the daemon did not answer, which
// has then been said.
[[nodiscard]] bool lookUpSession(DaemonCalls& daemon, ReporterID reporterID,
                                 std::optional<AudioServiceType>& serviceType);

}  // namespace tonewerk
