// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

// How a quiet client asks: one request after the other, one in each interval, or as soon as the last one is
// answered when that takes longer.
struct ProbePlan {
  std::chrono::microseconds interval{2'000};
  std::chrono::milliseconds duration{3'000};
  // How long to wait for one answer. Then the client gives up.
  std::chrono::milliseconds patience{20'000};
};

// How long answers took, sorted. During a long wait each interval counts as a request that was sent then, so
// that a standstill has the weight of its length, and is not one request among many.
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
