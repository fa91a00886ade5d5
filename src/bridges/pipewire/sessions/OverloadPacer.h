// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <optional>
#include <vector>

#include "bridges/pipewire/sessions/Overload.h"

namespace tonewerk {

// Limits the rate of overload reports: the first one passes at once, and those of the following second are
// added up to one for each culprit and cause. A stream that hangs is late some fifty times a second. All
// times are monotonic.
class OverloadPacer {
 public:
  static constexpr std::chrono::seconds kInterval{1};

  // Overloads of further culprits are added to the last one.
  static constexpr std::size_t kMaxCulprits = 8;

  void add(const Overload& overload);
  // Removes and returns the overloads that are due at `now`, oldest first.
  [[nodiscard]] std::vector<Overload> take(std::chrono::nanoseconds now);
  // Removes and returns the held overloads, due or not.
  [[nodiscard]] std::vector<Overload> takeRest();
  // When take() will return overloads; none when nothing is held.
  std::optional<std::chrono::nanoseconds> deadline() const;
  void clear() { held_.clear(); }

 private:
  std::vector<Overload> held_;
  std::optional<std::chrono::nanoseconds> earliest_;  // time for the next report; none before the first
};

}  // namespace tonewerk
