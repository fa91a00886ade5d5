// SPDX-License-Identifier: Apache-2.0
#include "values/ValueMap.h"

#include <algorithm>
#include <atomic>
#include <bit>
#include <cassert>
#include <cstdint>
#include <optional>
#include <utility>
#include <vector>

#include "values/CompactJson.h"
#include "values/PackedMap.h"
#include "values/Shape.h"
#include "values/Value.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

// Up to this size, walking over the keys is faster than a hash probe.
constexpr std::size_t kMaxWithoutIndex = 16;

}  // namespace

// Holds the entries in order and, above kMaxWithoutIndex, a hash table of their places with linear probing.
struct ValueMap::Tree {
  Tree() = default;
  Tree(const Tree& other) : entries(other.entries), slots(other.slots), bytes(other.bytes) {}
  Tree& operator=(const Tree&) = delete;

  std::atomic<std::uint32_t> holders{1};
  std::vector<Entry> entries;
  std::vector<std::uint32_t>
      slots;  // place + 1, 0 for none; a power of two at least twice the entries, or empty
  std::size_t bytes = 0;

  static std::size_t bytesOf(const Entry& entry) {
    return sizeof(Entry) + entry.key.size() + entry.value.bytes();
  }

  Entry* find(std::string_view key) {
    if (slots.empty()) {
      for (Entry& entry : entries) {
        if (entry.key.view() == key) return &entry;
      }
      return nullptr;
    }
    return probe(key, SharedString::hashOf(key));
  }

  Entry* find(const SharedString& key) {
    if (!slots.empty()) return probe(key.view(), key.hash());
    const std::size_t hash = key.hash();
    for (Entry& entry : entries) {
      // Keys of one client often differ only in their last characters; their hashes differ.
      if (entry.key.hash() == hash && entry.key == key) return &entry;
    }
    return nullptr;
  }

  Entry* probe(std::string_view key, std::size_t hash) {
    const std::size_t mask = slots.size() - 1;
    for (std::size_t at = hash & mask; slots[at] != 0; at = (at + 1) & mask) {
      Entry& entry = entries[slots[at] - 1];
      if (entry.key.hash() == hash && entry.key.view() == key) return &entry;
    }
    return nullptr;
  }

  // Leaves an unchanged text as it is, because other threads share its reference count.
  void replace(Entry& entry, ValueView view) {
    const SharedString* before = entry.value.asString();
    const std::optional<std::string_view> after = before == nullptr ? std::nullopt : view.asText();
    if (after && *after == before->view()) return;
    Value value = view.value();
    bytes += value.bytes();
    bytes -= entry.value.bytes();
    entry.value = std::move(value);
  }

  void append(Entry entry) {
    bytes += bytesOf(entry);
    entries.push_back(std::move(entry));
    if (!slots.empty() && entries.size() * 2 <= slots.size()) {
      index(entries.size() - 1);
    } else if (entries.size() > kMaxWithoutIndex) {
      indexAll();
    }
  }

  void index(std::size_t place) {
    const std::size_t mask = slots.size() - 1;
    std::size_t at = entries[place].key.hash() & mask;
    while (slots[at] != 0) at = (at + 1) & mask;
    slots[at] = static_cast<std::uint32_t>(place + 1);
  }

  void indexAll() {
    slots.assign(std::bit_ceil(entries.size() * 4), 0);
    for (std::size_t place = 0; place < entries.size(); ++place) index(place);
  }
};

ValueMap::ValueMap() = default;

ValueMap::ValueMap(const ValueMap& other) : tagged_(other.tagged_) {
  if (const PackedMap* map = packed()) {
    map->retain();
  } else if (tagged_ != nullptr) {
    ownTree()->holders.fetch_add(1, std::memory_order_relaxed);
  }
}

ValueMap::ValueMap(ValueMap&& other) noexcept : tagged_(std::exchange(other.tagged_, nullptr)) {}

ValueMap& ValueMap::operator=(const ValueMap& other) { return *this = ValueMap(other); }

ValueMap& ValueMap::operator=(ValueMap&& other) noexcept {
  ValueMap taken(std::move(other));
  std::swap(tagged_, taken.tagged_);
  return *this;
}

