// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "tools/twctl/sessions/GlitchCycles.h"
#include "tools/twctl/sessions/SessionRecords.h"
#include "tools/twctl/sessions/SignpostFile.h"
#include "tools/twctl/sessions/StoredSessions.h"

namespace tonewerk {

// A session as Chrome trace JSON (the "JSON Object Format"), which Perfetto's viewer and others open. Times
// are in microseconds since the session began, or since its first stretch, if that began earlier.
//
//   process   the session
//   threads   session, playing, recording, group session: a slice (X) for each stretch
//             output device, input device: a slice for as long as it was in use
//             issues: an instant (i) for each
//             glitches: an instant for each overload that somebody has judged, when its cycle began
//   counter   volume (C): that of the stretch, 0 while nothing played
//
//   process   the audio graph, where cycles around a glitch are known
//   threads   cycles: a slice for each, which ends at the deadline
//             one for each node: slices for as long as it waited and ran
//
//   process   signposts, where there are any: an asynchronous slice (b, e) for each interval, because they
//             overlap
//
// A cycle that is near two glitches is there once. A session that has not ended goes on until
// the last time that the store has of it.
// `cycles`: those around glitches, by their events.
[[nodiscard]] std::string chromeTrace(const StoredSession& session, const SessionRecords& records,
                                      const std::map<std::int64_t, std::vector<GlitchCycle>>& cycles = {},
                                      const std::vector<SignpostInterval>& signposts = {});

}  // namespace tonewerk
