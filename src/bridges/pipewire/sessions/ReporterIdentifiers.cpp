// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/ReporterIdentifiers.h"

#include <algorithm>

namespace tonewerk {

namespace {

constexpr std::int64_t kProcesses = 1 << 10;
constexpr std::int64_t kTimes = std::int64_t{1} << 43;  // milliseconds until the year 2248

std::int64_t millisecondsOf(double seconds) {
  // A wrong clock is limited to the range, not refused: its times do not repeat earlier than correct times.
  const double milliseconds = std::clamp(seconds * 1000.0, 0.0, static_cast<double>(kTimes - 1));
  return static_cast<std::int64_t>(milliseconds);
}

}  // namespace

ReporterIdentifiers::ReporterIdentifiers(const Clock& clock, std::int64_t processIdentifier)
    : clock_(clock), processBits_(processIdentifier % kProcesses) {}

std::int64_t ReporterIdentifiers::next() {
  lastMilliseconds_ = std::max(lastMilliseconds_ + 1, millisecondsOf(clock_.now()));
  return lastMilliseconds_ * kProcesses + processBits_;
}

}  // namespace tonewerk
