// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// The device's thermal level. Each of the kernel's thermal zones has trip points: temperatures above which
// the kernel acts. The zone with the highest level counts.
//
//   trip points reached            level
//   none                           0, nominal
//   "active" or "passive"          1, fair: the kernel cools, with a fan or by slowing down
//   "hot"                          2, serious: the kernel asks for help
//   "critical"                     3, critical: the kernel is about to switch the device off
//
// Zones that are disabled or cannot be read do not count, nor do trip points that are not set (0 degrees and
// less). `directory` is /sys/class/thermal.
int thermalLevelOf(const std::string& directory);

}  // namespace tonewerk
