// SPDX-License-Identifier: Apache-2.0
#include "session/PreviousValues.h"

#include <algorithm>
#include <utility>

#include "values/Shape.h"

namespace tonewerk {

bool mergeWithin(KeptBytesBudget& budget, ValueMap& map, const ValueMap& more) {
  ValueMap added = more;
  if (added.packed() != nullptr) added.reserve(added.size());  // a tree, whose bytes are those that it adds
  // A merge adds at most added.bytes(). The bytes that it replaced are given back afterwards.
  const std::size_t before = map.bytes();
  if (!budget.take(added.bytes())) return false;
  map.merge(added);
  budget.give(before + added.bytes() - map.bytes());
  return true;
}

bool PreviousValues::add(const ValueMap& values, KeptBytesBudget& budget) {
  const Shape* shape = values.shape();
  Latest* latest = shape == nullptr ? nullptr : latestOf(*shape);
  if (latest != nullptr) return replace(*latest, values, budget);
  // First, so that later values replace earlier ones.
  if (!mergeAll(budget) || !mergeWithin(budget, merged_, values)) return false;
  if (shape != nullptr && latest_.size() < kMaxShapes) {
    latest_.push_back({Counted<const Shape>(*shape), {}, 0});
  }
  return true;
}

ValueMap PreviousValues::merged() const {
  ValueMap all = merged_;
  for (const std::size_t at : unmerged()) all.merge(latest_[at].values);
  return all;
}

// What is merged is older than what is not.
std::string PreviousValues::latestText(std::string_view key) const {
  const ValueMap* newest = &merged_;
  std::uint64_t order = 0;
  for (const Latest& latest : latest_) {
    if (latest.values.empty() || latest.order < order || !latest.values.contains(key)) continue;
    newest = &latest.values;
    order = latest.order;
  }
  return newest->text(key);
}

PreviousValues::Latest* PreviousValues::latestOf(const Shape& shape) {
  if (lastUsed_ < latest_.size() && latest_[lastUsed_].shape.get() == &shape) return &latest_[lastUsed_];
  const auto found = std::find_if(latest_.begin(), latest_.end(),
                                  [&](const Latest& latest) { return latest.shape.get() == &shape; });
  if (found == latest_.end()) return nullptr;
  lastUsed_ = static_cast<std::size_t>(found - latest_.begin());
  return &*found;
}

bool PreviousValues::replace(Latest& latest, const ValueMap& values, KeptBytesBudget& budget) {
  if (!budget.take(values.bytes())) return false;
  budget.give(latest.values.bytes());
  keptBytes_ += values.bytes();
  keptBytes_ -= latest.values.bytes();
  latest.values = values;
  latest.order = ++arrivals_;
  return true;
}

bool PreviousValues::mergeAll(KeptBytesBudget& budget) {
  for (const std::size_t at : unmerged()) {
    ValueMap& values = latest_[at].values;
    if (!mergeWithin(budget, merged_, values)) return false;
    budget.give(values.bytes());
    keptBytes_ -= values.bytes();
    values = {};
  }
  return true;
}

std::vector<std::size_t> PreviousValues::unmerged() const {
  std::vector<std::size_t> places;
  for (std::size_t at = 0; at < latest_.size(); ++at) {
    if (!latest_[at].values.empty()) places.push_back(at);
  }
  std::sort(places.begin(), places.end(),
            [this](std::size_t a, std::size_t b) { return latest_[a].order < latest_[b].order; });
  return places;
}

}  // namespace tonewerk
