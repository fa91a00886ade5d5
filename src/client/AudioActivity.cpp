// SPDX-License-Identifier: Apache-2.0
#include "client/AudioActivity.h"

#include <ctime>

namespace tonewerk {
namespace {

// Reading this clock makes no system call, whatever the clock source is.
std::uint64_t coarseMicroseconds() {
  timespec now{};
  ::clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000U +
         static_cast<std::uint64_t>(now.tv_nsec) / 1000U;
}

}  // namespace

bool AudioActivity::begin(Kind kind) {
  const std::uint64_t now = coarseMicroseconds() * (kKinds + 1);
  std::uint64_t seen = state_.load();
  while (!state_.compare_exchange_weak(seen, ((seen & kKinds) == 0 ? now : seen) | kind)) {
  }
  return (seen & kind) == 0;
}

AudioActivity::End AudioActivity::end(Kind kind) {
  std::uint64_t seen = state_.load();
  while (!state_.compare_exchange_weak(seen, seen & ~std::uint64_t{kind})) {
  }
  if ((seen & kind) == 0) return {};
  End end{true, std::nullopt, seen & ~kKinds};
  if ((seen & kKinds) == kind) {
    const std::uint64_t began = seen / (kKinds + 1);
    end.seconds = static_cast<double>(coarseMicroseconds() - began) / 1e6;
  }
  return end;
}

void AudioActivity::resume(Kind kind, const End& end) {
  std::uint64_t seen = state_.load();
  while (!state_.compare_exchange_weak(seen, ((seen & kKinds) == 0 ? end.since : seen) | kind)) {
  }
}

}  // namespace tonewerk
