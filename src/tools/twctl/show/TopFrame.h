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

// The sessions as a page for people. On a screen of `size` it is cut to that, and its last line then says how
// many more there are; without a size it is as long and wide as it wants.
std::vector<std::string> topFrame(const std::vector<SessionRow>& rows,
                                  const std::optional<TerminalSize>& size);

// A session for programs.
ValueMap topObject(const SessionRow& row);

// "7 s", "3:07", "2:03:07" or "5 d 2:03:07".
std::string runningTime(double seconds);

}  // namespace tonewerk
