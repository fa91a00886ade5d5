// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// How hot the device is, by its own judgement: each thermal zone of the kernel has trip points, temperatures
// from which on something is done about it. The hottest zone counts.
//
//   trip points reached            level
//   none                           0, nominal
//   "active" or "passive"          1, fair: the kernel cools, with a fan or by slowing down
//   "hot"                          2, serious: the kernel asks for help
//   "critical"                     3, critical: the kernel is about to switch the device off
//
// Zones that are switched off or cannot be read, and trip points that are not set (0 degrees and less), do
// not count. `directory` is /sys/class/thermal.
int thermalLevelOf(const std::string& directory);

}  // namespace tonewerk
