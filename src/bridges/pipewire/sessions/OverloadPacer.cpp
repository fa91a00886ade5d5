// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/OverloadPacer.h"

#include <utility>

namespace tonewerk {

void OverloadPacer::add(const Overload& overload) {
  if (held_) {
    held_->add(overload);
  } else {
    held_ = overload;
  }
}

std::optional<Overload> OverloadPacer::take(std::chrono::nanoseconds now) {
  if (!held_ || now < deadline()) return std::nullopt;
  earliest_ = now + kInterval;
  return takeRest();
}

std::optional<Overload> OverloadPacer::takeRest() { return std::exchange(held_, std::nullopt); }

std::optional<std::chrono::nanoseconds> OverloadPacer::deadline() const {
  if (!held_) return std::nullopt;
  return earliest_.value_or(std::chrono::nanoseconds(0));
}

}  // namespace tonewerk
