// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

// How a quiet client asks: one request after the other, one due in each interval. When answers come late,
// requests that are due at the end of the duration are not sent any more.
struct ProbePlan {
  std::chrono::microseconds interval{2'000};
  std::chrono::milliseconds duration{3'000};
  // How long to wait for one answer. Then the client gives up, and no later request is answered either.
  std::chrono::milliseconds patience{20'000};
};

// The times from when each request was due until its answer came, sorted. A standstill so counts for every
// request that falls into it, and not only for the one that happens to wait. What was not sent counts as
// answered at the end.
class RoundTripTimes {
 public:
  explicit RoundTripTimes(std::vector<std::chrono::nanoseconds> times);

  std::size_t count() const { return times_.size(); }
  const std::vector<std::chrono::nanoseconds>& sorted() const { return times_; }
  // The time that `share` of the requests did not exceed, in milliseconds; 1 means all of them.
  double millisecondsWithin(double share) const;

 private:
  std::vector<std::chrono::nanoseconds> times_;
};

// Opens a started session and asks whether it is valid, as planned. Throws std::runtime_error when the daemon
// gives another answer than that it is, or ends the connection.
RoundTripTimes probeRoundTrips(const std::string& socketPath, std::int64_t reporterID, const ProbePlan& plan);

}  // namespace tonewerk
