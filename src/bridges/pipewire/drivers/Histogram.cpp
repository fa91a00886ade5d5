// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/Histogram.h"

#include <algorithm>
#include <utility>

#include "values/Value.h"

namespace tonewerk {

Histogram::Histogram(std::initializer_list<std::int64_t> bounds)
    : bounds_(bounds), hits_(bounds.size() - 1) {}

void Histogram::add(std::int64_t value) {
  // Only the inner bounds are compared, so the first and the last bucket are open.
  const auto bucket = std::upper_bound(bounds_.begin() + 1, bounds_.end() - 1, value) - (bounds_.begin() + 1);
  ++hits_[static_cast<std::size_t>(bucket)];
  minimum_ = isEmpty_ ? value : std::min(minimum_, value);
  maximum_ = isEmpty_ ? value : std::max(maximum_, value);
  isEmpty_ = false;
}

void Histogram::describe(ValueMap& channel) const {
  ValueArray buckets;
  for (std::size_t i = 0; i < hits_.size(); ++i) {
    buckets.append(ValueMap{{"lower", bounds_[i]}, {"upper", bounds_[i + 1]}, {"hits", hits_[i]}});
  }
  channel.set("min", minimum_);
  channel.set("max", maximum_);
  channel.set("buckets", std::move(buckets));
}

}  // namespace tonewerk
