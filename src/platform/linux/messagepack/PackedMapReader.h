// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "platform/linux/messagepack/RecentMaps.h"
#include "values/PackedMap.h"
#include "values/ShapeTable.h"
#include "values/ValueMap.h"

namespace tonewerk {

// What is known of an encoded map. It only makes reading faster.
struct PackedMapHints {
  std::uint64_t kind = 0;    // maps of one kind are usually alike
  std::size_t readable = 0;  // bytes behind the map
};

// Reads a map among a request's arguments into a packed map: it looks for the keys in a table of shapes,
// checks the values and copies their bytes. Of a map that is like a recent one it looks only at the bytes
// that differ. It accepts what RpcFrameVisitor accepts, and refuses the rest with the same words; some maps
// it leaves to that.
//
// It keeps room for values from one map to the next. One thread, that of the table.
class PackedMapReader {
 public:
  enum class Result {
    kPacked,
    kRefused,  // the first value that the protocol does not allow is named by `refused`
    kTree      // not for a packed map: a doubled key, large or nested arrays or maps inside, or no room in
               // the table
  };
  struct Read {
    Result result = Result::kTree;
    ValueMap map;
    const char* refused = "";  // as in RefusedValue
  };

  // The most keys of a map inside the map. Whether two of them are the same is found by comparing all pairs.
  static constexpr std::size_t kMaxNestedKeys = 16;
  // The most elements of an array inside the map. With this limit, and because arrays and maps inside hold no
  // further ones, the tree that find() may make beside the bytes is not many times larger than they are.
  static constexpr std::size_t kMaxNestedElements = 64;

  // Takes exactly one encoded map; other bytes give kTree. Its shape comes from `shapes`. The map lies in
  // `chunk`, if it has room.
  [[nodiscard]] Read read(std::string_view bytes, ShapeTable& shapes, const PackedMapHints& hints = {},
                          PackedChunk* chunk = nullptr);

 private:
  Read pack(std::string_view bytes, ShapeTable& shapes, const PackedMapHints& hints, PackedChunk* chunk);
  // Packs a map whose keys are those of `recent`. Returns its values; none for any other map, and for one
  // with a value that is not allowed.
  std::optional<std::string_view> packLike(const RecentMaps::Map& recent, std::string_view bytes,
                                           std::size_t readable);

  std::vector<char> values_;
  RecentMaps recent_;
};

}  // namespace tonewerk
