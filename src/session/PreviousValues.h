// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "session/KeptBytesBudget.h"
#include "values/Counted.h"
#include "values/Prefetch.h"
#include "values/Value.h"

namespace tonewerk {

class Shape;

// The latest value of every key that a session has received, in the order in which the keys came first.
//
// Merging every message costs more than everything else that a session does with it. So of messages with one
// shape only the newest is kept, which has all their keys, and they are merged when somebody asks. A shape's
// first message and messages without a shape are merged at once; thus the keys are in order. A copy has taken
// nothing from a budget.
class PreviousValues {
 public:
  // Of more shapes no message is kept: theirs are merged at once.
  static constexpr std::size_t kMaxShapes = 64;

  // Takes over `values`. Returns false, and loses nothing that it held before, when the budget has no room
  // for them.
  [[nodiscard]] bool add(const ValueMap& values, KeptBytesBudget& budget);

  // Returns a new map with everything.
  ValueMap merged() const;

  // The latest value of one key as text; empty when no message had it. Merges nothing.
  std::string latestText(std::string_view key) const;

  // The bytes that are taken from the budget.
  std::size_t bytes() const { return merged_.bytes() + keptBytes_; }

  // Asks the processor for the memory that add() reads.
  void prefetchShapes() const {
    for (const Latest& latest : latest_) prefetch(&latest);
  }

 private:
  struct Latest {
    Counted<const Shape> shape;
    ValueMap values;          // empty when merged_ has them
    std::uint64_t order = 0;  // of arrival
  };

  // Null for a shape of which no message is kept.
  Latest* latestOf(const Shape& shape);
  [[nodiscard]] bool replace(Latest& latest, const ValueMap& values, KeptBytesBudget& budget);
  // Merges the messages that are kept, in order. Returns false, and keeps the rest, if the budget has no room
  // for what they become.
  [[nodiscard]] bool mergeAll(KeptBytesBudget& budget);
  // The messages that are not merged, in order of arrival.
  std::vector<std::size_t> unmerged() const;

  ValueMap merged_;
  std::vector<Latest> latest_;
  std::size_t lastUsed_ = 0;  // index in latest_
  std::size_t keptBytes_ = 0;
  std::uint64_t arrivals_ = 0;
};

// Adds `more` to `map` within the budget. Returns false, and changes nothing, when there is no room.
[[nodiscard]] bool mergeWithin(KeptBytesBudget& budget, ValueMap& map, const ValueMap& more);

}  // namespace tonewerk
