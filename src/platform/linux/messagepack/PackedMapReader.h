// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>
#include <vector>

#include "values/PackedMap.h"
#include "values/ShapeTable.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Reads a map among a request's arguments into a packed map: it looks for the keys in a table of shapes,
// checks the values and copies their bytes. It accepts what RpcFrameVisitor accepts, and refuses the rest
// with the same words; some maps it leaves to that.
//
// One thread, that of the table.
class PackedMapReader {
 public:
  enum class Result {
    kPacked,
    kRefused,  // the first value that the protocol does not allow is named by `refused`
    kTree      // not for a packed map: a doubled key, a large map inside, or no room in the table
  };
  struct Read {
    Result result = Result::kTree;
    ValueMap map;
    const char* refused = "";  // as in RefusedValue
  };

  // The most keys of a map inside the map. Whether two of them are the same is found by comparing all pairs.
  static constexpr std::size_t kMaxNestedKeys = 16;

  // `shapes` outlives the reader.
  explicit PackedMapReader(ShapeTable& shapes) : shapes_(shapes) {}

  // Takes exactly one encoded map, nested no deeper than an argument may be; other bytes
  // give kTree. The map lies in `chunk`, if it has room.
  [[nodiscard]] Read read(std::string_view bytes, PackedChunk* chunk = nullptr);

 private:
  ShapeTable& shapes_;
  std::vector<char> values_;
};

}  // namespace tonewerk
