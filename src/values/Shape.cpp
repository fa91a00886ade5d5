// SPDX-License-Identifier: Apache-2.0
#include "values/Shape.h"

#include <algorithm>
#include <bit>
#include <cassert>
#include <utility>

#include "values/CompactJson.h"

namespace tonewerk {
namespace {

// Up to this size, walking over the keys is faster than a hash probe.
constexpr std::size_t kMaxWithoutIndex = 16;

// Returns at least what a text of this size takes with its header.
std::size_t wireBytesOf(std::size_t size) { return size + (size < 32 ? 1 : 5); }

}  // namespace

Counted<const Shape> Shape::make(std::vector<SharedString> keys, KnownKeys known, Origin origin) {
  auto* shape = new Shape(origin);
  auto made = Counted<const Shape>::adopt(shape);
  shape->slots_.reserve(keys.size());
  for (SharedString& key : keys) shape->append(std::move(key));
  shape->complete(known);
  return made;
}

Counted<const Shape> Shape::extended(std::span<const ValueMapEntry> constants, KnownKeys known,
                                     Origin origin) const {
  auto* shape = new Shape(origin);
  auto made = Counted<const Shape>::adopt(shape);
  shape->base_ = Counted<const Shape>(*this);
  shape->slots_ = slots_;
  shape->json_ = json_;
  shape->constants_ = constants_;
  for (const ValueMapEntry& entry : constants) {
    const auto same = [&](const Slot& slot) { return slot.key == entry.key; };
    auto slot = std::find_if(shape->slots_.begin(), shape->slots_.end(), same);
    if (slot == shape->slots_.end()) {
      shape->append(entry.key);
      slot = shape->slots_.end() - 1;
    }
    slot->constant = static_cast<std::uint32_t>(shape->constants_.size());
    if (!appendEncoded(shape->constants_, entry.value)) return {};
  }
  shape->complete(known);
  return made;
}

void Shape::append(SharedString key) {
  Slot slot;
  slot.json = static_cast<std::uint32_t>(json_.size());
  json_ += ',';
  appendJsonText(json_, key);
  json_ += ':';
  slot.jsonSize = static_cast<std::uint32_t>(json_.size()) - slot.json;
  slot.key = std::move(key);
  slots_.push_back(std::move(slot));
}

void Shape::complete(KnownKeys known) {
  assert(known.size() <= kMaxKnownKeys);
  if (slots_.size() > kMaxWithoutIndex) index();
  hasDoubledKey_ = findDoubledKey();
  hasKeyWithSpace_ = std::any_of(slots_.begin(), slots_.end(), [](const Slot& slot) {
    return slot.key.view().find(' ') != std::string_view::npos;
  });
  const auto isVariable = [](const Slot& slot) { return slot.constant == kVariable; };
  firstConstant_ = static_cast<std::size_t>(std::ranges::find_if_not(slots_, isVariable) - slots_.begin());
  variables_ = static_cast<std::size_t>(std::ranges::count_if(slots_, isVariable));
  wireBytes_ = constants_.size();
  for (const Slot& slot : slots_) wireBytes_ += wireBytesOf(slot.key.size());
  known_.fill(kUnknown);
  for (std::size_t at = 0; at < known.size(); ++at) known_[at] = static_cast<std::uint32_t>(find(known[at]));
}

void Shape::index() {
  places_.assign(std::bit_ceil(slots_.size() * 2), 0);
  const std::size_t mask = places_.size() - 1;
  for (std::size_t slot = 0; slot < slots_.size(); ++slot) {
    std::size_t at = slots_[slot].key.hash() & mask;
    while (places_[at] != 0 && slots_[places_[at] - 1].key != slots_[slot].key) at = (at + 1) & mask;
    if (places_[at] == 0) places_[at] = static_cast<std::uint32_t>(slot + 1);
  }
}

bool Shape::findDoubledKey() const {
  for (std::size_t slot = 0; slot < slots_.size(); ++slot) {
    if (find(slots_[slot].key) != slot) return true;
  }
  return false;
}

std::size_t Shape::find(std::string_view key) const {
  if (places_.empty()) {
    for (std::size_t slot = 0; slot < slots_.size(); ++slot) {
      const std::string_view own = slots_[slot].key.view();
      if (own.size() == key.size() && sameBytes(own.data(), key.data(), key.size())) return slot;
    }
    return kNoSlot;
  }
  const std::size_t mask = places_.size() - 1;
  for (std::size_t at = SharedString::hashOf(key) & mask; places_[at] != 0; at = (at + 1) & mask) {
    if (slots_[places_[at] - 1].key == key) return places_[at] - 1;
  }
  return kNoSlot;
}

std::size_t Shape::bytes() const {
  std::size_t bytes = sizeof(Shape) + slots_.size() * sizeof(Slot) + json_.size() + constants_.size() +
                      places_.size() * sizeof(places_[0]);
  for (const Slot& slot : slots_) bytes += slot.key.size();
  return bytes;
}

}  // namespace tonewerk
