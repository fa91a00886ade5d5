// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/AudioThreads.h"

#include <algorithm>
#include <sched.h>
#include <utility>

#include "bridges/pipewire/kernel/KernelSampler.h"

namespace tonewerk {
namespace {

constexpr std::string_view kLibraryName = "data-loop";
constexpr int kLooks = 2;

KernelPath directoryOf(const std::string& proc, std::int32_t pid, std::int32_t tid) {
  return KernelPath(proc) / pid / "task" / tid;
}

// Counters of a thread only rise. One that does not belongs to another thread that got the same number.
template <typename Count>
Count growth(Count before, Count now) {
  return now >= before ? now - before : Count();
}

}  // namespace

AudioThreads::AudioThreads(const KernelCalls& calls, std::string proc)
    : calls_(calls), proc_(std::move(proc)) {
  listed_.reserve(kMaxSeen);
}

void AudioThreads::watch(std::span<const std::int32_t> processes) {
  processes = processes.first(std::min(processes.size(), kMaxProcesses));
  const auto isWanted = [&](const Process& process) {
    return std::find(processes.begin(), processes.end(), process.pid) != processes.end();
  };
  std::erase_if(processes_, [&](const Process& process) { return !isWanted(process); });
  for (const std::int32_t pid : processes) {
    const bool isKnown = std::any_of(processes_.begin(), processes_.end(),
                                     [&](const Process& process) { return process.pid == pid; });
    if (pid <= 0 || isKnown) continue;
    lookAt(processes_.emplace_back(Process{pid, {}, {}}));
  }
}

void AudioThreads::look() {
  for (Process& process : processes_) lookAt(process);
}

void AudioThreads::lookAt(Process& process) {
  listed_.clear();
  visitDirectory(KernelPath(proc_) / process.pid / "task", [&](const char* name) {
    const std::int32_t tid = numberAfter(name, "");
    if (tid <= 0 || listed_.size() >= kMaxSeen) return;
    const auto known = std::find_if(process.seen.begin(), process.seen.end(),
                                    [&](const Seen& seen) { return seen.tid == tid; });
    listed_.push_back(known == process.seen.end() ? Seen{tid, 0, false} : *known);
  });
  // One that has lost its real-time policy is followed on.
  bool isKnown = std::any_of(process.threads.begin(), process.threads.end(),
                             [](const Thread& thread) { return thread.isAudio && thread.stat; });
  for (Seen& seen : listed_) {
    if (!isAudio(process.pid, seen)) continue;
    isKnown = true;
    follow(process, seen.tid, true);
  }
  if (isKnown) {
    std::erase_if(process.threads, [](const Thread& thread) { return !thread.isAudio; });
  } else {
    followOthers(process);
  }
  // Threads that have ended are no longer listed; their numbers may come again.
  process.seen.assign(listed_.begin(), listed_.end());
}

bool AudioThreads::isAudio(std::int32_t pid, Seen& seen) {
  const int policy = calls_.policyOf(seen.tid);
  if (policy == SCHED_FIFO || policy == SCHED_RR) return true;
  if (seen.isNamed || seen.looks >= kLooks) return seen.isNamed;
  ++seen.looks;
  const KernelFile file(directoryOf(proc_, pid, seen.tid) / "stat");
  const auto stat = threadStatIn(file.read(buffer_).value_or(std::string_view()));
  seen.isNamed = stat && stat->name.view().starts_with(kLibraryName);
  return seen.isNamed;
}

void AudioThreads::followOthers(Process& process) {
  std::size_t elsewhere = 0;
  for (const Process& each : processes_) {
    if (&each != &process) elsewhere += count(each, false);
  }
  if (listed_.size() > KernelSampler::kMaxOthersOfProcess ||
      elsewhere + listed_.size() > KernelSampler::kMaxOthers) {
    std::erase_if(process.threads, [](const Thread& thread) { return !thread.isAudio; });
    return;
  }
  for (const Seen& seen : listed_) follow(process, seen.tid, false);
}

void AudioThreads::follow(Process& process, std::int32_t tid, bool isAudio) {
  for (const Thread& thread : process.threads) {
    if (thread.tid == tid && thread.isAudio == isAudio && thread.stat) return;
  }
  if (!makeRoom(process, isAudio)) return;
  const KernelPath directory = directoryOf(proc_, process.pid, tid);
  KernelFile stat(directory / "stat");
  if (!stat) return;
  process.threads.push_back({tid, isAudio, std::move(stat), KernelFile(directory / "schedstat"), false,
                             std::chrono::nanoseconds(0), ThreadTimes(), 0,
                             MomentRing<ThreadMoment>(KernelSampler::kKept)});
}

// Only a thread that has ended gives its place, and the samples of it.
bool AudioThreads::makeRoom(Process& process, bool isAudio) const {
  std::size_t all = 0;
  for (const Process& each : processes_) all += count(each, isAudio);
  const bool isFull =
      isAudio
          ? count(process, true) >= KernelSampler::kMaxThreadsOfProcess || all >= KernelSampler::kMaxThreads
          : count(process, false) >= KernelSampler::kMaxOthersOfProcess || all >= KernelSampler::kMaxOthers;
  if (!isFull) return true;
  const auto ended = std::find_if(process.threads.begin(), process.threads.end(), [&](const Thread& thread) {
    return thread.isAudio == isAudio && !thread.stat;
  });
  if (ended == process.threads.end()) return false;
  process.threads.erase(ended);
  return true;
}

std::size_t AudioThreads::count(const Process& process, bool isAudio) {
  return static_cast<std::size_t>(
      std::count_if(process.threads.begin(), process.threads.end(),
                    [&](const Thread& thread) { return thread.isAudio == isAudio; }));
}

void AudioThreads::sample(std::chrono::nanoseconds now) {
  for (Process& process : processes_) {
    for (Thread& thread : process.threads) sample(process.pid, thread, now);
  }
}

void AudioThreads::sample(std::int32_t pid, Thread& thread, std::chrono::nanoseconds now) {
  if (!thread.stat) return;
  const auto stat = threadStatIn(thread.stat.read(buffer_).value_or(std::string_view()));
  if (!stat) {
    thread.stat.close();
    thread.times.close();
    return;
  }
  // A kernel without this file tells the rest.
  const ThreadTimes times =
      threadTimesIn(thread.times.read(buffer_).value_or(std::string_view())).value_or(thread.counted);
  ThreadMoment moment;
  moment.pid = pid;
  moment.tid = thread.tid;
  moment.isAudio = thread.isAudio;
  moment.at = now;
  moment.state = stat->state;
  moment.policy = stat->policy;
  moment.priority = stat->priority;
  if (thread.hasSample) {
    moment.interval = now - thread.at;
    moment.ran = growth(thread.counted.ran, times.ran);
    moment.waited = growth(thread.counted.waited, times.waited);
    moment.majorFaults = growth(thread.majorFaults, stat->majorFaults);
  }
  thread.hasSample = true;
  thread.at = now;
  thread.counted = times;
  thread.majorFaults = stat->majorFaults;
  thread.moments.push(moment);
}

void AudioThreads::clear() {
  for (Process& process : processes_) {
    process.threads.clear();
    process.seen.clear();
  }
}

void AudioThreads::find(std::int32_t pid, std::chrono::nanoseconds from, std::chrono::nanoseconds to,
                        std::vector<ThreadMoment>& found) const {
  for (const Process& process : processes_) {
    if (process.pid != pid) continue;
    for (const Thread& thread : process.threads) thread.moments.find(from, to, found);
  }
  std::stable_sort(found.begin(), found.end(),
                   [](const ThreadMoment& a, const ThreadMoment& b) { return a.at < b.at; });
}

}  // namespace tonewerk
