// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <string_view>
#include <vector>

#include "tools/memory-usage/MemoryUsage.h"

namespace tonewerk {

enum class UsageOrder { kFootprint, kResident, kWired, kProcessorTime, kProcess };

// Largest first, processes of the same size by number.
void sortProcesses(std::vector<ProcessUsage>& processes, UsageOrder order);

// For each of the first `most` processes, for all processes together and for the whole system:
//
//        RESOURCE      TOTAL       FIRST      SECOND      MOSTLY  4711 pipewire (user 1000)
//        cpu_time      12.50       10.00        2.50        user
//        phys_mem      30000       20000       10000   anonymous
//       wired_mem          0           0           0        none
//  phys_footprint      20100       20000         100    resident
//
// The daemon's memory log keeps lines by the words in them, and knows the third one by its spaces.
void writeUsageText(std::ostream& out, const UsageSnapshot& snapshot, std::size_t most);

// The same, one JSON object a line.
void writeUsageJson(std::ostream& out, const UsageSnapshot& snapshot, std::size_t most);

}  // namespace tonewerk
