// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// A time for people, in the zone of this process: "2026-11-20 11:18:00", with milliseconds unless it is a
// whole second. `seconds` since 1970.
//
// An hour that the clock has twice, when summer time ends, is told with its offset from UTC, as
// "2026-10-25 02:30:00+01:00", and UTC is told by "Z". So timeOfArgument() reads the same time from it.
std::string localTime(double seconds);

// The same without milliseconds.
std::string localSecond(double seconds);

}  // namespace tonewerk
