// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/LocalHours.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <ctime>
#include <limits>

namespace tonewerk {
namespace {

constexpr auto kOneDay = static_cast<double>(LocalOffsets::kDay);
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
  from = std::clamp(from, std::max(0.0, until - kMostDays * kOneDay), until);
  changes_.push_back({from, offsetAt(from)});
  for (double day = from; day < until; day += kOneDay) {
    const double next = std::min(day + kOneDay, until);
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

LocalOffsets::Part LocalOffsets::partAt(double time, std::int64_t size) const {
  constexpr std::int64_t kFirstMonday = 4 * LocalOffsets::kDay;
  const std::int64_t first = size == kWeek ? kFirstMonday : 0;
  const auto whole = static_cast<std::int64_t>(std::floor(time));
  std::int64_t begin = (whole + at(time) - first) / size * size + first;  // of the clock
  if (begin > whole + at(time)) begin -= size;
  // With each offset, the clock shows the part at another time, or never.
  Part part{std::numeric_limits<std::int64_t>::max(), std::numeric_limits<std::int64_t>::min()};
  for (std::size_t i = 0; i < changes_.size(); ++i) {
    std::int64_t from = begin - changes_[i].seconds;
    std::int64_t until = from + size;
    if (i > 0) from = std::max(from, static_cast<std::int64_t>(changes_[i].from));
    if (i + 1 < changes_.size()) until = std::min(until, static_cast<std::int64_t>(changes_[i + 1].from));
    if (from >= until) continue;
    part = {std::min(part.from, from), std::max(part.until, until)};
  }
  return part;
}

void LocalHours::add(double started, double ended, double seconds, double volume) {
  if (!(started >= 0.0 && started <= kLatest) || ended > kLatest) return;
  const auto put = [&](const LocalOffsets::Part& when, double part) {
    Hour& hour = hours_[when.from];
    hour.until = when.until;
    hour.seconds += part;
    if (std::isnan(volume)) return;
    hour.volumeSeconds += part * volume;
    hour.withVolume += part;
  };
  if (!(ended > started)) {
    if (started >= from_) put(offsets_.partAt(started, LocalOffsets::kHour), seconds);
    return;
  }
  const double rate = seconds / (ended - started);
  for (double at = std::max(started, from_); at < ended;) {
    const LocalOffsets::Part hour = offsets_.partAt(at, LocalOffsets::kHour);
    const double next = std::min(ended, static_cast<double>(hour.until));
    if (!(next > at)) break;
    put(hour, (next - at) * rate);
    at = next;
  }
}

}  // namespace tonewerk
