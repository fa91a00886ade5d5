// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "tools/twctl/Tool.h"
#include "values/Value.h"

namespace tonewerk {

// What a recording of this device says of it: the daemon's user, and the facts and preferences that decide
// what is reported, as they are now. Prints a warning for a file that cannot be read.
ValueMap recordedDevice(const Tool& tool, std::uint32_t daemonUser);

}  // namespace tonewerk
