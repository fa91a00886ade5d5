// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <system_error>

namespace tonewerk {

// Gives `made`, a file or directory that this process has just made in `directory`, the owner and the group
// of that directory, when the process is root; for others there is nothing to do. So what root writes among a
// daemon's files stays the daemon's.
//
// Both are open descriptors: a name could lead to something else by now. What was there before is not to be
// given away, since somebody may have linked it there.
[[nodiscard]] std::error_code giveToOwnerOf(int directory, int made);

}  // namespace tonewerk
