// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "bridges/pipewire/glitches/CycleHistory.h"
#include "bridges/pipewire/graph/GraphModel.h"

namespace tonewerk {

struct GlitchCycle {
  KeptCycle cycle;
  std::vector<KeptNode> nodes;
};

// How long a node usually takes, in nanoseconds.
struct UsualTimes {
  std::int32_t wait = 0;     // from its signal until it wakes
  std::int32_t compute = 0;  // from then until it has finished
};

// What the kernel said about the audio threads of one process around a glitch.
struct ProcessFacts {
  std::chrono::nanoseconds ran{0};     // the thread that ran longest
  std::chrono::nanoseconds waited{0};  // for a processor; the thread that waited longest
  std::uint64_t majorFaults = 0;       // pages that had to come from storage
  bool isStopped = false;              // a thread was stopped by a signal or a debugger
  bool isRunnable = false;             // a thread was to run, but hardly ran; its wait may not be counted yet
  bool isWaitingForDevice = false;     // a thread was in an uninterruptible sleep
  bool isRealTime = true;              // all its audio threads have a real-time policy
  bool isThreadKnown = true;  // false: all this is of any threads of the process; one is its audio thread
  std::chrono::nanoseconds interval{0};     // that all this is about, longer than the glitch
  std::chrono::nanoseconds usuallyRuns{0};  // its nodes in such an interval; estimated from their cycles
};

// Somebody who kept a processor busy at a real-time policy.
struct ProcessorHolder {
  std::int32_t process = 0;
  std::string name{};  // of the process
  int priority = 0;
  std::chrono::nanoseconds ran{0};  // of a process with nodes: longer than these usually do
};

// What the kernel said about the machine around a glitch.
struct MachineFacts {
  std::chrono::nanoseconds interval{0};  // that these facts are about; 0 without any
  std::chrono::nanoseconds cpuStall{0};
  std::chrono::nanoseconds memoryStall{0};
  std::chrono::nanoseconds ioStall{0};
  std::chrono::nanoseconds slept{0};
  bool isThrottled = false;
  std::uint32_t frequencyPerMille = 0;     // 0 unknown
  std::vector<ProcessorHolder> holders{};  // who ran longest first
};

// Everything that is known about one glitch.
struct GlitchEvidence {
  std::uint32_t driver = 0;
  // Consecutive, the oldest first. Those of the glitch are unfinished, from `first` to `last`; others before
  // and after them show what is usual, and when the late node was done.
  std::vector<GlitchCycle> cycles;
  std::size_t first = 0;
  std::size_t last = 0;
  bool isOver = true;             // the cycle after the last is there
  std::uint32_t deviceXruns = 0;  // that the driver counted

  std::map<std::uint32_t, std::string> names;  // of nodes
  std::map<std::uint32_t, UsualTimes> usual;   // by node; none for one that has not finished a cycle before
  std::vector<NodeLink> links;
  // When the bridge was told that the graph's nodes or links had changed, by the monotonic clock.
  std::vector<std::chrono::nanoseconds> shapeChanges;
  std::map<std::uint32_t, ProcessFacts> processes;  // by node; none where the kernel said nothing
  MachineFacts machine;
};

}  // namespace tonewerk
