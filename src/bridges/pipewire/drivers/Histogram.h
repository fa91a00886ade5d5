// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <initializer_list>
#include <vector>

#include "values/ValueMap.h"

namespace tonewerk {

// Counts values by range.
class Histogram {
 public:
  // Bucket i counts values from bounds[i] to just below bounds[i + 1]; the first and the last bucket also
  // count the values outside. `bounds` ascend; there are at least two.
  explicit Histogram(std::initializer_list<std::int64_t> bounds);

  void add(std::int64_t value);

  // Sets a channel's "min" and "max", the extremes of the added values (0 without any), and its "buckets".
  void describe(ValueMap& channel) const;

 private:
  std::vector<std::int64_t> bounds_;
  std::vector<std::int64_t> hits_;
  std::int64_t minimum_ = 0;
  std::int64_t maximum_ = 0;
  bool isEmpty_ = true;
};

}  // namespace tonewerk
