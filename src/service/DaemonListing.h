// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "values/Value.h"

namespace tonewerk {

struct DaemonStatus;

// Return what an answer to watch.accounts says of the daemon itself. Any thread.

// Returns a map for every user: "version", "processIdentifier", "user", "startedAt" (seconds since 1970, by
// the clock of then), "seconds" (for which it has run), "internalBuild", "runtime", "state" and
// "configuration" (its directories).
ValueMap daemonListing(const DaemonStatus& status, bool isInternalBuild);

// Returns an array with a map for each network endpoint: "name" (its address), "waiting", "dropped", "hangs"
// (seconds) and "problem" (of the last sending; empty for none).
ValueArray endpointListing(const DaemonStatus& status);

// Returns an array with a map for each of the last different error lines, newest first: "time" (seconds since
// 1970), "category", "text", "times", and "user" when a user's request caused it.
ValueArray troubleListing(const DaemonStatus& status);

}  // namespace tonewerk