ValueMap::~ValueMap() {
  if (const PackedMap* map = packed()) {
    map->release();
  } else if (tagged_ != nullptr) {
    Tree* tree = ownTree();
    if (tree->holders.fetch_sub(1, std::memory_order_acq_rel) == 1) delete tree;
  }
}

ValueMap::ValueMap(Counted<PackedMap> packed) {
  static_assert(alignof(PackedMap) > kPacked && alignof(Tree) > kPacked);
  if (packed && packed->size() > 0) tagged_ = reinterpret_cast<char*>(packed.detach()) + kPacked;
}

const ValueMap::Tree* ValueMap::tree() const {
  const PackedMap* map = packed();
  return map == nullptr ? ownTree() : map->tree().ownTree();
}

ValueMap::Tree& ValueMap::write() {
  if (const PackedMap* map = packed()) *this = map->toTree();
  if (tagged_ == nullptr) {
    tagged_ = reinterpret_cast<char*>(new Tree());
  } else if (const Tree* shared = ownTree(); shared->holders.load(std::memory_order_acquire) != 1) {
    ValueMap own;
    own.tagged_ = reinterpret_cast<char*>(new Tree(*shared));
    *this = std::move(own);
  }
  return *ownTree();
}

ValueMap::ValueMap(std::initializer_list<Entry> entries) {
  reserve(entries.size());
  for (const Entry& entry : entries) set(entry.key, entry.value);
}

std::size_t ValueMap::size() const {
  if (const PackedMap* map = packed()) return map->size();
  const Tree* rep = tree();
  return rep == nullptr ? 0 : rep->entries.size();
}

const ValueMap::Entry* ValueMap::begin() const {
  const Tree* rep = tree();
  return rep == nullptr ? nullptr : rep->entries.data();
}

const ValueMap::Entry* ValueMap::end() const { return begin() + size(); }

const Value* ValueMap::find(std::string_view key) const {
  const Tree* rep = tree();
  if (rep == nullptr) return nullptr;
  // The search changes nothing. It returns a non-const entry because writers use it, too.
  const Entry* entry = const_cast<Tree*>(rep)->find(key);
  return entry == nullptr ? nullptr : &entry->value;
}

ValueView ValueMap::view(std::string_view key) const {
  const PackedMap* map = packed();
  return map == nullptr ? ValueView(find(key)) : ValueView(map->find(key));
}

bool ValueMap::contains(std::string_view key) const {
  const PackedMap* map = packed();
  return map == nullptr ? find(key) != nullptr : map->shape().find(key) != Shape::kNoSlot;
}

bool ValueMap::boolean(std::string_view key) const { return view(key).boolean(); }
std::int64_t ValueMap::integer(std::string_view key) const { return view(key).integer(); }
double ValueMap::number(std::string_view key) const { return view(key).number(); }
std::string ValueMap::text(std::string_view key) const { return view(key).text(); }

void ValueMap::set(SharedString key, Value value) {
  Tree& rep = write();
  if (Entry* entry = rep.find(key)) {
    rep.bytes += value.bytes();
    rep.bytes -= entry->value.bytes();
    entry->value = std::move(value);
    return;
  }
  rep.append(Entry{std::move(key), std::move(value)});
}

void ValueMap::add(SharedString key, Value value) {
  Tree& rep = write();
  assert(rep.find(key) == nullptr);
  rep.append(Entry{std::move(key), std::move(value)});
}

bool ValueMap::erase(std::string_view key) {
  if (!contains(key)) return false;
  Tree& rep = write();
  Entry* entry = rep.find(key);
  rep.bytes -= Tree::bytesOf(*entry);
  rep.entries.erase(rep.entries.begin() + (entry - rep.entries.data()));
  if (rep.entries.size() > kMaxWithoutIndex) {
    rep.indexAll();
  } else {
    rep.slots.clear();  // append() does not enlarge a table for so few entries
  }
  return true;
}

void ValueMap::merge(const ValueMap& other) {
  if (empty()) {
    *this = other;
    return;
  }
  if (sharesStorageWith(other)) return;
  Tree& rep = write();
  std::size_t guess = 0;  // maps that are merged repeatedly mostly list their keys in the same order
  other.forEach([&](const SharedString& key, ValueView value) {
    const bool guessed = guess < rep.entries.size() && rep.entries[guess].key.sharesStorageWith(key);
    Entry* own = guessed ? &rep.entries[guess] : rep.find(key);
    if (own != nullptr) {
      guess = static_cast<std::size_t>(own - rep.entries.data()) + 1;
      rep.replace(*own, value);
    } else {
      rep.append({key, value.value()});
      guess = rep.entries.size();
    }
  });
}

