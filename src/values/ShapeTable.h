// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <span>
#include <string_view>
#include <vector>

#include "values/Bytes.h"
#include "values/Shape.h"
#include "values/SharedString.h"
#include "values/Value.h"

namespace tonewerk {

// Finds the shape of a sequence of keys, and makes it when it is new: equal sequences have one shape.
//
// The sequences form a tree from key to key, in which a reader of a message walks down:
//
//   root() -- next("time") -- next("level") -- shapeAt()  {"time": ..., "level": ...}
//                                           -- next("device") -- shapeAt()
//
// A walk expects the key that came next last time, so for a repeated message each key costs one comparison,
// and where messages of a few kinds part, two. Any other key costs a hash probe, however many keys may
// follow.
//
// It forgets nothing, and answers "none" to what is new and beyond a limit; it still finds the rest. So make
// one for each client. One thread; its shapes may live longer, and on any thread.
//
// A limit is for the table's whole life. When the shapes or the keys are used up, no new one is ever made;
// known keys still get shapes. The bytes refuse only what does not fit: a large shape may be refused, and a
// smaller one made after it. A message without a shape is kept as a tree, which costs more time and memory.
class ShapeTable {
 public:
  static constexpr std::size_t kMaxShapes = 1024;
  // The most keys of all sequences together, where a common beginning counts once, and of one sequence.
  static constexpr std::size_t kMaxKeys = 8192;
  static constexpr std::size_t kMaxKeysOfShape = 1024;
  // The most bytes of all keys and shapes together. They count as bytes() does: without unused room in
  // vectors and hash tables and without what the heap adds, which can be twice as much again for short keys.
  static constexpr std::size_t kMaxBytes = std::size_t{1} << 20U;

  // A place in the tree: the keys on the way to it are the beginning of a sequence.
  enum class Place : std::uint32_t {};

  // The shapes know the slots of the keys `known`, at most Shape::kMaxKnownKeys. Tables with the same keys
  // may number them, so that shapes of any of these tables are recognised by Shape::Origin::knownSet.
  explicit ShapeTable(std::vector<SharedString> known = {}, std::uint32_t knownSet = 0);
  ShapeTable(const ShapeTable&) = delete;
  ShapeTable& operator=(const ShapeTable&) = delete;

  static constexpr Place root() { return Place{0}; }
  static constexpr Place none() { return Place{static_cast<std::uint32_t>(-1)}; }

  // Goes from `place` to the place after the key with which `bytes` begin in MessagePack's shortest form.
  // Returns how many bytes that takes. It knows keys of up to 31 bytes that came here lately: the last one,
  // and usually some others of at least 3 bytes. Returns 0, and stays, for other keys; find() may know them.
  std::size_t walk(Place& place, std::string_view bytes) {
    const Node* const nodes = nodes_.data();
    const std::uint32_t next = nodes[static_cast<std::size_t>(place)].guess;
    if (!nodes[next].isEncodedAt(bytes)) return walkUnexpected(place, bytes);
    place = Place{next};
    return nodes[next].encodedSize;
  }

  // Returns the place after `key`, or none() when it is new.
  Place find(Place from, std::string_view key);
  // Adds a key that is new. Returns none() at a limit.
  Place add(Place from, std::string_view key);
  // Finds or adds.
  Place next(Place from, std::string_view key) {
    const Place found = find(from, key);
    return found == none() ? add(from, key) : found;
  }

  // Returns the shape of the keys on the way to `place`; null at a limit. The table keeps it.
  const Shape* shapeAt(Place place) {
    const Shape* shape = at(place).shape.get();
    return shape != nullptr ? shape : makeShape(place);
  }

  // Returns the shape of messages of `shape` with one more key; null at a limit, and for shapes with
  // constants or of other tables.
  const Shape* appended(const Shape& shape, std::string_view key);

  // Returns shape.extended(constants), the same shape for the same values; null at a limit, for shapes of
  // other tables, and for values that cannot be constants.
  const Shape* extended(const Shape& shape, std::span<const ValueMapEntry> constants);
  const Shape* extended(const Shape& shape, std::initializer_list<ValueMapEntry> constants) {
    return extended(shape, std::span(constants.begin(), constants.size()));
  }

  // A number that no other table has, nor had.
  std::uint64_t identifier() const { return identifier_; }
  // Whether the shape is interned here, so that it knows the keys of this table.
  bool owns(const Shape& shape) const { return shape.origin().table == identifier_; }

  std::size_t shapes() const { return shapes_.size(); }
  std::size_t keys() const { return nodes_.size() - 1; }
  std::size_t bytes() const { return bytes_; }

