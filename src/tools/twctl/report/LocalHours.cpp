// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/LocalHours.h"

#include <algorithm>
#include <cmath>
#include <ctime>

namespace tonewerk {
namespace {

constexpr double kHour = 3600.0;
constexpr double kDay = 24 * kHour;
constexpr double kLatest = 253'402'300'799;  // the end of the year 9999

int offsetAt(double time, std::string* zone = nullptr) {
  const auto seconds = static_cast<std::time_t>(std::floor(time));
  std::tm local{};
  if (localtime_r(&seconds, &local) == nullptr) return 0;
  if (zone != nullptr) *zone = local.tm_zone;
  return static_cast<int>(local.tm_gmtoff);
}

}  // namespace

LocalOffsets::LocalOffsets(double from, double until) {
  until = std::clamp(until, 0.0, kLatest);
  from = std::clamp(from, std::max(0.0, until - kMostDays * kDay), until);
  changes_.push_back({from, offsetAt(from)});
  for (double day = from; day < until; day += kDay) {
    const double next = std::min(day + kDay, until);
    const int after = offsetAt(next);
    if (after == changes_.back().seconds) continue;
    auto before = static_cast<std::int64_t>(day);
    auto changed = static_cast<std::int64_t>(std::ceil(next));
    while (changed - before > 1) {
      const std::int64_t middle = before + (changed - before) / 2;
      (offsetAt(static_cast<double>(middle)) == after ? changed : before) = middle;
    }
    changes_.push_back({static_cast<double>(changed), after});
  }
  (void)offsetAt(until, &zone_);
}

int LocalOffsets::at(double time) const {
  const auto later = std::find_if(changes_.begin() + 1, changes_.end(),
                                  [&](const Change& change) { return change.from > time; });
  return (later - 1)->seconds;
}

void LocalHours::add(double started, double ended, double seconds, double volume) {
  if (!(started >= 0.0 && started <= kLatest) || ended > kLatest) return;
  const auto put = [&](double at, double part) {
    Hour& hour = hours_[hourOf(at)];
    hour.seconds += part;
    if (std::isnan(volume)) return;
    hour.volumeSeconds += part * volume;
    hour.withVolume += part;
  };
  if (!(ended > started)) {
    if (started >= from_) put(started, seconds);
    return;
  }
  const double rate = seconds / (ended - started);
  for (double at = std::max(started, from_); at < ended;) {
    const double next = std::min(ended, static_cast<double>(hourOf(at)) + kHour);
    if (!(next > at)) break;
    put(at, (next - at) * rate);
    at = next;
  }
}

std::int64_t LocalHours::hourOf(double time) const {
  const int offset = offsets_.at(time);
  return static_cast<std::int64_t>(std::floor((time + offset) / kHour) * kHour) - offset;
}

}  // namespace tonewerk
