// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "values/Counted.h"
#include "values/EncodedValue.h"
#include "values/SharedString.h"
#include "values/Value.h"

namespace tonewerk {

// The keys of messages of one kind, in their order, and what follows from the keys alone. Each key has a
// slot: its position. Messages of one kind then need to hold only their values.
//
// A slot may be constant: its value then belongs to the shape, and the messages do not hold it.
//
// Immutable, and counted by its holders, which may be on any threads.
class Shape {
 public:
  static constexpr std::size_t kNoSlot = static_cast<std::size_t>(-1);
  // The most keys that a maker of shapes may ask to know.
  static constexpr std::size_t kMaxKnownKeys = 8;
  using KnownKeys = std::span<const SharedString>;

  // Where a shape is interned: in which table, and under which number; and which keys it knows, as the maker
  // of the table numbers such sets (0 for a set without a number).
  struct Origin {
    std::uint64_t table = 0;
    std::uint32_t number = 0;
    std::uint32_t knownSet = 0;
  };

  // Makes the shape of `keys`. `known` are the keys whose slots known() returns, at most kMaxKnownKeys.
  static Counted<const Shape> make(std::vector<SharedString> keys, KnownKeys known, Origin origin);

  // Makes the shape of messages of this shape with these values added, the same in every message. As in a
  // map, a key that is there keeps its place: its slot becomes constant. None when a value is neither a
  // boolean, a number nor a text.
  Counted<const Shape> extended(std::span<const ValueMapEntry> constants, KnownKeys known,
                                Origin origin) const;
  const Origin& origin() const { return origin_; }
  // The shape that this one extends; null for one that is made of keys.
  const Shape* base() const { return base_.get(); }

  std::size_t size() const { return slots_.size(); }
  const SharedString& key(std::size_t slot) const { return slots_[slot].key; }
  // Returns `,"key":`, escaped, as compact JSON has it before the value of every slot but the first.
  std::string_view json(std::size_t slot) const {
    return {json_.data() + slots_[slot].json, slots_[slot].jsonSize};
  }
  // How long all these texts are together.
  std::size_t jsonBytes() const { return json_.size(); }

  // Returns kNoSlot when the key is absent. With a doubled key, the first place.
  std::size_t find(std::string_view key) const;
  // Returns the slot of the known key with this index, or kNoSlot.
  std::size_t known(std::size_t index) const {
    return known_[index] == kUnknown ? kNoSlot : std::size_t{known_[index]};
  }

  bool isConstant(std::size_t slot) const { return slots_[slot].constant != kVariable; }
  // None for a slot whose values are in the messages.
  EncodedValue constant(std::size_t slot) const {
    return isConstant(slot) ? EncodedValue(constants_.data() + slots_[slot].constant) : EncodedValue();
  }
  // No slot before this one is constant.
  std::size_t firstConstant() const { return firstConstant_; }
  // How many slots are not constant.
  std::size_t variables() const { return variables_; }
  // Returns an upper bound of the bytes that the keys and the constants take in MessagePack. O(1).
  std::size_t wireBytes() const { return wireBytes_; }
  bool hasKeyWithSpace() const { return hasKeyWithSpace_; }
  bool hasDoubledKey() const { return hasDoubledKey_; }

  // Returns about how many bytes the shape takes, its keys included.
  std::size_t bytes() const;

  void retain() const { holders_.fetch_add(1, std::memory_order_relaxed); }
  void release() const {
    if (holders_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
  }

 private:
  static constexpr std::uint32_t kVariable = static_cast<std::uint32_t>(-1);
  static constexpr std::uint32_t kUnknown = static_cast<std::uint32_t>(-1);

  struct Slot {
    SharedString key;
    std::uint32_t json = 0;              // where its text begins in json_
    std::uint32_t jsonSize = 0;          // how long it is
    std::uint32_t constant = kVariable;  // where its value begins in constants_
  };

  explicit Shape(Origin origin) : origin_(origin) {}
  ~Shape() = default;
  void append(SharedString key);
  void complete(KnownKeys known);
  void index();
  bool findDoubledKey() const;

  mutable std::atomic<std::uint32_t> holders_{1};
  bool hasKeyWithSpace_ = false;
  bool hasDoubledKey_ = false;
  std::array<std::uint32_t, kMaxKnownKeys> known_{};
  std::size_t firstConstant_ = 0;
  std::size_t variables_ = 0;
  std::size_t wireBytes_ = 0;
  std::vector<Slot> slots_;
  std::string json_;
  std::string constants_;              // encoded, one after the other
  std::vector<std::uint32_t> places_;  // a hash table of slot + 1, 0 for none; empty for a few keys
  Counted<const Shape> base_;
  Origin origin_;
};

}  // namespace tonewerk
