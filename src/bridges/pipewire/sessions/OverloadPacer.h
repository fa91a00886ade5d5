// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>

#include "bridges/pipewire/sessions/Overload.h"

namespace tonewerk {

// Limits the rate of overload reports: the first one passes at once, and those of the following second are
// added up to one. A stream that hangs is late some fifty times a second. All times are monotonic.
class OverloadPacer {
 public:
  static constexpr std::chrono::seconds kInterval{1};

  void add(const Overload& overload);
  // Removes and returns the overload that is due at `now`, if there is one.
  [[nodiscard]] std::optional<Overload> take(std::chrono::nanoseconds now);
  // Removes and returns the held overload, due or not.
  [[nodiscard]] std::optional<Overload> takeRest();
  // When take() will return an overload; none when nothing is held.
  std::optional<std::chrono::nanoseconds> deadline() const;
  void clear() { held_.reset(); }

 private:
  std::optional<Overload> held_;
  std::optional<std::chrono::nanoseconds> earliest_;  // time for the next report; none before the first
};

}  // namespace tonewerk
