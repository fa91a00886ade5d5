// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/Clock.h"
#include "platform/linux/log/LogOutput.h"

namespace tonewerk {

// Makes the process's log from its environment. It writes to the journal when standard error goes there
// (JOURNAL_STREAM), else to standard error. TONEWERK_LOG sets the threshold; when it cannot be parsed, that
// is logged as an error and the threshold is "default". `clock` outlives the log.
[[nodiscard]] std::unique_ptr<LogOutput> makeStandardLog(const Clock& clock);

}  // namespace tonewerk
