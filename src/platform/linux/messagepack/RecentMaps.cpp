// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RecentMaps.h"

#include <utility>

#include "values/EncodedValue.h"
#include "values/ShapeTable.h"

namespace tonewerk {
namespace {

std::size_t sizeOf(const RecentMaps::Map& map) {
  if (!map.shape) return 0;
  return map.shape->bytes() + map.bytes.size() + map.values.size() +
         map.entries.size() * sizeof(RecentMaps::Entry);
}

std::vector<RecentMaps::Entry> entriesOf(std::string_view bytes) {
  std::vector<RecentMaps::Entry> entries;
  entries.reserve(encoding::extentAt(bytes.data()).count);
  std::size_t packedEnd = 0;
  forEachEntry(EncodedValue(bytes.data()), [&](std::string_view, EncodedValue value) {
    const std::string_view own = value.bytes();
    const auto at = static_cast<std::size_t>(own.data() - bytes.data());
    packedEnd += own.size();
    entries.push_back({static_cast<std::uint32_t>(at), static_cast<std::uint32_t>(at + own.size()),
                       static_cast<std::uint32_t>(packedEnd)});
  });
  return entries;
}

}  // namespace

std::size_t RecentMaps::placeOf(std::uint64_t kind, const ShapeTable& shapes) {
  constexpr std::uint64_t kOdd = 0x9E3779B97F4A7C15U;
  static_assert((kPlaces & (kPlaces - 1)) == 0);
  return ((kind * kOdd + shapes.identifier()) * kOdd >> 32U) & (kPlaces - 1);
}

const RecentMaps::Map* RecentMaps::find(std::uint64_t kind, const ShapeTable& shapes) const {
  const std::size_t at = placeOf(kind, shapes);
  for (const std::size_t each : {at, at ^ 1U}) {
    const Place& place = places_[each];
    if (place.kind == kind && place.table == shapes.identifier())
      return place.map.shape ? &place.map : nullptr;
  }
  return nullptr;
}

void RecentMaps::offer(std::uint64_t kind, const ShapeTable& shapes, std::string_view bytes,
                       const Shape& shape, std::string_view values) {
  if (bytes.size() > kMaxMapBytes) return;
  Place& place = takePlace(kind, shapes);
  if (std::exchange(place.last, shape.origin().number) != shape.origin().number) return;
  bytes_ -= sizeOf(place.map);
  place.map = {Counted<const Shape>(shape), std::string(bytes), std::string(values), entriesOf(bytes)};
  bytes_ += sizeOf(place.map);
  if (bytes_ > kMaxBytes) forgetAll();
}

RecentMaps::Place& RecentMaps::takePlace(std::uint64_t kind, const ShapeTable& shapes) {
  const std::size_t at = placeOf(kind, shapes);
  for (const std::size_t each : {at, at ^ 1U}) {
    Place& place = places_[each];
    if (place.kind == kind && place.table == shapes.identifier()) return place;
  }
  // The other kind of the two places keeps its own.
  Place& place = places_[at].table == 0 || places_[at ^ 1U].table != 0 ? places_[at] : places_[at ^ 1U];
  bytes_ -= sizeOf(place.map);
  place = {.table = shapes.identifier(), .kind = kind, .last = 0, .map = {}};
  return place;
}

void RecentMaps::forgetAll() {
  for (Place& place : places_) place = {};
  bytes_ = 0;
}

}  // namespace tonewerk
