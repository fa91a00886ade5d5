// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "bridges/pipewire/graph/ProfiledCycle.h"

struct spa_pod;

namespace tonewerk {

// Reads one report of PipeWire's profiler from its binary form: cycles of any drivers, in order for each
// driver. Accepts any pod whose own size is right; one that is not well-formed (PodCheck.h) has no cycles.
// Leaves out a cycle that lacks information, clock or driver, or whose clock has impossible values.
std::vector<ProfiledCycle> cyclesOf(const spa_pod& profile);

}  // namespace tonewerk
