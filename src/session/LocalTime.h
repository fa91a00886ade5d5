// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <string>

namespace tonewerk {

// Returns the local time of `now` (seconds since 1970) for use in file names, such as "20261120-111800+0100".
// `utcOffset`: by how much local time is ahead of UTC.
std::string localTimeText(double now, std::chrono::minutes utcOffset);

}  // namespace tonewerk
