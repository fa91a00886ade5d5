// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <string_view>
#include <vector>

#include "tools/memory-usage/MemoryUsage.h"

namespace tonewerk {

enum class UsageOrder { kFootprint, kResident, kWired, kProcessorTime, kProcess };

// Sorts the processes, largest first; processes of the same size are in the order of their identifiers.
void sortProcesses(std::vector<ProcessUsage>& processes, UsageOrder order);

// Writes a block for each of the first `maxProcesses` processes, for all processes together and for the whole
// system:
//
//        RESOURCE      TOTAL       FIRST      SECOND      MOSTLY  4711 pipewire (user 1000)
//        cpu_time      12.50       10.00        2.50        user
//        phys_mem      30000       20000       10000   anonymous
//       wired_mem          0           0           0        none
//  phys_footprint      20100       20000         100    resident
//
// The daemon's memory log selects lines by their words, and recognises the third one by its spaces.
void writeUsageText(std::ostream& out, const UsageSnapshot& snapshot, std::size_t maxProcesses);

// Writes the same data as JSON, one object per line.
void writeUsageJson(std::ostream& out, const UsageSnapshot& snapshot, std::size_t maxProcesses);

}  // namespace tonewerk
