// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/KernelFacts.h"

#include <algorithm>
#include <fstream>
#include <map>
#include <utility>
#include <vector>

#include "bridges/pipewire/graph/CleanText.h"

namespace tonewerk {

namespace {

constexpr int kOtherPolicy = 0;  // SCHED_OTHER

bool isStopped(char state) { return state == 'T' || state == 't'; }

}  // namespace

KernelFacts::KernelFacts(EventLoop& loop, const Clock& clock, KernelSampler& sampler, std::string proc)
    : clock_(clock),
      sampler_(sampler),
      proc_(std::move(proc)),
      timer_(loop.makeTimer([this] { sample(); })) {}

void KernelFacts::audioRuns(std::span<const std::int32_t> processes) {
  ranAt_ = clock_.monotonic();
  sampler_.watch(processes);
  // At once, so that a glitch that is judged next has its latest sample.
  sample();
}

std::optional<ProcessFacts> KernelFacts::process(std::int32_t process, std::chrono::nanoseconds from,
                                                 std::chrono::nanoseconds to) const {
  struct Sums {
    std::chrono::nanoseconds interval{0};
    std::chrono::nanoseconds ran{0};
    std::chrono::nanoseconds waited{0};
  };
  std::map<std::int32_t, Sums> threads;
  ProcessFacts facts;
  bool hasNumbers = false;
  const std::vector<ThreadMoment> moments = sampler_.threadMoments(process, from, to);
  facts.isThreadKnown =
      std::any_of(moments.begin(), moments.end(), [](const ThreadMoment& moment) { return moment.isAudio; });
  for (const ThreadMoment& moment : moments) {
    if (moment.isAudio != facts.isThreadKnown) continue;
    Sums& sums = threads[moment.tid];
    sums.interval += moment.interval;
    sums.ran += moment.ran;
    sums.waited += moment.waited;
    facts.majorFaults += moment.majorFaults;
    if (isStopped(moment.state)) facts.isStopped = true;
    if (moment.state == 'R' && moment.ran * 2 < moment.interval) facts.isRunnable = true;
    if (moment.state == 'D') facts.isWaitingForDevice = true;
    if (moment.policy == kOtherPolicy) facts.isRealTime = false;
    if (moment.interval.count() > 0) hasNumbers = true;
  }
  if (!hasNumbers) return std::nullopt;
  for (const auto& [thread, sums] : threads) {
    facts.interval = std::max(facts.interval, sums.interval);
    facts.ran = std::max(facts.ran, sums.ran);
    facts.waited = std::max(facts.waited, sums.waited);
  }
  return facts;
}

MachineFacts KernelFacts::machine(std::chrono::nanoseconds from, std::chrono::nanoseconds to) const {
  MachineFacts facts;
  std::map<std::int32_t, ProcessorHolder> holders;
  for (const MachineMoment& moment : sampler_.machineMoments(from, to)) {
    facts.interval += moment.interval;
    facts.cpuStall += moment.cpuStall;
    facts.memoryStall += moment.memoryStall;
    facts.ioStall += moment.ioStall;
    facts.slept += moment.slept;
    facts.isThrottled = facts.isThrottled || moment.isThrottled;
    facts.frequencyPerMille = moment.frequencyPerMille;
    for (const Hog& hog : moment.hogs()) {
      ProcessorHolder& holder = holders[hog.pid];
      holder.process = hog.pid;
      holder.name = cleanText(hog.process.view());
      holder.priority = std::max(holder.priority, hog.priority);
      holder.ran += hog.ran;
    }
  }
  for (auto& [process, holder] : holders) facts.holders.push_back(std::move(holder));
  std::stable_sort(facts.holders.begin(), facts.holders.end(),
                   [](const ProcessorHolder& a, const ProcessorHolder& b) { return a.ran > b.ran; });
  return facts;
}

std::string KernelFacts::nameOf(std::int32_t process) const {
  if (process <= 0) return {};
  std::ifstream file(proc_ + "/" + std::to_string(process) + "/comm");
  std::string name;
  std::getline(file, name);
  return cleanText(name);
}

void KernelFacts::sample() {
  if (clock_.monotonic() - ranAt_ >= kIdle) {
    sampler_.pause();
    return;
  }
  sampler_.sample();
  timer_->arm(KernelSampler::kInterval);
}

}  // namespace tonewerk
