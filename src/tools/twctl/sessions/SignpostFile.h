// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {

class JsonService;

// An interval of a program's work, which its signposts marked.
struct SignpostInterval {
  std::string name;
  double begin = 0.0;  // in seconds since 1970
  double milliseconds = 0.0;
};

// What a file must be of, and which of its intervals to take.
struct SignpostFilter {
  std::optional<std::int64_t> reporterID;  // none for a file of any session
  double since = 0.0;                      // when an interval began, in seconds since 1970
  double until = 0.0;
  std::size_t most = kMostIntervals;

  // The lists of long tests would be too large for viewers.
  static constexpr std::size_t kMostIntervals = 100'000;
};

// Intervals of one performance trace.
struct Signposts {
  static constexpr double kMostMilliseconds = 1e9;
  static constexpr double kLatest = 1e11;  // in seconds since 1970

  std::vector<SignpostInterval> intervals;  // the first ones, in the order of their ends
  std::size_t leftOut = 0;                  // so many more passed the filter
  bool haveTimes = false;                   // whether the file says when any of its intervals began
};

// Reads the benchmark data file of a trace, one line at a time, because it may be large. An entry that is no
// interval with a begin is left out. None when it is another file, or another session's; `problem` then says
// so.
[[nodiscard]] std::optional<Signposts> readSignposts(std::istream& file, const SignpostFilter& filter,
                                                     const JsonService& json, std::string& problem);

}  // namespace tonewerk
