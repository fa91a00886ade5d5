// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>

#include "values/CopyOnWrite.h"
#include "values/SharedString.h"

namespace tonewerk {

class Value;  // values/Value.h, which a user of this header includes
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
  bool contains(std::string_view key) const { return find(key) != nullptr; }

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
  // O(1).
  std::size_t bytes() const;
  // True when both share their storage; they are then equal. When it is false, they may still be equal.
  bool sharesStorageWith(const ValueMap& other) const { return rep_.sharesWith(other.rep_); }

  // Equal when both hold the same keys with equal values, in any order.
  friend bool operator==(const ValueMap& a, const ValueMap& b);
  // Compares without the `ignored` keys, on both sides.
  bool equalsIgnoring(const ValueMap& other, std::initializer_list<std::string_view> ignored) const;

  // Returns the map as compact JSON.
  std::string text() const;

 private:
  struct Rep;
  CopyOnWrite<Rep> rep_;
};

}  // namespace tonewerk
