// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/show/SessionRates.h"
#include "tools/twctl/show/Terminal.h"
#include "values/Value.h"

namespace tonewerk {

// Formats the sessions as a page for people. The page is cut to `size`, and its last line then says how many
// more sessions there are. Without a size nothing is cut.
std::vector<std::string> topFrame(const std::vector<SessionRow>& rows,
                                  const std::optional<TerminalSize>& size);

// Formats a session for programs.
ValueMap topObject(const SessionRow& row);

// Formats a duration as "7 s", "3:07", "2:03:07" or "5 d 2:03:07".
std::string runningTime(double seconds);

}  // namespace tonewerk
