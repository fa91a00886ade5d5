// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>

#include "bridges/pipewire/sessions/Overload.h"

namespace tonewerk {

// Lets one overload pass at once and gathers those of the next second into one: a stream that hangs is late
// some fifty times a second. Times are monotonic.
class OverloadPacer {
 public:
  static constexpr std::chrono::seconds kInterval{1};

  void add(const Overload& overload);
  // What is to be told now, if anything.
  [[nodiscard]] std::optional<Overload> take(std::chrono::nanoseconds now);
  // Whatever there is, too early or not.
  [[nodiscard]] std::optional<Overload> takeRest();
  // When take() will have something; none when nothing is held.
  std::optional<std::chrono::nanoseconds> deadline() const;
  void clear() { held_.reset(); }

 private:
  std::optional<Overload> held_;
  std::optional<std::chrono::nanoseconds> earliest_;  // for the next; none before the first
};

}  // namespace tonewerk
