// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/RealTimeThreads.h"

#include <algorithm>
#include <iterator>
#include <sched.h>
#include <utility>

#include "bridges/pipewire/kernel/KernelSampler.h"
#include "bridges/pipewire/kernel/KernelTexts.h"

namespace tonewerk {
namespace {

constexpr std::string_view kInterruptThread = "irq/";

bool isRealTime(int policy) { return policy == SCHED_FIFO || policy == SCHED_RR || policy == SCHED_DEADLINE; }

// Keeps the array sorted by time, longest first.
void addHog(const Hog& hog, MachineMoment& moment) {
  const auto begin = moment.hogBuffer.begin();
  const auto end = begin + static_cast<std::ptrdiff_t>(moment.hogCount);
  const auto place = std::find_if(begin, end, [&](const Hog& other) { return other.ran < hog.ran; });
  if (place == moment.hogBuffer.end()) return;
  if (moment.hogCount < moment.hogBuffer.size()) ++moment.hogCount;
  const auto last = begin + static_cast<std::ptrdiff_t>(moment.hogCount) - 1;
  std::move_backward(place, last, std::next(last));
  *place = hog;
}

}  // namespace

RealTimeThreads::RealTimeThreads(const KernelCalls& calls, std::string proc)
    : calls_(calls), proc_(std::move(proc)) {
  processes_.reserve(kMaxProcesses);
  newProcesses_.reserve(kMaxProcesses);
  listed_.reserve(kMaxProcesses);
  threads_.reserve(KernelSampler::kMaxRealTimeThreads);
}

void RealTimeThreads::clear() {
  processes_.clear();
  newProcesses_.clear();
  threads_.clear();
  turn_ = 0;
  samples_ = 0;
}

void RealTimeThreads::sample(MachineMoment& moment) {
  for (Thread& thread : threads_) sample(thread, moment);
  std::erase_if(threads_, [](const Thread& thread) { return thread.isGone; });

  if (samples_++ % kListEvery == 0) list();
  for (int i = 0; i < kNewAtOnce && !newProcesses_.empty(); ++i) {
    const std::int32_t pid = newProcesses_.back();
    newProcesses_.pop_back();
    lookAt(pid);
  }
  for (int i = 0; i < kOldAtOnce && !processes_.empty(); ++i) {
    turn_ = (turn_ + 1) % processes_.size();
    lookAt(processes_[turn_]);
  }
}

void RealTimeThreads::list() {
  listed_.clear();
  visitDirectory(KernelPath(proc_), [&](const char* name) {
    const std::int32_t pid = numberAfter(name, "");
    if (pid > 0 && listed_.size() < kMaxProcesses) listed_.push_back(pid);
  });
  std::sort(listed_.begin(), listed_.end());
  // The newest are looked at first, because a process that has just come may be the one that disturbs.
  for (const std::int32_t pid : listed_) {
    const bool isKnown = std::binary_search(processes_.begin(), processes_.end(), pid);
    if (!isKnown && newProcesses_.size() < kMaxProcesses) newProcesses_.push_back(pid);
  }
  std::swap(processes_, listed_);
}

void RealTimeThreads::lookAt(std::int32_t pid) {
  visitDirectory(KernelPath(proc_) / pid / "task", [&](const char* name) {
    const std::int32_t tid = numberAfter(name, "");
    if (tid > 0 && isRealTime(calls_.policyOf(tid))) follow(pid, tid);
  });
}

void RealTimeThreads::follow(std::int32_t pid, std::int32_t tid) {
  if (threads_.size() >= KernelSampler::kMaxRealTimeThreads) return;
  const auto isSame = [&](const Thread& thread) { return thread.tid == tid; };
  if (std::any_of(threads_.begin(), threads_.end(), isSame)) return;
  const KernelPath process = KernelPath(proc_) / pid;
  const KernelPath directory = process / "task" / tid;
  Thread thread;
  thread.pid = pid;
  thread.tid = tid;
  thread.stat = KernelFile(directory / "stat");
  const auto stat = threadStatIn(thread.stat.read(buffer_).value_or(std::string_view()));
  if (!stat || (stat->isOfKernel && !stat->name.view().starts_with(kInterruptThread))) return;
  thread.times = KernelFile(directory / "schedstat");
  const auto times = threadTimesIn(thread.times.read(buffer_).value_or(std::string_view()));
  if (!times) return;
  thread.ran = times->ran;
  const KernelFile name(process / "comm");
  thread.process = nameIn(name.read(buffer_).value_or(std::string_view()));
  threads_.push_back(std::move(thread));
}

void RealTimeThreads::sample(Thread& thread, MachineMoment& moment) {
  const auto times = threadTimesIn(thread.times.read(buffer_).value_or(std::string_view()));
  if (!times) {
    thread.isGone = true;
    return;
  }
  const std::chrono::nanoseconds ran = times->ran - thread.ran;
  thread.ran = times->ran;
  if (ran.count() <= 0 || ran * kLeastPart < moment.interval) return;
  const auto stat = threadStatIn(thread.stat.read(buffer_).value_or(std::string_view()));
  if (!stat || !isRealTime(stat->policy)) {
    thread.isGone = true;
    return;
  }
  addHog({thread.pid, thread.tid, stat->name, thread.process, ran, stat->policy, stat->priority,
          stat->processor},
         moment);
}

}  // namespace tonewerk
