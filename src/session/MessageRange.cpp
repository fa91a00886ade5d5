// SPDX-License-Identifier: Apache-2.0
#include "session/MessageRange.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "session/ForEachMessage.h"

namespace tonewerk {
namespace {

double sortedTimeOf(const TWReportingSessionMessage& message) {
  const double time = message.epochTime();
  return std::isnan(time) ? 0.0 : time;
}

struct Timed {
  double time;
  std::size_t place;
};

}  // namespace

std::vector<std::size_t> placesByTime(MessageRange messages) {
  // Mostly the messages came in order. Then nothing is kept. From the first late message on, times are kept,
  // so that they are not read at every comparison.
  std::vector<Timed> timed;
  double latest = -std::numeric_limits<double>::infinity();
  forEachMessage(messages, [&](std::size_t place, const TWReportingSessionMessage& message) {
    const double time = sortedTimeOf(message);
    if (timed.empty()) {
      if (time >= latest) {
        latest = time;
        return;
      }
      timed.reserve(messages.size());
      for (std::size_t earlier = 0; earlier < place; ++earlier)
        timed.push_back({sortedTimeOf(*messages[earlier]), earlier});
    }
    timed.push_back({time, place});
  });
  if (timed.empty()) return {};
  std::stable_sort(timed.begin(), timed.end(),
                   [](const Timed& a, const Timed& b) { return a.time < b.time; });
  std::vector<std::size_t> places;
  places.reserve(timed.size());
  for (const Timed& one : timed) places.push_back(one.place);
  return places;
}

}  // namespace tonewerk
