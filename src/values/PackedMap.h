// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <span>
#include <string_view>

#include "values/Counted.h"
#include "values/EncodedValue.h"
#include "values/Shape.h"

namespace tonewerk {

class ShapeTable;

// A piece of memory in which packed maps lie next to each other, with this object at its start. Whoever keeps
// many maps that end together derives from it.
//
// The piece is aligned to its size, so that a map finds it from its own address and needs no pointer to it.
class PackedChunk {
 public:
  static constexpr std::size_t kBytes = std::size_t{64} * 1024;

  PackedChunk(const PackedChunk&) = delete;
  PackedChunk& operator=(const PackedChunk&) = delete;

  // Returns memory in this chunk, aligned for a PackedMap; null when there is no room.
  virtual void* take(std::size_t bytes) = 0;
  // Called once for each piece that take() returned, when its map has ended, on the thread on which its last
  // holder let go of it.
  virtual void giveBack(void* memory) = 0;

  static PackedChunk& of(void* memory) {
    const std::size_t distance = reinterpret_cast<std::uintptr_t>(memory) & (kBytes - 1);
    return *reinterpret_cast<PackedChunk*>(static_cast<char*>(memory) - distance);
  }

  virtual ~PackedChunk() = default;

 protected:
  PackedChunk() = default;
};

// A map as a client sends it, without the keys: a shape, and the encoded values of its slots one after the
// other. All lie in one block of memory behind a header of kHeaderBytes.
//
//   | holders | size | shape | value | value | value ...
//
// A tree that is made beside the values has memory of its own, which few maps need; the header then points to
// that, and it to the shape.
//
// Immutable for all who hold it. Counted by its holders, which may be on any threads. ValueMap uses it as its
// second representation; few others need it.
class PackedMap {
 public:
  static constexpr std::size_t kHeaderBytes = 16;
  static constexpr std::size_t kMaxValueBytes = (std::size_t{1} << 31U) - 1;

  // Takes the encoded values of all slots that are not constant; EncodedValue says what they must be. The
  // keys of `shape` differ. The map lies in `chunk`, or on the heap when that is null or has no room.
  static Counted<PackedMap> make(const Shape& shape, std::string_view values, PackedChunk* chunk = nullptr);
  PackedMap(const PackedMap&) = delete;
  PackedMap& operator=(const PackedMap&) = delete;

  const Shape& shape() const {
    const char* tagged = tagged_.load(std::memory_order_acquire);
    return isBeside(tagged) ? *beside(tagged)->shape : *reinterpret_cast<const Shape*>(tagged);
  }
  std::size_t size() const { return shape().size(); }
  std::string_view values() const { return {begin(), size_}; }
  // How long the block is.
  std::size_t bytes() const { return kHeaderBytes + size_; }

  // Walks over the values before the slot's.
  EncodedValue at(std::size_t slot) const;
  // None when the key is absent.
  EncodedValue find(std::string_view key) const {
    const std::size_t slot = shape().find(key);
    return slot == Shape::kNoSlot ? EncodedValue() : at(slot);
  }
  // Calls visit(slot, EncodedValue) for all slots in order.
  template <typename Visitor>
  void forEach(Visitor&& visit) const {
    const Shape& keys = shape();
    const char* value = begin();
    for (std::size_t slot = 0; slot < keys.size(); ++slot) {
      if (keys.isConstant(slot)) {
        visit(slot, keys.constant(slot));
      } else {
        const EncodedValue own(value);
        value = own.end();  // first, because the visitor may move the bytes
        visit(slot, own);
      }
    }
  }

  // Compares as ValueMap does. The same shape needs no look-up.
  using Keys = std::initializer_list<std::string_view>;
  bool equalsIgnoring(const PackedMap& other, Keys ignored) const;

  // The same map as a tree. Made by the first call, by whichever thread that is; it ends with this map.
  const ValueMap& tree() const;
  // A tree for a holder of its own.
  ValueMap toTree() const;

  // Returns a map of the shape `extended`, whose base is this map's shape.
  Counted<PackedMap> withShape(const Shape& extended, PackedChunk* chunk) const;
  // The same in place, for the only holder.
  void takeShape(const Shape& extended);

  // Returns this map with these entries set, whose keys differ. Null when the shape has no room for a new key
  // (see ShapeTable::appended) or one of the slots is constant.
  struct Entry {
    std::string_view key;
    std::size_t slot = Shape::kNoSlot;  // of the key in this map's shape
    EncodedValue value;
  };
  Counted<PackedMap> with(std::span<const Entry> entries, ShapeTable& shapes, PackedChunk* chunk) const;

  bool isShared() const { return holders_.load(std::memory_order_acquire) != 1; }
  void retain() const { holders_.fetch_add(1, std::memory_order_relaxed); }
  void release() const {
    // The only holder need not count down, which is slower.
    if (!isShared() || holders_.fetch_sub(1, std::memory_order_acq_rel) == 1) destroy();
  }

 private:
  PackedMap(const Shape& shape, std::size_t size, bool isInChunk);
  ~PackedMap();
  static PackedMap* allocate(const Shape& shape, std::size_t size, PackedChunk* chunk);
  void destroy() const;

  const char* begin() const { return reinterpret_cast<const char*>(this + 1); }
  char* begin() { return reinterpret_cast<char*>(this + 1); }
  ValueMap makeTree() const;
  char* copyFor(const Shape& extended, char* to) const;
  bool hasSameValues(const PackedMap& other, Keys ignored) const;
  bool hasSameKeysAndValues(const PackedMap& other, Keys ignored) const;

  // The shape together with a tree of the map.
  struct Beside {
    const Shape* shape;
    ValueMap tree;
  };
  static constexpr std::uintptr_t kBeside = 1;
  static bool isBeside(const char* tagged) {
    return (reinterpret_cast<std::uintptr_t>(tagged) & kBeside) != 0;
  }
  static const Beside* beside(const char* tagged) {
    return reinterpret_cast<const Beside*>(tagged - kBeside);
  }
  void deleteTree();

  mutable std::atomic<std::uint32_t> holders_{1};
  std::uint32_t size_ : 31;
  std::uint32_t isInChunk_ : 1;
  // Points to the shape, of which this map is a holder, or to a Beside with kBeside added, which then belongs
  // to this map.
  mutable std::atomic<const char*> tagged_;
};

static_assert(sizeof(PackedMap) == PackedMap::kHeaderBytes);

}  // namespace tonewerk
