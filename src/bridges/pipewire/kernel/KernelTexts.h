// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string_view>

#include "bridges/pipewire/kernel/KernelMoments.h"

namespace tonewerk {

// The used part of /proc/PID/task/TID/stat.
struct ThreadStat {
  ThreadName name;
  char state = '?';
  bool isOfKernel = false;        // a thread of the kernel's own
  std::uint64_t majorFaults = 0;  // since the thread's start
  std::int32_t processor = -1;
  std::int32_t priority = 0;
  std::int32_t policy = 0;
};

// The used part of /proc/PID/task/TID/schedstat, since the thread's start.
struct ThreadTimes {
  std::chrono::nanoseconds ran{0};
  std::chrono::nanoseconds waited{0};
};

// None if the text has another form. A number outside its range counts as 0. A name may hold any characters.
[[nodiscard]] std::optional<ThreadStat> threadStatIn(std::string_view text);
[[nodiscard]] std::optional<ThreadTimes> threadTimesIn(std::string_view text);
// How long, since the system's start, at least one process waited; from a file of /proc/pressure.
[[nodiscard]] std::optional<std::chrono::nanoseconds> pressureIn(std::string_view text);
// The number that the text begins with.
[[nodiscard]] std::optional<std::uint64_t> countIn(std::string_view text);
// The first line.
[[nodiscard]] ThreadName nameIn(std::string_view text);

}  // namespace tonewerk
