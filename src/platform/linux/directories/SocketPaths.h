// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <sys/types.h>
#include <vector>

#include "platform/linux/directories/Directories.h"

namespace tonewerk {

// Where a daemon with these directories listens for clients.
std::string socketPathOf(const Directories& directories);

// Where a process looks for the daemon, in the order in which to try: only TONEWERK_REPORTING_SOCKET when it
// is set and not empty, otherwise the socket of `user`, then the system's.
std::vector<std::string> socketPathsFrom(const Directories::Environment& environment, uid_t user);

}  // namespace tonewerk
