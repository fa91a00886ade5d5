// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

namespace tonewerk {

// How far this device's time zone was ahead of UTC, over a span of time.
class LocalOffsets {
 public:
  struct Change {
    double from;  // seconds since 1970
    int seconds;  // ahead of UTC from then on
  };
  // A part of the clock's time, in seconds since 1970. An hour of the clock that comes twice is one part.
  struct Part {
    std::int64_t from;
    std::int64_t until;
  };

  // Both in seconds since 1970. Of a very long span, only the last kMostDays.
  LocalOffsets(double from, double until);

  int at(double time) const;
  // The part that has `time`, of those that the clock's time is divided into: `size` in seconds, one of the
  // constants below. `time` is between 0 and the end of the year 9999.
  Part partAt(double time, std::int64_t size) const;
  const std::vector<Change>& changes() const { return changes_; }
  // The zone's short name at the end of the span, such as "CET".
  const std::string& zone() const { return zone_; }

  static constexpr int kMostDays = 4000;
  static constexpr std::int64_t kHour = 3600;
  static constexpr std::int64_t kDay = 24 * kHour;
  static constexpr std::int64_t kWeek = 7 * kDay;  // from Monday on

 private:
  std::vector<Change> changes_;
  std::string zone_;
};

// How much was played in each hour of the day's clock, and how loud.
class LocalHours {
 public:
  struct Hour {
    std::int64_t until = 0;  // seconds since 1970
    double seconds = 0.0;
    double volumeSeconds = 0.0;  // seconds times volume
    double withVolume = 0.0;     // seconds whose volume is known
  };

  // What lies before `from` is left out. `offsets` outlives it.
  LocalHours(const LocalOffsets& offsets, double from) : offsets_(offsets), from_(from) {}

  // Divides the seconds among the hours as the stretch does. `volume` is NaN when it is not known.
  void add(double started, double ended, double seconds, double volume);

  // By the time at which they begin, in seconds since 1970.
  const std::map<std::int64_t, Hour>& hours() const { return hours_; }

 private:
  const LocalOffsets& offsets_;
  const double from_;
  std::map<std::int64_t, Hour> hours_;
};

}  // namespace tonewerk
