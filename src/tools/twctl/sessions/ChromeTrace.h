// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "tools/twctl/sessions/SessionRecords.h"
#include "tools/twctl/sessions/StoredSessions.h"

namespace tonewerk {

// A session as Chrome trace JSON (the "JSON Object Format"), which Perfetto's viewer and others open. Times
// are in microseconds since the session began, or since its first stretch, if that began earlier.
//
//   process   the session
//   threads   session, playing, recording, group session: a slice (X) for each stretch
//             output device, input device: a slice for as long as it was in use
//             issues: an instant (i) for each
//   counter   volume (C): that of the stretch, 0 while nothing played
//
// A session that has not ended goes on until the last time that the store has of it.
[[nodiscard]] std::string chromeTrace(const StoredSession& session, const SessionRecords& records);

}  // namespace tonewerk
