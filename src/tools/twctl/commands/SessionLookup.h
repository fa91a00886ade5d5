// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>

#include "protocol/AudioEvent.h"

namespace tonewerk {

class DaemonCalls;

// Asks the daemon for the session with this identifier, and sets `serviceType` to its service type, or to
// none when there is no such session. The identifier 0 always seems to exist, because the answer uses it for
// "no session". False when the daemon did not answer; the problem is then printed.
[[nodiscard]] bool lookUpSession(DaemonCalls& daemon, ReporterID reporterID,
                                 std::optional<AudioServiceType>& serviceType);

}  // namespace tonewerk
