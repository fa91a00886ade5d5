// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "bridges/pipewire/graph/ProfiledCycle.h"

struct spa_pod;

namespace tonewerk {

// What PipeWire's profiler tells in one go, out of its binary form: cycles of any drivers, each driver's in
// their order. Takes any well-formed pod. A cycle without clock or driver, or with a clock that cannot be, is
// not in the result.
std::vector<ProfiledCycle> cyclesOf(const spa_pod& profile);

}  // namespace tonewerk
