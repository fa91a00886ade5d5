// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

// The processor time in seconds and the memory in KiB that a process, or the whole system, uses. Each of the
// four resources is the sum of two parts.
struct MemoryUsage {
  double userSeconds = 0.0;
  double systemSeconds = 0.0;
  // Resident memory: private pages, and pages of files or shared with other processes.
  std::uint64_t anonymous = 0;
  std::uint64_t shared = 0;
  // Memory that is never swapped: locked on request, and pinned by devices (for the whole system: by the
  // kernel).
  std::uint64_t locked = 0;
  std::uint64_t pinned = 0;
  // The swapped part of the private memory; `anonymous` is the resident part.
  std::uint64_t swapped = 0;

  double seconds() const { return userSeconds + systemSeconds; }
  std::uint64_t resident() const { return anonymous + shared; }
  std::uint64_t wired() const { return locked + pinned; }
  std::uint64_t footprint() const { return anonymous + swapped; }

  MemoryUsage& operator+=(const MemoryUsage& other);
  friend bool operator==(const MemoryUsage&, const MemoryUsage&) = default;
};

struct ProcessUsage {
  std::int32_t process = 0;
  std::uint32_t user = 0;
  std::string name;  // printable ASCII
  MemoryUsage usage;
};

// The usage of all processes and the system at about the same time.
struct UsageSnapshot {
  std::vector<ProcessUsage> processes;  // those with private memory; kernel threads have none
  std::size_t unreadable = 0;           // number of processes that exist but could not be read
  MemoryUsage system;
};

}  // namespace tonewerk
