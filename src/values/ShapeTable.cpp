// SPDX-License-Identifier: Apache-2.0
#include "values/ShapeTable.h"

#include <algorithm>
#include <atomic>
#include <bit>
#include <utility>

#include "values/Mix.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kOdd = 0x9E3779B97F4A7C15U;

// Tells tables apart, also one that is made where another one was.
std::uint64_t newIdentifier() {
  static std::atomic<std::uint64_t> last{0};
  return last.fetch_add(1, std::memory_order_relaxed) + 1;
}

std::size_t hashOf(std::uint32_t number, std::size_t hash) {
  return static_cast<std::size_t>(mix(hash ^ number, kOdd));
}

std::size_t hashOf(std::uint32_t number, std::span<const ValueMapEntry> constants) {
  std::size_t hash = hashOf(number, constants.size());
  for (const ValueMapEntry& entry : constants) {
    hash = mix(hash ^ entry.key.hash(), kOdd);
    if (const SharedString* text = entry.value.asString()) hash = mix(hash ^ text->hash(), kOdd);
  }
  return hash;
}

// Distinguishes more than == of values does: 1, 1.0 and true are different constants, and so are 0.0 and
// -0.0.
bool isSame(const Value& a, const Value& b) {
  if (a.kind() != b.kind()) return false;
  const double* number = a.asDouble();
  return number == nullptr
             ? a == b
             : std::bit_cast<std::uint64_t>(*number) == std::bit_cast<std::uint64_t>(*b.asDouble());
}

bool areSame(std::span<const ValueMapEntry> a, std::span<const ValueMapEntry> b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](const ValueMapEntry& x, const ValueMapEntry& y) {
                      return x.key == y.key && isSame(x.value, y.value);
                    });
}

std::size_t bytesOf(std::span<const ValueMapEntry> constants) {
  std::size_t bytes = 0;
  for (const ValueMapEntry& entry : constants)
    bytes += sizeof(ValueMapEntry) + entry.key.size() + entry.value.bytes();
  return bytes;
}

}  // namespace

template <typename IsWanted>
std::uint32_t ShapeTable::Index::find(std::size_t hash, IsWanted&& isWanted) const {
  const std::size_t mask = entries_.size() - 1;
  for (std::size_t at = hash & mask; entries_[at].number != 0; at = (at + 1) & mask) {
    if (entries_[at].hash == hash && isWanted(entries_[at].number)) return entries_[at].number;
  }
  return 0;
}

void ShapeTable::Index::add(std::size_t hash, std::uint32_t number) {
  if (++used_ * 2 > entries_.size()) {
    const std::vector<Entry> before = std::exchange(entries_, std::vector<Entry>(entries_.size() * 2));
    for (const Entry& entry : before) {
      if (entry.number != 0) insert(entry);
    }
  }
  insert({hash, number});
}

void ShapeTable::Index::insert(Entry entry) {
  const std::size_t mask = entries_.size() - 1;
  std::size_t at = entry.hash & mask;
  while (entries_[at].number != 0) at = (at + 1) & mask;
  entries_[at] = entry;
}

ShapeTable::ShapeTable(std::vector<SharedString> known, std::uint32_t knownSet)
    : identifier_(newIdentifier()), known_(std::move(known)), knownSet_(knownSet), nodes_(1) {}

std::size_t ShapeTable::walkUnexpected(Place& place, std::string_view bytes) {
  if (bytes.size() < kRecentBytes) return 0;
  const std::uint16_t recent = recentAt(place, bytes.data());
  const Node& node = nodes_[recent];
  if (node.parent != static_cast<std::uint32_t>(place) || !node.isEncodedAt(bytes)) return 0;
  at(place).guess = recent;
  place = Place{recent};
  return node.encodedSize;
}

ShapeTable::Place ShapeTable::find(Place from, std::string_view key) {
  const std::uint32_t guess = at(from).guess;
  if (guess != 0 && nodes_[guess].key == key) return Place{guess};
  const auto parent = static_cast<std::uint32_t>(from);
  const std::uint32_t found = nodesByKey_.find(
      hashOf(parent, SharedString::hashOf(key)),
      [&](std::uint32_t node) { return nodes_[node].parent == parent && nodes_[node].key == key; });
  if (found == 0) return none();
  at(from).guess = found;
  const Node& node = nodes_[found];
  if (node.encodedSize != 0) recentAt(from, node.encoded.data()) = static_cast<std::uint16_t>(found);
  return Place{found};
}

