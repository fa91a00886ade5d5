// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "bridges/pipewire/kernel/KernelCalls.h"
#include "bridges/pipewire/kernel/KernelFile.h"
#include "bridges/pipewire/kernel/KernelMoments.h"

namespace tonewerk {

// Finds the machine's threads at a real-time policy, and says which of them ran much. Of the kernel's own
// threads only those that serve interrupts count.
//
// To look at every thread at each sample would cost more than everything else. So the list of processes is
// read every kListEvery samples; processes that are new in it are looked at first, the others in turn, a few
// at each sample. A thread that becomes real-time later than that is found within seconds.
class RealTimeThreads {
 public:
  static constexpr int kListEvery = 5;
  static constexpr int kNewAtOnce = 12;  // processes that are looked at in one sample
  static constexpr int kOldAtOnce = 4;
  static constexpr std::size_t kMaxProcesses = 4096;
  // A thread that ran for less than this part of the interval is no hog.
  static constexpr int kLeastPart = 20;

  // `calls` outlives this object. `proc` is "/proc" or a copy of its layout.
  RealTimeThreads(const KernelCalls& calls, std::string proc);

  // Adds to `moment` those that ran longest in its interval.
  void sample(MachineMoment& moment);
  // Forgets all threads.
  void clear();

 private:
  struct Thread {
    std::int32_t pid = 0;
    std::int32_t tid = 0;
    KernelFile stat;
    KernelFile times;
    ThreadName process;
    std::chrono::nanoseconds ran{0};
    bool isGone = false;
  };

  void list();
  void lookAt(std::int32_t pid);
  void follow(std::int32_t pid, std::int32_t tid);
  void sample(Thread& thread, MachineMoment& moment);

  const KernelCalls& calls_;
  const std::string proc_;
  std::vector<std::int32_t> processes_;  // sorted
  std::vector<std::int32_t> newProcesses_;
  std::vector<std::int32_t> listed_;  // used by list() only
  std::size_t turn_ = 0;              // index in processes_
  int samples_ = 0;
  std::vector<Thread> threads_;
  KernelFile::Buffer buffer_{};
};

}  // namespace tonewerk
