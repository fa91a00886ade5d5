// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/linux/directories/Directories.h"

namespace tonewerk {

// The most MiB that the store of a daemon with these directories may take: the preference where it is valid,
// else its default, as for the daemon.
[[nodiscard]] double storeMegabytes(const Directories& directories);

}  // namespace tonewerk