ShapeTable::Place ShapeTable::add(Place from, std::string_view key) {
  const std::size_t bytes = sizeof(Node) + 2 * sizeof(std::uint64_t) + key.size();
  if (keys() >= kMaxKeys || at(from).depth >= kMaxKeysOfShape || bytes_ + bytes > kMaxBytes) return none();
  bytes_ += bytes;
  const auto parent = static_cast<std::uint32_t>(from);
  const auto number = static_cast<std::uint32_t>(nodes_.size());
  Node node;
  node.key = SharedString(key);
  if (key.size() < kMaxEncodedKey) {
    node.encoded[0] = static_cast<char>(encoding::kFixedText + key.size());
    copyBytes(node.encoded.data() + 1, key.data(), key.size());
    node.encodedSize = static_cast<std::uint8_t>(1 + key.size());
  }
  node.parent = parent;
  node.depth = static_cast<std::uint16_t>(at(from).depth + 1);
  nodesByKey_.add(hashOf(parent, node.key.hash()), number);
  nodes_.push_back(std::move(node));
  at(from).guess = number;
  return Place{number};
}

const Shape* ShapeTable::makeShape(Place place) {
  if (isFull() || at(place).isRefused) return nullptr;
  std::vector<SharedString> keys(at(place).depth);
  auto node = static_cast<std::uint32_t>(place);
  for (std::size_t left = keys.size(); left > 0; --left, node = nodes_[node].parent)
    keys[left - 1] = nodes_[node].key;
  const Shape* shape =
      intern({Shape::make(std::move(keys), known_, nextOrigin()), static_cast<std::uint32_t>(place), 0, {}});
  if (shape == nullptr) {
    at(place).isRefused = true;
  } else {
    at(place).shape = Counted<const Shape>(*shape);
  }
  return shape;
}

const Shape* ShapeTable::intern(Interned interned) {
  const std::size_t bytes = sizeof(Interned) + interned.shape->bytes() + bytesOf(interned.constants);
  if (isFull() || bytes > kMaxBytes - bytes_) return nullptr;
  bytes_ += bytes;
  shapes_.push_back(std::move(interned));
  return shapes_.back().shape.get();
}

const Shape* ShapeTable::appended(const Shape& shape, std::string_view key) {
  const Interned* interned = internedOf(shape);
  if (interned == nullptr || interned->node == kNoNode) return nullptr;
  const Place place = next(Place{interned->node}, key);
  return place == none() ? nullptr : shapeAt(place);
}

const Shape* ShapeTable::extended(const Shape& shape, std::span<const ValueMapEntry> constants) {
  const auto isWanted = [&](std::uint32_t number) {
    const Interned& interned = shapes_[number - 1];
    return interned.shape->base() == &shape && areSame(interned.constants, constants);
  };
  Interned* interned = internedOf(shape);
  if (interned == nullptr) return nullptr;
  if (interned->guess == 0 || !isWanted(interned->guess)) {
    const std::size_t hash = hashOf(shape.origin().number, constants);
    const std::uint32_t found = extensions_.find(hash, isWanted);
    if (found == 0) return makeExtended(shape, constants, hash);
    interned->guess = found;
  }
  return shapes_[interned->guess - 1].shape.get();
}

const Shape* ShapeTable::makeExtended(const Shape& shape, std::span<const ValueMapEntry> constants,
                                      std::size_t hash) {
  // An extended shape is no smaller than its base.
  const std::size_t least = sizeof(Interned) + shape.bytes() + bytesOf(constants);
  if (isFull() || least > kMaxBytes - bytes_) return nullptr;
  Counted<const Shape> made = shape.extended(constants, known_, nextOrigin());
  if (!made) return nullptr;
  const Shape* kept = intern({std::move(made), kNoNode, 0, {constants.begin(), constants.end()}});
  if (kept == nullptr) return nullptr;
  extensions_.add(hash, kept->origin().number);
  internedOf(shape)->guess = kept->origin().number;
  return kept;
}

}  // namespace tonewerk
