// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "bridges/pipewire/kernel/KernelCalls.h"
#include "bridges/pipewire/kernel/KernelMoments.h"

namespace tonewerk {

// Samples what the kernel says about the audio threads of processes and about the machine, and keeps the last
// kKept samples. The answers to "who held the processor?" and "was it the storage?" come from here.
//
// A process's audio threads are those that PipeWire's library names ("data-loop...") and all at a real-time
// policy. They are looked for when the process is first watched, and again about every second. While a
// process has none, all its threads are watched instead, since one of them must be it; none of them if they
// are more than kMaxOthersOfProcess, because the one that matters might be missing.
//
// Files stay open between samples, and a sample allocates nothing unless threads have come or gone. A fact
// that cannot be read (a process that ended or belongs to somebody else, a kernel without the file) is
// absent; nothing here fails. Used on one thread. Numbers are bounded: see the limits below.
class KernelSampler {
 public:
  static constexpr std::chrono::milliseconds kInterval{100};  // between calls of sample()
  static constexpr std::size_t kKept = 64;                    // samples
  static constexpr std::size_t kMaxThreads = 128;  // audio threads that are watched, of all processes
  static constexpr std::size_t kMaxThreadsOfProcess = 8;
  static constexpr std::size_t kMaxOthers = 64;  // threads of processes without a known audio thread
  static constexpr std::size_t kMaxOthersOfProcess = 16;
  static constexpr std::size_t kMaxRealTimeThreads = 64;  // of the machine, in which hogs are looked for

  // The directories that the kernel's files are in: "/proc" and "/sys", or copies of their layout in tests.
  struct Roots {
    std::string proc;
    std::string sys;
  };

  // `calls` outlives this object.
  explicit KernelSampler(const KernelCalls& calls);
  KernelSampler(const KernelCalls& calls, const Roots& roots);
  KernelSampler(const KernelSampler&) = delete;
  KernelSampler& operator=(const KernelSampler&) = delete;
  ~KernelSampler();

  // Watches the threads of these processes from the next sample on, and no others. What was kept of a process
  // that is left out is dropped. Cheap when nothing changes.
  void watch(std::span<const std::int32_t> processes);

  // Takes a sample. Call it about every kInterval while audio runs.
  void sample();

  // Closes all files and forgets all samples, but not what to watch. Call it when audio no longer runs: a
  // sampler that is not called costs nothing, and the next sample must not be compared with an old one.
  void pause();

  // The samples of a process's threads whose interval overlaps [from, to] (monotonic time), oldest first.
  [[nodiscard]] std::vector<ThreadMoment> threadMoments(std::int32_t pid, std::chrono::nanoseconds from,
                                                        std::chrono::nanoseconds to) const;
  // The samples of the machine whose interval overlaps [from, to], oldest first.
  [[nodiscard]] std::vector<MachineMoment> machineMoments(std::chrono::nanoseconds from,
                                                          std::chrono::nanoseconds to) const;

 private:
  struct State;

  std::unique_ptr<State> state_;
};

}  // namespace tonewerk
