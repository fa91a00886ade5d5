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
  // Bucket i takes values from bounds[i] to just below bounds[i + 1]; the first and the last also take what
  // lies outside. `bounds` ascend; there are two at least.
  explicit Histogram(std::initializer_list<std::int64_t> bounds);

  void add(std::int64_t value);

  // Sets "min" and "max", the extremes of what was added (0 before), and "buckets" as a channel has them.
  void describe(ValueMap& channel) const;

 private:
  std::vector<std::int64_t> bounds_;
  std::vector<std::int64_t> hits_;
  std::int64_t least_ = 0;
  std::int64_t greatest_ = 0;
  bool isEmpty_ = true;
};

}  // namespace tonewerk
