// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

#include "values/Shape.h"
#include "values/ValueView.h"

namespace tonewerk {

// Reads the values of a few keys from many messages. Packed messages of one client share few shapes, and the
// keys are looked up once for each shape. So a message without the keys takes hardly any time, and a value of
// the others takes no comparison of keys.
//
// Made for one walk over a session's messages. One thread. The texts of the keys outlive it.
class KeySlots {
 public:
  KeySlots() = default;
  explicit KeySlots(std::span<const std::string_view> keys) : keys_(keys.begin(), keys.end()) {}

  // Returns the key's index. Only before the first message is read.
  std::size_t add(std::string_view key) {
    keys_.push_back(key);
    return keys_.size() - 1;
  }

  // Returns false when the message has none of the keys. Returns true for one that has, and for any that is
  // not packed or whose shape is not of the same client as the first one.
  bool mayHaveAny(const ValueMap& message) { return rowOf(message.shape()) != kNoKeys; }

  // Returns whether the message has one of the keys. Takes a comparison of keys for each.
  bool hasAny(const ValueMap& message) const {
    for (const std::string_view key : keys_) {
      if (message.contains(key)) return true;
    }
    return false;
  }

  // Returns the value of the key with this index, or none.
  ValueView view(const ValueMap& message, std::size_t key) {
    const std::uint32_t row = rowOf(message.shape());
    if (row == kNoKeys) return {};
    if (row == kForeign) return message.view(keys_[key]);
    const std::uint32_t slot = slots_[(row - kFirstRow) * keys_.size() + key];
    return slot == kNoSlot ? ValueView() : ValueView(message.packed()->at(slot));
  }

 private:
  // What rows_ says of a shape: nothing yet, that it has none of the keys, or which row of slots_ it has.
  static constexpr std::uint32_t kUnknown = 0;
  static constexpr std::uint32_t kNoKeys = 1;
  static constexpr std::uint32_t kForeign = 2;  // of another client, or no shape
  static constexpr std::uint32_t kFirstRow = 3;
  static constexpr std::uint32_t kNoSlot = static_cast<std::uint32_t>(-1);

  std::uint32_t rowOf(const Shape* shape) {
    if (shape == nullptr) return kForeign;
    const Shape::Origin& origin = shape->origin();
    if (origin.table != table_ || origin.number >= rows_.size()) return lookUp(*shape);
    const std::uint32_t row = rows_[origin.number];
    return row == kUnknown ? lookUp(*shape) : row;
  }
  std::uint32_t lookUp(const Shape& shape);

  std::vector<std::string_view> keys_;
  std::uint64_t table_ = 0;           // of the first shape; 0 for none
  std::vector<std::uint32_t> rows_;   // by the shape's number in the table
  std::vector<std::uint32_t> slots_;  // of each key in turn, for each shape that has one of the keys
};

}  // namespace tonewerk
