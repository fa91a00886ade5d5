// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

namespace tonewerk {

// The name of a thread or a process, as the kernel keeps it: at most 15 bytes of any value except 0.
struct ThreadName {
  std::array<char, 16> bytes{};  // zeros after the name

  std::string_view view() const { return bytes.data(); }
};

// What the kernel says about one thread at one time, and since the sample before.
struct ThreadMoment {
  std::int32_t pid = 0;            // of its process
  std::int32_t tid = 0;            // its own
  bool isAudio = true;             // false: its process has no known audio thread, and any may be it
  std::chrono::nanoseconds at{0};  // monotonic time of the sample
  // How long the numbers below took to gather; 0 for the first sample of a thread, whose numbers are 0, too.
  std::chrono::nanoseconds interval{0};
  std::chrono::nanoseconds ran{0};  // on a processor; the kernel adds a running thread's time at each tick
  // Runnable, but not on a processor. The kernel adds a wait when it ends: a thread that still waits has a
  // wait of 0 and the state 'R', and the whole wait is in a later sample.
  std::chrono::nanoseconds waited{0};
  std::uint64_t majorFaults = 0;  // pages that it had to wait for
  char state = '?';               // at the sample: R runs or waits for a processor, S sleeps, D waits for a
                                  // device, T is stopped
  std::int32_t policy = 0;        // of scheduling: SCHED_OTHER and so on
  std::int32_t priority = 0;      // at a real-time policy: 1 to 99; else 0
};

// Describes a thread at a real-time policy that ran for most of an interval. Threads of lower priority waited
// for it on its processor.
struct Hog {
  std::int32_t pid = 0;
  std::int32_t tid = 0;
  ThreadName name;                  // of the thread
  ThreadName process;               // of its process
  std::chrono::nanoseconds ran{0};  // within the interval
  std::int32_t policy = 0;
  std::int32_t priority = 0;
  std::int32_t processor = -1;  // number of the one that it ran on at the sample; -1 unknown
};

// The kernel's state of an open substream of a sound card.
struct PcmMoment {
  std::int32_t card = 0;
  std::int32_t device = 0;
  bool isPlayback = false;
  bool isXrun = false;     // stopped, because the program gave or took nothing in time
  std::int64_t delay = 0;  // frames between the program and the hardware
};

// What the kernel says about the machine at one time, and since the sample before. What a kernel or a
// container does not tell is 0.
struct MachineMoment {
  static constexpr std::size_t kMaxHogs = 4;
  static constexpr std::size_t kMaxPcms = 8;

  std::chrono::nanoseconds at{0};        // monotonic time of the sample
  std::chrono::nanoseconds interval{0};  // since the sample before; 0 for the first one after a pause
  // How long within the interval at least one process waited for a processor, for memory, for storage.
  std::chrono::nanoseconds cpuStall{0};
  std::chrono::nanoseconds memoryStall{0};
  std::chrono::nanoseconds ioStall{0};
  std::chrono::nanoseconds slept{0};    // how long the system was suspended
  double wallJump = 0.0;                // seconds; slewing makes less than 0.0005 in a second
  std::uint32_t frequencyPerMille = 0;  // the fastest processor's, of its own fastest; 0 unknown
  bool isThrottled = false;  // a processor was slowed down for its heat since the last look at it, <= 2 s ago
  std::array<Hog, kMaxHogs> hogBuffer{};  // those that ran longest, longest first
  std::size_t hogCount = 0;
  std::array<PcmMoment, kMaxPcms> pcmBuffer{};
  std::size_t pcmCount = 0;

  std::span<const Hog> hogs() const { return {hogBuffer.data(), hogCount}; }
  std::span<const PcmMoment> pcms() const { return {pcmBuffer.data(), pcmCount}; }
};

}  // namespace tonewerk
