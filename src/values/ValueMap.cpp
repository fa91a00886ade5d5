// SPDX-License-Identifier: Apache-2.0
#include "values/ValueMap.h"

#include <algorithm>
#include <bit>
#include <cassert>
#include <cstdint>
#include <utility>
#include <vector>

#include "values/CompactJson.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

// Up to this size, walking over the keys is faster than a hash probe.
constexpr std::size_t kMaxWithoutIndex = 16;

}  // namespace

// Holds the entries in order and, above kMaxWithoutIndex, a hash table of their places with linear probing.
struct ValueMap::Rep {
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
  void replace(Entry& entry, const Value& value) {
    const SharedString* before = entry.value.asString();
    const SharedString* after = value.asString();
    if (before != nullptr && after != nullptr && before->sharesStorageWith(*after)) return;
    bytes += value.bytes();
    bytes -= entry.value.bytes();
    entry.value = value;
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
ValueMap::ValueMap(const ValueMap&) = default;
ValueMap::ValueMap(ValueMap&&) noexcept = default;
ValueMap& ValueMap::operator=(const ValueMap&) = default;
ValueMap& ValueMap::operator=(ValueMap&&) noexcept = default;
ValueMap::~ValueMap() = default;

ValueMap::ValueMap(std::initializer_list<Entry> entries) {
  reserve(entries.size());
  for (const Entry& entry : entries) set(entry.key, entry.value);
}

std::size_t ValueMap::size() const {
  const Rep* rep = rep_.read();
  return rep == nullptr ? 0 : rep->entries.size();
}

const ValueMap::Entry* ValueMap::begin() const {
  const Rep* rep = rep_.read();
  return rep == nullptr ? nullptr : rep->entries.data();
}

const ValueMap::Entry* ValueMap::end() const { return begin() + size(); }

const Value* ValueMap::find(std::string_view key) const {
  const Rep* rep = rep_.read();
  if (rep == nullptr) return nullptr;
  // The search changes nothing. It returns a non-const entry because writers use it, too.
  const Entry* entry = const_cast<Rep*>(rep)->find(key);
  return entry == nullptr ? nullptr : &entry->value;
}

bool ValueMap::boolean(std::string_view key) const { return booleanOf(find(key)); }
std::int64_t ValueMap::integer(std::string_view key) const { return integerOf(find(key)); }
double ValueMap::number(std::string_view key) const { return numberOf(find(key)); }

std::string ValueMap::text(std::string_view key) const {
  const Value* value = find(key);
  return value == nullptr ? std::string() : value->text();
}

void ValueMap::set(SharedString key, Value value) {
  Rep& rep = rep_.write();
  if (Entry* entry = rep.find(key)) {
    rep.bytes += value.bytes();
    rep.bytes -= entry->value.bytes();
    entry->value = std::move(value);
    return;
  }
  rep.append(Entry{std::move(key), std::move(value)});
}

void ValueMap::add(SharedString key, Value value) {
  Rep& rep = rep_.write();
  assert(rep.find(key) == nullptr);
  rep.append(Entry{std::move(key), std::move(value)});
}

bool ValueMap::erase(std::string_view key) {
  if (!contains(key)) return false;
  Rep& rep = rep_.write();
  Entry* entry = rep.find(key);
  rep.bytes -= Rep::bytesOf(*entry);
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
  Rep& rep = rep_.write();
  std::size_t guess = 0;  // maps that are merged repeatedly mostly list their keys in the same order
  for (const Entry& entry : other) {
    const bool guessed = guess < rep.entries.size() && rep.entries[guess].key.sharesStorageWith(entry.key);
    Entry* own = guessed ? &rep.entries[guess] : rep.find(entry.key);
    if (own != nullptr) {
      guess = static_cast<std::size_t>(own - rep.entries.data()) + 1;
      rep.replace(*own, entry.value);
    } else {
      rep.append(entry);
      guess = rep.entries.size();
    }
  }
}

void ValueMap::reserve(std::size_t count) {
  if (count > 0) rep_.write().entries.reserve(count);
}

std::size_t ValueMap::bytes() const {
  const Rep* rep = rep_.read();
  return rep == nullptr ? 0 : rep->bytes;
}

bool operator==(const ValueMap& a, const ValueMap& b) { return a.equalsIgnoring(b, {}); }

bool ValueMap::equalsIgnoring(const ValueMap& other, std::initializer_list<std::string_view> ignored) const {
  if (sharesStorageWith(other)) return true;
  const auto isIgnored = [&](std::string_view key) {
    return std::find(ignored.begin(), ignored.end(), key) != ignored.end();
  };
  const Entry* guess = other.begin();  // messages of one kind mostly list their keys in the same order
  std::size_t common = 0;              // keys that both have, ignored ones included
  for (const Entry& entry : *this) {
    const bool guessed = guess != other.end() && guess->key == entry.key;
    const Value* value = guessed ? &guess->value : other.find(entry.key);
    if (guess != other.end()) ++guess;
    if (value != nullptr) ++common;
    const bool isEqual = value != nullptr && *value == entry.value;
    if (!isEqual && !isIgnored(entry.key)) return false;
  }
  if (common == other.size()) return true;
  const auto onlyInOther = std::count_if(ignored.begin(), ignored.end(), [&](std::string_view key) {
    return other.contains(key) && !contains(key);
  });
  return common + static_cast<std::size_t>(onlyInOther) == other.size();
}

std::string ValueMap::text() const {
  std::string out;
  out.reserve(bytes());  // mostly enough: a value's text is seldom longer than the value
  appendCompactJson(out, *this);
  return out;
}

}  // namespace tonewerk
