// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

// The kernel's data of one process.
struct ProcessRow {
  std::int32_t identifier = 0;
  std::int32_t parent = 0;
  char state = '?';  // 'R' running, 'S' sleeping, 'D' waiting for a device, 'Z' ended, ...
  std::int64_t threads = 0;
  double processorSeconds = 0.0;    // user and system time since its start
  std::uint64_t residentBytes = 0;  // shared pages included
  std::uint64_t privateBytes = 0;   // resident and swapped anonymous memory; 0 for kernel threads
  std::uint64_t lockedBytes = 0;    // must not be swapped
  std::string name;                 // at most 15 bytes before conversion; any character except NUL
};

// All processes in the order of their identifiers; none if `procDirectory` cannot be read. Processes that end
// meanwhile are left out.
std::vector<ProcessRow> readProcessTable(const std::string& procDirectory = "/proc");

}  // namespace tonewerk
