// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>

#include "values/Counted.h"
#include "values/SharedString.h"

namespace tonewerk {

class PackedChunk;
class PackedMap;
class Shape;
class ShapeTable;
class Value;      // values/Value.h, which a user of this header includes
class ValueView;  // values/ValueView.h, which a user of view() and of what follows it includes
struct KeyedView;
struct ValueMapEntry;

// Maps texts to property-list values: a message's payload, a session's configuration, a report.
//
// It has value semantics by copy-on-write. Iteration follows insertion order; replacing a value keeps its
// key's place.
//   copy                 a reference count, whatever the size
//   look-up              up to 16 entries a walk over the keys, above that one hash probe
//   set, first write     amortised O(1); on a map that shares its storage first a copy of n entries
//                        (reference counts, no characters)
//   erase                O(n), to keep the order
//   merge of m entries   m look-ups and sets; into an empty map a reference count
//   ==                   a walk of one side with look-ups in the other; O(1) when both share storage
//
// A map is a tree of values, or packed: the bytes of a client's message without its keys
// (values/PackedMap.h). Both behave the same; a packed map takes less memory, and is made and compared
// faster. Writing turns it into a tree. find(), begin() and end(), which return pointers, make a tree once
// and keep it beside the bytes; view(), forEach() and the conversions read the bytes, in O(n) for the last of
// n keys.
//
// As thread-safe as an int: two threads may use, and write, two maps that share storage.
class ValueMap {
 public:
  using Entry = ValueMapEntry;

  ValueMap();
  ValueMap(std::initializer_list<Entry> entries);
  ValueMap(const ValueMap&);
  ValueMap(ValueMap&&) noexcept;
  ValueMap& operator=(const ValueMap&);
  ValueMap& operator=(ValueMap&&) noexcept;
  ~ValueMap();

  std::size_t size() const;
  bool empty() const { return size() == 0; }
  const Entry* begin() const;
  const Entry* end() const;

  // Returns null when the key is absent. The pointer is valid until the next write to this map.
  const Value* find(std::string_view key) const;
  bool contains(std::string_view key) const;

  // Convert the value (see Value). An absent value is false, 0 or the empty text.
  bool boolean(std::string_view key) const;
  std::int64_t integer(std::string_view key) const;
  double number(std::string_view key) const;
  std::string text(std::string_view key) const;

  void set(SharedString key, Value value);
  // Sets a key that the map does not hold yet, without looking for it.
  void add(SharedString key, Value value);
  // Returns true when the key was there.
  bool erase(std::string_view key);
  // Sets every entry of `other`; the values of `other` replace those of this map.
  void merge(const ValueMap& other);
  // Makes room for `count` entries in total.
  void reserve(std::size_t count);

  // Returns about how many bytes the map holds on the heap: entries, keys and values, nested ones included.
  // Of a packed map, how long its block is, without a tree that find() made beside it. So a merge of a packed
  // map may add more than its bytes(). O(1).
  std::size_t bytes() const;
  // True when both share their storage; they are then equal. When it is false, they may still be equal.
  bool sharesStorageWith(const ValueMap& other) const { return tagged_ == other.tagged_; }

  // Equal when both hold the same keys with equal values, in any order.
  friend bool operator==(const ValueMap& a, const ValueMap& b);
  // Compares without the `ignored` keys, on both sides.
  bool equalsIgnoring(const ValueMap& other, std::initializer_list<std::string_view> ignored) const;

  // Returns the map as compact JSON.
  std::string text() const;

  // Returns the value, or none. Makes no tree.
  ValueView view(std::string_view key) const;
  // Calls visit(const SharedString& key, ValueView value) for each entry in order. Makes no tree.
  template <typename Visitor>
  void forEach(Visitor&& visit) const;

  // Takes over a packed map. One without keys makes the empty map, which is not packed.
  explicit ValueMap(Counted<PackedMap> packed);
  // Null for a tree.
  const PackedMap* packed() const {
    return isPacked() ? reinterpret_cast<const PackedMap*>(tagged_ - kPacked) : nullptr;
  }
  const Shape* shape() const;
  // Adds what `extended` adds to this map's shape, its base; `extended` comes from ShapeTable::extended(). In
  // place when no other map shares the storage, else in a copy of the block. Returns false, and changes
  // nothing, when the map is a tree or of another shape.
  [[nodiscard]] bool extend(const Shape& extended, PackedChunk* chunk = nullptr);
  // Sets entries, whose keys differ, and stays packed. Their values may come from this map. Returns false,
  // and changes nothing, when it would have to become a tree: the map is one, an entry has no value or one
  // that is not encoded and a date, an array or a map, or `shapes` has no shape for it.
  [[nodiscard]] bool setPacked(std::initializer_list<KeyedView> entries, ShapeTable& shapes,
                               PackedChunk* chunk = nullptr);

 private:
  struct Tree;
  static constexpr std::uintptr_t kPacked = 1;

  bool isPacked() const { return (reinterpret_cast<std::uintptr_t>(tagged_) & kPacked) != 0; }
  // Only for a map that is not packed.
  Tree* ownTree() const { return reinterpret_cast<Tree*>(tagged_); }
  // The tree, or that of a packed map; null for the empty map.
  const Tree* tree() const;
  // Returns a tree that no other map shares.
  Tree& write();

  // Points to a Tree, or to a PackedMap with kPacked added. Null for the empty map, until the first write.
  char* tagged_ = nullptr;
};

}  // namespace tonewerk
