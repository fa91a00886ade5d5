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

// Returns how many bytes at the start of both are the same.
std::size_t commonBytes(const char* a, const char* b, std::size_t size) {
  std::size_t at = 0;
  while (at + sizeof(std::uint64_t) <= size && loadAt<std::uint64_t>(a + at) == loadAt<std::uint64_t>(b + at))
    at += sizeof(std::uint64_t);
  while (at < size && a[at] == b[at]) ++at;
  return at;
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
      shape_(shape) {}

PackedMap::~PackedMap() { delete tree_.load(std::memory_order_acquire); }

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
  if (shape_->isConstant(slot)) return shape_->constant(slot);
  EncodedValue value(begin());
  for (std::size_t before = 0; before < slot; ++before) {
    if (!shape_->isConstant(before)) value = EncodedValue(value.end());
  }
  return value;
}

bool PackedMap::equalsIgnoring(const PackedMap& other, Keys ignored) const {
  return &shape() == &other.shape() ? hasSameValues(other, ignored) : hasSameKeysAndValues(other, ignored);
}

// Jumps to the first byte that differs, and looks at the value around it.
bool PackedMap::hasSameValues(const PackedMap& other, Keys ignored) const {
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
      if (shape_->isConstant(slot)) continue;
      const char* const next = EncodedValue(own).end();
      if (next > different) break;
      others += next - own;
      own = next;
    }
    const EncodedValue value(own);
    const EncodedValue another(others);
    if (!contains(ignored, shape_->key(slot)) && !(value == another)) return false;
    own = value.end();
    others = another.end();
  }
}

bool PackedMap::hasSameKeysAndValues(const PackedMap& other, Keys ignored) const {
  const std::vector<EncodedValue> values = valuesOf(other);
  std::size_t common = 0;  // keys that both have, ignored ones included
  bool isEqual = true;
  forEach([&](std::size_t slot, EncodedValue value) {
    if (!isEqual) return;
    const SharedString& key = shape_->key(slot);
    const bool guessed = slot < other.size() && other.shape_->key(slot) == key;
    const std::size_t place = guessed ? slot : other.shape_->find(key);
    if (place != Shape::kNoSlot) ++common;
    isEqual = (place != Shape::kNoSlot && values[place] == value) || contains(ignored, key);
  });
  if (!isEqual) return false;
  if (common == other.size()) return true;
  const auto onlyInOther = std::count_if(ignored.begin(), ignored.end(), [&](std::string_view key) {
    return other.shape_->find(key) != Shape::kNoSlot && shape_->find(key) == Shape::kNoSlot;
  });
  return common + static_cast<std::size_t>(onlyInOther) == other.size();
}

const ValueMap& PackedMap::tree() const {
  const ValueMap* made = tree_.load(std::memory_order_acquire);
  if (made != nullptr) return *made;
  auto own = std::make_unique<const ValueMap>(makeTree());
  if (tree_.compare_exchange_strong(made, own.get(), std::memory_order_acq_rel, std::memory_order_acquire))
    return *own.release();
  return *made;  // another thread was faster
}

ValueMap PackedMap::toTree() const {
  const ValueMap* made = tree_.load(std::memory_order_acquire);
  return made == nullptr ? makeTree() : *made;
}

ValueMap PackedMap::makeTree() const {
  ValueMap tree;
  tree.reserve(size());
  forEach([&](std::size_t slot, EncodedValue value) { tree.add(shape_->key(slot), value.value()); });
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
  delete tree_.exchange(nullptr, std::memory_order_acq_rel);
  if (extended.variables() != shape_->variables()) {
    size_ = static_cast<std::uint32_t>(copyFor(extended, begin()) - begin()) & kMaxValueBytes;
  }
  shape_ = Counted<const Shape>(extended);
}

Counted<PackedMap> PackedMap::with(std::span<const Entry> entries, ShapeTable& shapes,
                                   PackedChunk* chunk) const {
  const Shape* wanted = &shape();
  std::size_t size = size_;
  for (const Entry& entry : entries) {
    if (entry.slot == Shape::kNoSlot) {
      wanted = shapes.appended(*wanted, entry.key);
      if (wanted == nullptr) return {};
    } else {
      if (shape_->isConstant(entry.slot)) return {};
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
    if (shape_->isConstant(slot)) return;
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
