// SPDX-License-Identifier: Apache-2.0
#include "client/AudioActivity.h"

#include <algorithm>

namespace tonewerk {

bool AudioActivity::begin(Kind kind, Time now) {
  const std::uint64_t since = static_cast<std::uint64_t>(now.count()) * (kKinds + 1);
  std::uint64_t seen = state_.load();
  while (!state_.compare_exchange_weak(seen, ((seen & kKinds) == 0 ? since : seen) | kind)) {
  }
  return (seen & kind) == 0;
}

AudioActivity::End AudioActivity::end(Kind kind, Time now) {
  std::uint64_t seen = state_.load();
  while (!state_.compare_exchange_weak(seen, seen & ~std::uint64_t{kind})) {
  }
  if ((seen & kind) == 0) return {};
  End end{true, std::nullopt, seen & ~kKinds};
  if ((seen & kKinds) == kind) {
    // Another thread may have ended and begun the same after this one has looked at its clock.
    const Time length = std::max(Time::zero(), now - Time(seen / (kKinds + 1)));
    end.seconds = std::chrono::duration<double>(length).count();
  }
  return end;
}

void AudioActivity::resume(Kind kind, const End& end) {
  std::uint64_t seen = state_.load();
  while (!state_.compare_exchange_weak(seen, ((seen & kKinds) == 0 ? end.since : seen) | kind)) {
  }
}

}  // namespace tonewerk
