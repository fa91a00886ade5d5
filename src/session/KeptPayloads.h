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
  // At least 67 maps of this size lie in a chunk, so that little of its end stays unused.
  static constexpr std::size_t kMaxMapBytes = 960;

  KeptPayloads();
  KeptPayloads(const KeptPayloads&) = delete;
  KeptPayloads& operator=(const KeptPayloads&) = delete;
  ~KeptPayloads();

  // Returns a copy of a packed map that lies in a chunk. A tree and a map over kMaxMapBytes are returned as
  // they are.
  ValueMap keep(const ValueMap& payload);
  // Asks the processor for the memory that keep() writes next.
  void prefetchNext() const;
  // Lets go of the last region.
  void clear();

  // Returns the bytes that keep(payload) takes: those of a region that it opens, or of a payload that stays
  // where it is.
  std::size_t bytesFor(const ValueMap& payload) const;
  // Returns an upper bound of the bytes that a payload takes on the heap.
  static std::size_t heapBytesOf(const ValueMap& payload);

 private:
  class Chunk;
  class Region;

  static bool isKeptInChunk(const PackedMap* map);
  bool needsRegion() const;
  std::size_t nextRegionChunks() const;
  // Opens the next chunk, in a new region where the last one has no more.
  void openChunk();

  Counted<Region> region_;
  std::size_t opened_ = 0;  // chunks of region_
  Chunk* chunk_ = nullptr;  // the last of them
};

}  // namespace tonewerk
