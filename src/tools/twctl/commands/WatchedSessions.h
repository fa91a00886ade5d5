// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <optional>
#include <vector>

#include "protocol/Requests.h"
#include "values/Value.h"

namespace tonewerk {

// Reads all sessions of the daemon, as watch.sessions describes them, portion by portion. `ask` sends a
// watch.sessions with these arguments and returns the answer. None when `ask` returned none.
[[nodiscard]] std::optional<std::vector<ValueMap>> readWatchedSessions(
    const std::function<std::optional<Value>(const Arguments&)>& ask);

}  // namespace tonewerk
