// SPDX-License-Identifier: Apache-2.0
#include "session/KeptPayloads.h"

#include <algorithm>
#include <atomic>
#include <new>

#include "values/Prefetch.h"

namespace tonewerk {
namespace {

// What the heap and the map's own objects add to the bytes of a packed map, and of a tree.
constexpr std::size_t kHeapBytes = 16;
constexpr std::size_t kTreeHeapBytes = 160;

std::size_t rounded(std::size_t bytes) {
  return (bytes + alignof(PackedMap) - 1) / alignof(PackedMap) * alignof(PackedMap);
}

}  // namespace

// Chunks that lie next to each other. Counted by the maps in it, and by who opens its chunks.
class KeptPayloads::Region {
 public:
  static Counted<Region> make(std::size_t chunks) { return Counted<Region>::adopt(new Region(chunks)); }
  Region(const Region&) = delete;
  Region& operator=(const Region&) = delete;

  std::size_t chunks() const { return chunks_; }
  void* chunkAt(std::size_t number) const { return memory_ + number * PackedChunk::kBytes; }

  void retain() { holders_.fetch_add(1, std::memory_order_relaxed); }
  void release() {
    if (holders_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
  }

 private:
  static constexpr std::align_val_t kAlignment{PackedChunk::kBytes};

  explicit Region(std::size_t chunks)
      : chunks_(chunks),
        memory_(static_cast<char*>(::operator new(chunks* PackedChunk::kBytes, kAlignment))) {}
  ~Region() { ::operator delete(memory_, kAlignment); }

  std::atomic<std::size_t> holders_{1};
  const std::size_t chunks_;
  char* const memory_;
};

class KeptPayloads::Chunk final : public PackedChunk {
 public:
  explicit Chunk(Region& region) : region_(region) {}

  bool hasRoomFor(std::size_t bytes) const { return rounded(bytes) <= kBytes - used_; }

  void* take(std::size_t bytes) override {
    if (!hasRoomFor(bytes)) return nullptr;
    void* memory = reinterpret_cast<char*>(this) + used_;
    used_ += rounded(bytes);
    region_.retain();
    return memory;
  }
  // May end the region, and this chunk with it.
  void giveBack(void*) override { region_.release(); }

 private:
  Region& region_;
  std::size_t used_ = rounded(sizeof(Chunk));
};

KeptPayloads::KeptPayloads() = default;

KeptPayloads::~KeptPayloads() = default;

void KeptPayloads::prefetchNext() const {
  if (chunk_ != nullptr) prefetch(chunk_);  // which knows where the next payload will lie
}

ValueMap KeptPayloads::keep(const ValueMap& payload) {
  const PackedMap* map = payload.packed();
  if (!isKeptInChunk(map)) return payload;
  if (chunk_ == nullptr || !chunk_->hasRoomFor(map->bytes())) openChunk();
  return ValueMap(PackedMap::make(map->shape(), map->values(), chunk_));
}

void KeptPayloads::clear() {
  region_ = {};
  chunk_ = nullptr;
}

std::size_t KeptPayloads::bytesFor(const ValueMap& payload) const {
  const PackedMap* map = payload.packed();
  if (!isKeptInChunk(map)) return heapBytesOf(payload);
  if ((chunk_ != nullptr && chunk_->hasRoomFor(map->bytes())) || !needsRegion()) return 0;
  return nextRegionChunks() * PackedChunk::kBytes;
}

std::size_t KeptPayloads::heapBytesOf(const ValueMap& payload) {
  return rounded(payload.bytes()) + (payload.packed() == nullptr ? kTreeHeapBytes : kHeapBytes);
}

bool KeptPayloads::isKeptInChunk(const PackedMap* map) {
  return map != nullptr && map->bytes() <= kMaxMapBytes;
}

bool KeptPayloads::needsRegion() const { return !region_ || opened_ == region_->chunks(); }

std::size_t KeptPayloads::nextRegionChunks() const {
  constexpr std::size_t kMostChunks = kMaxRegionBytes / PackedChunk::kBytes;
  return region_ ? std::min(2 * region_->chunks(), kMostChunks) : 1;
}

void KeptPayloads::openChunk() {
  if (needsRegion()) {
    region_ = Region::make(nextRegionChunks());
    opened_ = 0;
  }
  chunk_ = new (region_->chunkAt(opened_)) Chunk(*region_);
  ++opened_;
}

}  // namespace tonewerk
