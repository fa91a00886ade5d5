// SPDX-License-Identifier: Apache-2.0
#include "session/MessageRange.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace tonewerk {
namespace {

double sortedTimeOf(const TWReportingSessionMessage& message) {
  const double time = message.epochTime();
  return std::isnan(time) ? 0.0 : time;
}

// Each time is read once, not at every comparison.
struct Timed {
  double time;
  std::size_t place;
};

}  // namespace

std::vector<std::size_t> placesByTime(MessageRange messages) {
  // Mostly the messages came in order.
  double latest = -std::numeric_limits<double>::infinity();
  const auto isLate = [&latest](const TWReportingSessionMessage* message) {
    const double time = sortedTimeOf(*message);
    if (time < latest) return true;
    latest = time;
    return false;
  };
  if (std::none_of(messages.begin(), messages.end(), isLate)) return {};

  std::vector<Timed> timed;
  timed.reserve(messages.size());
  for (const auto* message : messages) timed.push_back({sortedTimeOf(*message), timed.size()});
  std::stable_sort(timed.begin(), timed.end(),
                   [](const Timed& a, const Timed& b) { return a.time < b.time; });
  std::vector<std::size_t> places;
  places.reserve(timed.size());
  for (const Timed& one : timed) places.push_back(one.place);
  return places;
}

}  // namespace tonewerk
