// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

// One process, as the kernel sees it.
struct ProcessRow {
  std::int32_t identifier = 0;
  std::int32_t parent = 0;
  char state = '?';  // 'R' running, 'S' sleeping, 'D' waiting for a device, 'Z' ended, ...
  std::int64_t threads = 0;
  double processorSeconds = 0.0;    // user and system, since it started
  std::uint64_t residentBytes = 0;  // shared pages included
  std::uint64_t privateBytes = 0;   // resident and swapped anonymous memory; 0 for the kernel's threads
  std::uint64_t lockedBytes = 0;    // that may not be swapped
  std::string name;                 // at most 15 bytes; any byte but a zero
};

// All processes by identifier; none when `procDirectory` cannot be read. Those that end meanwhile are left
// out.
std::vector<ProcessRow> readProcessTable(const std::string& procDirectory = "/proc");

}  // namespace tonewerk
