// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "tools/twctl/show/AudioHealth.h"
#include "tools/twctl/show/SessionRates.h"
#include "values/Value.h"

namespace tonewerk {

// Formats the sessions and the health of the audio for people without a terminal: nothing is cut.
std::vector<std::string> topFrame(const std::vector<SessionRow>& rows, const AudioHealth& health);

// Formats a session for programs.
ValueMap topObject(const SessionRow& row);

// Formats a duration as "7 s", "3:07", "2:03:07" or "5 d 2:03:07".
std::string runningTime(double seconds);

}  // namespace tonewerk
