// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <utility>
#include <vector>

namespace tonewerk {

// Keeps the last samples, as many as it was made for. A sample has the members `at` and `interval`.
template <typename Moment>
class MomentRing {
 public:
  explicit MomentRing(std::size_t capacity) : moments_(capacity) {}

  void push(const Moment& moment) {
    moments_[next_] = moment;
    next_ = (next_ + 1) % moments_.size();
    if (count_ < moments_.size()) ++count_;
  }
  void clear() { next_ = count_ = 0; }

  // Adds the samples whose interval overlaps [from, to] to `found`, oldest first.
  void find(std::chrono::nanoseconds from, std::chrono::nanoseconds to, std::vector<Moment>& found) const {
    for (std::size_t i = 0; i < count_; ++i) {
      const Moment& moment = moments_[(next_ + moments_.size() - count_ + i) % moments_.size()];
      if (moment.at >= from && moment.at - moment.interval <= to) found.push_back(moment);
    }
  }

 private:
  std::vector<Moment> moments_;
  std::size_t next_ = 0;
  std::size_t count_ = 0;
};

}  // namespace tonewerk