void ValueMap::reserve(std::size_t count) {
  if (count > 0) write().entries.reserve(count);
}

std::size_t ValueMap::bytes() const {
  if (const PackedMap* map = packed()) return map->bytes();
  const Tree* rep = tree();
  return rep == nullptr ? 0 : rep->bytes;
}

bool operator==(const ValueMap& a, const ValueMap& b) { return a.equalsIgnoring(b, {}); }

bool ValueMap::equalsIgnoring(const ValueMap& other, std::initializer_list<std::string_view> ignored) const {
  if (sharesStorageWith(other)) return true;
  const PackedMap* packedOther = other.packed();
  if (const PackedMap* map = packed()) {
    return packedOther == nullptr ? other.equalsIgnoring(*this, ignored)
                                  : map->equalsIgnoring(*packedOther, ignored);
  }
  const auto isIgnored = [&](std::string_view key) {
    return std::find(ignored.begin(), ignored.end(), key) != ignored.end();
  };
  // This map is a tree, which finds its keys faster than a packed one.
  const Entry* guess = begin();  // messages of one kind mostly list their keys in the same order
  std::size_t common = 0;        // keys that both have, ignored ones included
  bool isEqual = true;
  other.forEach([&](const SharedString& key, ValueView value) {
    if (!isEqual) return;
    const bool guessed = guess != end() && guess->key == key;
    const Value* own = guessed ? &guess->value : find(key);
    if (guess != end()) ++guess;
    if (own != nullptr) ++common;
    isEqual = (own != nullptr && value == ValueView(own)) || isIgnored(key);
  });
  if (!isEqual) return false;
  if (common == size()) return true;
  const auto onlyHere = std::count_if(ignored.begin(), ignored.end(), [&](std::string_view key) {
    return contains(key) && !other.contains(key);
  });
  return common + static_cast<std::size_t>(onlyHere) == size();
}

std::string ValueMap::text() const {
  std::string out;
  const Shape* keys = shape();
  // Mostly enough: a value's text is seldom longer than the value.
  out.reserve(bytes() + (keys == nullptr ? 0 : keys->jsonBytes()));
  appendCompactJson(out, *this);
  return out;
}

const Shape* ValueMap::shape() const {
  const PackedMap* map = packed();
  return map == nullptr ? nullptr : &map->shape();
}

bool ValueMap::extend(const Shape& extended, PackedChunk* chunk) {
  const PackedMap* map = packed();
  if (map == nullptr || extended.base() != &map->shape()) return false;
  if (map->isShared()) {
    *this = ValueMap(map->withShape(extended, chunk));
  } else {
    const_cast<PackedMap*>(map)->takeShape(extended);  // this map is its only holder
  }
  return true;
}

bool ValueMap::setPacked(std::initializer_list<KeyedView> entries, ShapeTable& shapes, PackedChunk* chunk) {
  const PackedMap* map = packed();
  if (map == nullptr) return false;
  constexpr std::size_t kLongestHeader = 9;  // a number is no longer
  std::size_t room = 0;
  for (const KeyedView& entry : entries) room += kLongestHeader + entry.value.asText().value_or("").size();
  std::string bytes;  // of the values that are not encoded yet; never moves, because there is room
  bytes.reserve(room);
  std::vector<PackedMap::Entry> encoded;
  encoded.reserve(entries.size());
  for (const KeyedView& entry : entries) {
    EncodedValue value = entry.value.encoded();
    if (!value) {
      value = EncodedValue(bytes.data() + bytes.size());
      if (!entry.value || !appendEncoded(bytes, *entry.value.held())) return false;
    }
    encoded.push_back({entry.key, map->shape().find(entry.key), value});
  }
  Counted<PackedMap> changed = map->with(encoded, shapes, chunk);
  if (!changed) return false;
  *this = ValueMap(std::move(changed));
  return true;
}

}  // namespace tonewerk
