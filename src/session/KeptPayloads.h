// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "values/Counted.h"
#include "values/PackedMap.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Puts the packed payloads of many messages next to each other, without what the heap adds to each.
//
// The memory consists of regions of chunks (values/PackedMap.h). A region ends when no map in it is held any
// more; this object itself holds only the last region. So a map that is held for longer than the others keeps
// at most kMaxRegionBytes.
//
// Used by one thread. The maps may be held, and let go of, on any.
class KeptPayloads {
 public:
  // The first region is one chunk, so that a session with few messages takes little.
  static constexpr std::size_t kMaxRegionBytes = 16 * PackedChunk::kBytes;
  // At least 67 maps of this size lie in a chunk. So what they leave unused at its end is no more than the
  // 16 bytes for each that bytesOf() counts for the heap.
  static constexpr std::size_t kMaxMapBytes = 960;

  KeptPayloads();
  KeptPayloads(const KeptPayloads&) = delete;
  KeptPayloads& operator=(const KeptPayloads&) = delete;
  ~KeptPayloads();

  // Returns a copy of a packed map that lies in a chunk. A tree and a map over kMaxMapBytes are returned as
  // they are.
  ValueMap keep(const ValueMap& payload);
  // Lets go of the last region.
  void clear();

  // Returns an upper bound of the bytes that the map takes that keep() returns for `payload`.
  static std::size_t bytesOf(const ValueMap& payload);

 private:
  class Chunk;
  class Region;

  // Opens the next chunk, in a new region where the last one has no more.
  void openChunk();

  Counted<Region> region_;
  std::size_t opened_ = 0;  // chunks of region_
  Chunk* chunk_ = nullptr;  // the last of them
};

}  // namespace tonewerk
