// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/Clock.h"
#include "platform/Log.h"

namespace tonewerk {

// The process's log, as its environment wants it: the journal when standard error is the journal's
// (JOURNAL_STREAM), else lines on standard error; from the level on that TONEWERK_LOG says. A TONEWERK_LOG
// that says nothing of use is logged as an error and the threshold stays "default". `clock` outlives the log.
[[nodiscard]] std::unique_ptr<Log> makeStandardLog(const Clock& clock);

}  // namespace tonewerk
