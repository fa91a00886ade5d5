// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <string>

namespace tonewerk {

// "20261120-111800+0100": the local time of `now` (seconds since 1970) where the clocks are `utcOffset` ahead
// of UTC, for names of files.
std::string localTimeText(double now, std::chrono::minutes utcOffset);

}  // namespace tonewerk
