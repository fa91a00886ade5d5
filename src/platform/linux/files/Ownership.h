// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <system_error>

namespace tonewerk {

// Sets the owner and the group of `made` to those of `directory` if the process is root; otherwise it does
// nothing. `made` is a file or directory that this process has just created in `directory`. So files that
// root writes among a daemon's files belong to the daemon.
//
// Both arguments are open descriptors, because a name could lead to another file by now. Never call this for
// a file that existed before: somebody may have linked a file of root's there.
[[nodiscard]] std::error_code giveToOwnerOf(int directory, int made);

}  // namespace tonewerk
