// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace tonewerk {

// Records the duration of each of many calls, in nanoseconds, including the time of reading the clock.
class Latencies {
 public:
  // Touches the memory for `count` values now, so that page faults do not disturb the measurement.
  explicit Latencies(std::size_t count) : nanoseconds_(count) {}

  template <class Call>
  void measure(Call call) {
    const auto before = std::chrono::steady_clock::now();
    call();
    const auto after = std::chrono::steady_clock::now();
    add(static_cast<std::int64_t>((after - before).count()));
  }

  void add(std::int64_t nanoseconds) { nanoseconds_[count_++] = nanoseconds; }

  void sort() {
    nanoseconds_.resize(count_);
    std::sort(nanoseconds_.begin(), nanoseconds_.end());
  }

  // The duration that `share` of the calls did not exceed; 1 means all calls. Call sort() first.
  std::int64_t within(double share) const {
    if (nanoseconds_.empty()) return 0;
    const auto place = static_cast<std::size_t>(share * static_cast<double>(nanoseconds_.size()));
    return nanoseconds_[std::min(place, nanoseconds_.size() - 1)];
  }

  std::size_t count() const { return count_; }

 private:
  std::vector<std::int64_t> nanoseconds_;
  std::size_t count_ = 0;
};

}  // namespace tonewerk