 private:
  static constexpr std::uint32_t kNoNode = static_cast<std::uint32_t>(-1);
  // A key of up to 31 bytes takes one more for its header.
  static constexpr std::size_t kMaxEncodedKey = 32;
  static constexpr std::size_t kRecentBytes = 4;
  static constexpr int kRecentBits = 7;
  static constexpr std::uint64_t kRecentFactor = 0x9E3779B97F4A7C15U;

  // As large as a line of the cache.
  struct Node {
    std::array<char, kMaxEncodedKey> encoded{};  // the key, if it is short
    std::uint8_t encodedSize = 0;                // 0 for a long key and for the root
    bool isRefused = false;                      // its shape has no room, and never will have
    std::uint16_t depth = 0;
    std::uint32_t guess = 0;  // the node that a walk from here went to last; 0, the root, for none
    std::uint32_t parent = 0;
    SharedString key;
    Counted<const Shape> shape;  // null until a sequence has ended here

    bool isEncodedAt(std::string_view bytes) const {
      using Word = std::uint64_t;
      const std::size_t size = encodedSize;
      if (size > bytes.size()) return false;
      if (size < sizeof(Word)) return size != 0 && sameBytes(bytes.data(), encoded.data(), size);
      const auto differ = [&](std::size_t at) {
        return loadAt<Word>(encoded.data() + at) ^ loadAt<Word>(bytes.data() + at);
      };
      Word different = differ(0) | differ(size - sizeof(Word));
      if (size > 2 * sizeof(Word)) different |= differ(sizeof(Word)) | differ(size - 2 * sizeof(Word));
      return different == 0;
    }
  };
  static_assert(kMaxKeysOfShape <= std::numeric_limits<std::uint16_t>::max());
  static_assert(kMaxKeys < std::numeric_limits<std::uint16_t>::max());

  // What the table remembers of a shape.
  struct Interned {
    Counted<const Shape> shape;
    std::uint32_t node = kNoNode;          // of a shape that is made of keys
    std::uint32_t guess = 0;               // number of the extended shape that was asked for last; 0 for none
    std::vector<ValueMapEntry> constants;  // of an extended one
  };

  // A hash table of numbers with linear probing; 0 stands for an empty slot.
  class Index {
   public:
    // Returns the first number with this hash for which isWanted() is true, or 0.
    template <typename IsWanted>
    std::uint32_t find(std::size_t hash, IsWanted&& isWanted) const;
    void add(std::size_t hash, std::uint32_t number);

   private:
    struct Entry {
      std::size_t hash = 0;
      std::uint32_t number = 0;
    };
    void insert(Entry entry);

    std::vector<Entry> entries_ = std::vector<Entry>(64);
    std::size_t used_ = 0;
  };

  // True when not even the smallest shape has room.
  bool isFull() const {
    return shapes_.size() >= kMaxShapes || kMaxBytes - bytes_ < sizeof(Interned) + sizeof(Shape);
  }
  Node& at(Place place) { return nodes_[static_cast<std::size_t>(place)]; }
  std::size_t walkUnexpected(Place& place, std::string_view bytes);
  // Where recent_ has the key after `from` whose encoded form begins with these kRecentBytes.
  std::uint16_t& recentAt(Place from, const char* bytes) {
    const std::uint64_t begin = loadAt<std::uint32_t>(bytes) | static_cast<std::uint64_t>(from) << 32U;
    return recent_[begin * kRecentFactor >> (64 - kRecentBits)];
  }
  const Shape* makeShape(Place place);
  const Shape* makeExtended(const Shape& shape, std::span<const ValueMapEntry> constants, std::size_t hash);
  // Where the next new shape is interned.
  Shape::Origin nextOrigin() const {
    return {identifier_, static_cast<std::uint32_t>(shapes_.size() + 1), knownSet_};
  }
  const Shape* intern(Interned interned);
  // None for a shape of another table.
  Interned* internedOf(const Shape& shape) {
    return shape.origin().table == identifier_ ? &shapes_[shape.origin().number - 1] : nullptr;
  }

  const std::uint64_t identifier_;
  const std::vector<SharedString> known_;
  const std::uint32_t knownSet_;
  std::vector<Node> nodes_;
  Index nodesByKey_;
  std::array<std::uint16_t, std::size_t{1} << kRecentBits> recent_{};  // nodes that a walk did not expect
  std::vector<Interned> shapes_;  // in the order of their numbers, from 1
  Index extensions_;
  std::size_t bytes_ = 0;
};

}  // namespace tonewerk
