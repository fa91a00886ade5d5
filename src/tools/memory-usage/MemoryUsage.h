// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

// What somebody takes of the device: processor time in seconds, memory in KiB. Each of the four resources has
// two parts that add up.
struct MemoryUsage {
  double userSeconds = 0.0;
  double systemSeconds = 0.0;
  // Resident: pages of its own, and pages of files or shared with others.
  std::uint64_t anonymous = 0;
  std::uint64_t shared = 0;
  // Never swapped: what somebody asked to be locked, and what devices (for the whole system: the kernel) hold
  // on to.
  std::uint64_t locked = 0;
  std::uint64_t pinned = 0;
  // Of its own, wherever it is: resident (`anonymous`), and swapped.
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

// A look at everything at about one time.
struct UsageSnapshot {
  std::vector<ProcessUsage> processes;  // those with memory of their own, so none of the kernel's threads
  std::size_t unreadable = 0;           // processes that are there but did not let themselves be read
  MemoryUsage system;
};

}  // namespace tonewerk
