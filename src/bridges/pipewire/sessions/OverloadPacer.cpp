// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/OverloadPacer.h"

#include <algorithm>
#include <utility>

namespace tonewerk {

void OverloadPacer::add(const Overload& overload) {
  // One of which nothing is known is added to whichever is held.
  const auto isSame = [&](const Overload& held) {
    return overload.verdict.key.empty() || held.verdict.key == overload.verdict.key;
  };
  const auto same = std::find_if(held_.rbegin(), held_.rend(), isSame);
  if (same != held_.rend()) {
    same->add(overload);
  } else if (held_.size() < kMaxCulprits) {
    held_.push_back(overload);
  } else {
    Overload rest = overload;
    rest.verdict = {};
    held_.back().add(rest);
  }
}

std::vector<Overload> OverloadPacer::take(std::chrono::nanoseconds now) {
  if (held_.empty() || now < deadline()) return {};
  earliest_ = now + kInterval;
  return takeRest();
}

std::vector<Overload> OverloadPacer::takeRest() { return std::exchange(held_, {}); }

std::optional<std::chrono::nanoseconds> OverloadPacer::deadline() const {
  if (held_.empty()) return std::nullopt;
  return earliest_.value_or(std::chrono::nanoseconds(0));
}

}  // namespace tonewerk
