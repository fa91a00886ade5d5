// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "bridges/pipewire/kernel/KernelCalls.h"
#include "bridges/pipewire/kernel/KernelFile.h"
#include "bridges/pipewire/kernel/KernelMoments.h"
#include "bridges/pipewire/kernel/KernelTexts.h"
#include "bridges/pipewire/kernel/MomentRing.h"

namespace tonewerk {

// Samples the audio threads of the processes that are watched, or all threads of a process without one (see
// KernelSampler.h).
class AudioThreads {
 public:
  static constexpr std::size_t kMaxProcesses = 64;
  static constexpr std::size_t kMaxSeen = 256;  // threads of a process that are looked at

  // `calls` outlives this object. `proc` is "/proc" or a copy of its layout.
  AudioThreads(const KernelCalls& calls, std::string proc);

  // The first kMaxProcesses of these processes.
  void watch(std::span<const std::int32_t> processes);
  void sample(std::chrono::nanoseconds now);
  // Looks for threads that have come.
  void look();
  // Forgets the samples, and closes the files until the next look().
  void clear();

  void find(std::int32_t pid, std::chrono::nanoseconds from, std::chrono::nanoseconds to,
            std::vector<ThreadMoment>& found) const;

 private:
  struct Thread {
    std::int32_t tid = 0;
    bool isAudio = true;  // see ThreadMoment
    KernelFile stat;      // both closed when the thread has ended; its samples stay
    KernelFile times;
    bool hasSample = false;
    std::chrono::nanoseconds at{0};  // of the newest sample
    ThreadTimes counted;
    std::uint64_t majorFaults = 0;
    MomentRing<ThreadMoment> moments;
  };
  // A thread that has been looked at. Its name is set shortly after its start, so a second look is needed.
  struct Seen {
    std::int32_t tid = 0;
    int looks = 0;
    bool isNamed = false;  // as an audio thread
  };
  struct Process {
    std::int32_t pid = 0;
    std::vector<Thread> threads;
    std::vector<Seen> seen;
  };

  void lookAt(Process& process);
  bool isAudio(std::int32_t pid, Seen& seen);
  // Follows all listed threads of a process whose audio thread is not known, or none.
  void followOthers(Process& process);
  void follow(Process& process, std::int32_t tid, bool isAudio);
  bool makeRoom(Process& process, bool isAudio) const;
  static std::size_t count(const Process& process, bool isAudio);
  void sample(std::int32_t pid, Thread& thread, std::chrono::nanoseconds now);

  const KernelCalls& calls_;
  const std::string proc_;
  std::vector<Process> processes_;
  std::vector<Seen> listed_;  // used by lookAt() only
  KernelFile::Buffer buffer_{};
};

}  // namespace tonewerk
