// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/KernelSampler.h"

#include <optional>

#include "bridges/pipewire/kernel/AudioThreads.h"
#include "bridges/pipewire/kernel/MachineFiles.h"
#include "bridges/pipewire/kernel/MomentRing.h"
#include "bridges/pipewire/kernel/RealTimeThreads.h"
#include "bridges/pipewire/kernel/SoundCardFiles.h"

namespace tonewerk {
namespace {

// How many samples lie between two looks for what has come.
constexpr int kThreadsEvery = 10;
constexpr int kCardsEvery = 20;

}  // namespace

struct KernelSampler::State {
  State(const KernelCalls& kernel, const Roots& roots)
      : calls(kernel),
        audio(kernel, roots.proc),
        realTime(kernel, roots.proc),
        machine(roots.proc, roots.sys),
        cards(roots.proc) {}

  const KernelCalls& calls;
  AudioThreads audio;
  RealTimeThreads realTime;
  MachineFiles machine;
  SoundCardFiles cards;
  MomentRing<MachineMoment> moments{kKept};
  std::optional<ClockTimes> before;  // of the newest sample
  int samples = 0;                   // since the last pause
};

KernelSampler::KernelSampler(const KernelCalls& calls) : KernelSampler(calls, {"/proc", "/sys"}) {}

KernelSampler::KernelSampler(const KernelCalls& calls, const Roots& roots)
    : state_(std::make_unique<State>(calls, roots)) {}

KernelSampler::~KernelSampler() = default;

void KernelSampler::watch(std::span<const std::int32_t> processes) { state_->audio.watch(processes); }

void KernelSampler::sample() {
  State& state = *state_;
  if (state.samples % kThreadsEvery == 0) state.audio.look();
  if (state.samples % kCardsEvery == 0) state.cards.look();
  state.samples = (state.samples + 1) % (kThreadsEvery * kCardsEvery);

  const ClockTimes now = state.calls.clocks();
  MachineMoment moment;
  moment.at = now.monotonic;
  if (state.before) {
    moment.interval = now.monotonic - state.before->monotonic;
    const std::chrono::nanoseconds booted = now.boot - state.before->boot;
    moment.slept = booted - moment.interval;
    moment.wallJump = std::chrono::duration<double>(now.wall - state.before->wall - booted).count();
  }
  state.before = now;
  state.audio.sample(now.monotonic);
  state.machine.sample(moment);
  state.realTime.sample(moment);
  state.cards.sample(moment);
  state.moments.push(moment);
}

void KernelSampler::pause() {
  State& state = *state_;
  state.audio.clear();
  state.machine.close();
  state.realTime.clear();
  state.cards.close();
  state.moments.clear();
  state.before.reset();
  state.samples = 0;
}

std::vector<ThreadMoment> KernelSampler::threadMoments(std::int32_t pid, std::chrono::nanoseconds from,
                                                       std::chrono::nanoseconds to) const {
  std::vector<ThreadMoment> found;
  state_->audio.find(pid, from, to, found);
  return found;
}

std::vector<MachineMoment> KernelSampler::machineMoments(std::chrono::nanoseconds from,
                                                         std::chrono::nanoseconds to) const {
  std::vector<MachineMoment> found;
  state_->moments.find(from, to, found);
  return found;
}

}  // namespace tonewerk
