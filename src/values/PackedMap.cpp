// SPDX-License-Identifier: Apache-2.0
#include "values/PackedMap.h"

#include <algorithm>
#include <cassert>
#include <cstring>
#include <memory>
#include <new>
#include <vector>

#include "values/Bytes.h"
#include "values/ShapeTable.h"
#include "values/ValueMap.h"

namespace tonewerk {
namespace {

bool contains(PackedMap::Keys keys, std::string_view wanted) {
  return std::find(keys.begin(), keys.end(), wanted) != keys.end();
}

// The values of a map by slot, for reading them in another order.
std::vector<EncodedValue> valuesOf(const PackedMap& map) {
  std::vector<EncodedValue> values(map.size());
  map.forEach([&](std::size_t slot, EncodedValue value) { values[slot] = value; });
  return values;
}

}  // namespace

PackedMap::PackedMap(const Shape& shape, std::size_t size, bool isInChunk)
    : size_(static_cast<std::uint32_t>(size) & kMaxValueBytes),
      isInChunk_(isInChunk ? 1 : 0),
      tagged_(reinterpret_cast<const char*>(&shape)) {
  static_assert(alignof(Shape) > kBeside && alignof(Beside) > kBeside);
  shape.retain();
}

PackedMap::~PackedMap() {
  deleteTree();
  shape().release();
}

void PackedMap::deleteTree() {
  const char* tagged = tagged_.load(std::memory_order_acquire);
  if (!isBeside(tagged)) return;
  tagged_.store(reinterpret_cast<const char*>(beside(tagged)->shape), std::memory_order_release);
  delete beside(tagged);
}

PackedMap* PackedMap::allocate(const Shape& shape, std::size_t size, PackedChunk* chunk) {
  assert(size <= kMaxValueBytes);
  void* memory = chunk == nullptr ? nullptr : chunk->take(kHeaderBytes + size);
  const bool isInChunk = memory != nullptr;
  if (!isInChunk) memory = ::operator new(kHeaderBytes + size);
  return new (memory) PackedMap(shape, size, isInChunk);
}

void PackedMap::destroy() const {
  const bool isInChunk = isInChunk_ != 0;
  void* memory = const_cast<PackedMap*>(this);
  this->~PackedMap();
  if (isInChunk) {
    PackedChunk::of(memory).giveBack(memory);
  } else {
    ::operator delete(memory);
  }
}

Counted<PackedMap> PackedMap::make(const Shape& shape, std::string_view values, PackedChunk* chunk) {
  assert(!shape.hasDoubledKey());
  PackedMap* map = allocate(shape, values.size(), chunk);
  copyBytes(map->begin(), values.data(), values.size());
  return Counted<PackedMap>::adopt(map);
}

EncodedValue PackedMap::at(std::size_t slot) const {
  assert(slot < size());
  const Shape& keys = shape();
  if (keys.isConstant(slot)) return keys.constant(slot);
  EncodedValue value(begin());
  std::size_t before = 0;
  for (const std::size_t end = std::min(slot, keys.firstConstant()); before < end; ++before)
    value = EncodedValue(value.end());
  for (; before < slot; ++before) {
    if (!keys.isConstant(before)) value = EncodedValue(value.end());
  }
  return value;
}

bool PackedMap::equalsIgnoring(const PackedMap& other, Keys ignored) const {
  return &shape() == &other.shape() ? hasSameValues(other, ignored) : hasSameKeysAndValues(other, ignored);
}

// Jumps to the first byte that differs, and looks at the value around it.
bool PackedMap::hasSameValues(const PackedMap& other, Keys ignored) const {
  const Shape& keys = shape();
  const char* own = begin();
  const char* others = other.begin();
  const char* const end = own + size_;
  const char* const othersEnd = others + other.size_;
  for (std::size_t slot = 0;; ++slot) {
    const auto left = static_cast<std::size_t>(std::min(end - own, othersEnd - others));
    const std::size_t same = commonBytes(own, others, left);
    if (own + same == end && others + same == othersEnd) return true;
    const char* const different = own + same;
    for (;; ++slot) {
      if (keys.isConstant(slot)) continue;
      const char* const next = EncodedValue(own).end();
      if (next > different) break;
      others += next - own;
      own = next;
    }
    const EncodedValue value(own);
    const EncodedValue another(others);
    if (!contains(ignored, keys.key(slot)) && !(value == another)) return false;
    own = value.end();
    others = another.end();
  }
}

bool PackedMap::hasSameKeysAndValues(const PackedMap& other, Keys ignored) const {
  const Shape& keys = shape();
  const Shape& otherKeys = other.shape();
  const std::vector<EncodedValue> values = valuesOf(other);
  std::size_t common = 0;  // keys that both have, ignored ones included
  bool isEqual = true;
  forEach([&](std::size_t slot, EncodedValue value) {
    if (!isEqual) return;
    const SharedString& key = keys.key(slot);
    const bool guessed = slot < otherKeys.size() && otherKeys.key(slot) == key;
    const std::size_t place = guessed ? slot : otherKeys.find(key);
    if (place != Shape::kNoSlot) ++common;
    isEqual = (place != Shape::kNoSlot && values[place] == value) || contains(ignored, key);
  });
  if (!isEqual) return false;
  if (common == otherKeys.size()) return true;
  const auto onlyInOther = std::count_if(ignored.begin(), ignored.end(), [&](std::string_view key) {
    return otherKeys.find(key) != Shape::kNoSlot && keys.find(key) == Shape::kNoSlot;
  });
  return common + static_cast<std::size_t>(onlyInOther) == otherKeys.size();
}

const ValueMap& PackedMap::tree() const {
  const char* tagged = tagged_.load(std::memory_order_acquire);
  if (isBeside(tagged)) return beside(tagged)->tree;
  auto own = std::make_unique<const Beside>(Beside{&shape(), makeTree()});
  const char* made = reinterpret_cast<const char*>(own.get()) + kBeside;
  if (tagged_.compare_exchange_strong(tagged, made, std::memory_order_acq_rel, std::memory_order_acquire))
    return own.release()->tree;
  return beside(tagged)->tree;  // another thread was faster
}

ValueMap PackedMap::toTree() const {
  const char* tagged = tagged_.load(std::memory_order_acquire);
  return isBeside(tagged) ? beside(tagged)->tree : makeTree();
}

ValueMap PackedMap::makeTree() const {
  const Shape& keys = shape();
  ValueMap tree;
  tree.reserve(keys.size());
  forEach([&](std::size_t slot, EncodedValue value) { tree.add(keys.key(slot), value.value()); });
  return tree;
}

// Copies the values of the slots that are not constant in `extended`. Returns their end.
char* PackedMap::copyFor(const Shape& extended, char* to) const {
  forEach([&](std::size_t slot, EncodedValue value) {
    if (extended.isConstant(slot)) return;
    const std::string_view bytes = value.bytes();
    std::memmove(to, bytes.data(), bytes.size());  // in place, or to another block
    to += bytes.size();
  });
  return to;
}

Counted<PackedMap> PackedMap::withShape(const Shape& extended, PackedChunk* chunk) const {
  assert(extended.base() == &shape());
  std::size_t size = 0;
  forEach([&](std::size_t slot, EncodedValue value) {
    if (!extended.isConstant(slot)) size += value.bytes().size();
  });
  PackedMap* map = allocate(extended, size, chunk);
  copyFor(extended, map->begin());
  return Counted<PackedMap>::adopt(map);
}

void PackedMap::takeShape(const Shape& extended) {
  assert(extended.base() == &shape() && !isShared());
  deleteTree();
  const Shape& base = shape();
  if (extended.variables() != base.variables()) {
    size_ = static_cast<std::uint32_t>(copyFor(extended, begin()) - begin()) & kMaxValueBytes;
  }
  extended.retain();
  tagged_.store(reinterpret_cast<const char*>(&extended), std::memory_order_release);
  base.release();  // `extended` holds it, too
}

Counted<PackedMap> PackedMap::with(std::span<const Entry> entries, ShapeTable& shapes,
                                   PackedChunk* chunk) const {
  const Shape& keys = shape();
  const Shape* wanted = &keys;
  std::size_t size = size_;
  for (const Entry& entry : entries) {
    if (entry.slot == Shape::kNoSlot) {
      wanted = shapes.appended(*wanted, entry.key);
      if (wanted == nullptr) return {};
    } else {
      if (keys.isConstant(entry.slot)) return {};
      size -= at(entry.slot).bytes().size();
    }
    size += entry.value.bytes().size();
  }
  PackedMap* map = allocate(*wanted, size, chunk);
  char* to = map->begin();
  const auto append = [&](EncodedValue value) {
    const std::string_view bytes = value.bytes();
    to = copyBytes(to, bytes.data(), bytes.size());
  };
  forEach([&](std::size_t slot, EncodedValue value) {
    if (keys.isConstant(slot)) return;
    for (const Entry& entry : entries) {
      if (entry.slot == slot) value = entry.value;
    }
    append(value);
  });
  for (const Entry& entry : entries) {
    if (entry.slot == Shape::kNoSlot) append(entry.value);
  }
  return Counted<PackedMap>::adopt(map);
}

}  // namespace tonewerk
