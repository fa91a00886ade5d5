// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "values/Counted.h"
#include "values/Shape.h"

namespace tonewerk {

class ShapeTable;

// Remembers one packed map of each of the kinds that came lately, beside the bytes that it was packed from.
// The next map of a kind has mostly the same bytes, so that only a few of its values must be looked at.
//
// The caller names the kind; maps of one kind need not be alike. A map is remembered when a second one of its
// shape comes, so maps that are never alike cost no copies. One thread.
class RecentMaps {
 public:
  // Offsets in the bytes of the map and in its packed values.
  struct Entry {
    std::uint32_t value;
    std::uint32_t end;
    std::uint32_t packedEnd;
  };
  struct Map {
    Counted<const Shape> shape;
    std::string bytes;
    std::string values;
    std::vector<Entry> entries;
  };

  // Two kinds share two places; a third displaces one of them.
  static constexpr std::size_t kPlaces = 256;
  // Longer maps are not remembered.
  static constexpr std::size_t kMaxMapBytes = std::size_t{16} * 1024;
  // Once all maps and shapes together take more, they are forgotten.
  static constexpr std::size_t kMaxBytes = std::size_t{256} * 1024;

  // Returns a map of this kind whose shape is in `shapes`; null for none. Valid until the next offer().
  const Map* find(std::uint64_t kind, const ShapeTable& shapes) const;

  // Takes a map that has been packed with a shape of `shapes`: its bytes, and its values one after the other.
  // May forget others.
  void offer(std::uint64_t kind, const ShapeTable& shapes, std::string_view bytes, const Shape& shape,
             std::string_view values);

 private:
  struct Place {
    std::uint64_t table = 0;
    std::uint64_t kind = 0;
    std::uint32_t last = 0;  // the number of the shape that was offered last
    Map map;                 // no shape for none
  };

  static std::size_t placeOf(std::uint64_t kind, const ShapeTable& shapes);
  Place& takePlace(std::uint64_t kind, const ShapeTable& shapes);
  void forgetAll();

  std::vector<Place> places_{kPlaces};
  std::size_t bytes_ = 0;  // of the maps
};

}  // namespace tonewerk
