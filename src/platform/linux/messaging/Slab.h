// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

#include "values/Mutex.h"

namespace tonewerk {

// A block of memory for bytes that clients send. It is written once, from its start to its end.
using Slab = std::array<char, std::size_t{64} * 1024>;

// Bytes in a slab, which they keep from being used again. Any thread may read and destroy them.
struct SlabBytes {
  std::shared_ptr<const Slab> slab;
  std::string_view bytes;
};

// Hands out room in slabs, and uses slabs again once nobody refers to their bytes.
//
//   room() -> a client's bytes are read into its front -> commit() -> worked on, then destroyed on any thread
//
// Small reads share a slab, so bytes that wait for long hold at most one slab more than they fill. One
// thread, but for the destruction of the bytes.
class SlabPool {
 public:
  // The least room for a read. A slab with less left is not read into any more.
  static constexpr std::size_t kMinRoomBytes = std::size_t{16} * 1024;
  // Slabs that are kept for use again. Further ones are freed.
  static constexpr std::size_t kMaxFreeSlabs = 4;

  SlabPool();
  SlabPool(const SlabPool&) = delete;
  SlabPool& operator=(const SlabPool&) = delete;
  // Bytes may outlive the pool.
  ~SlabPool();

  // At least kMinRoomBytes; valid until the next commit() or room().
  std::span<char> room();
  // The first `count` bytes of the last room().
  [[nodiscard]] SlabBytes commit(std::size_t count);

 private:
  class FreeSlabs;

  const std::shared_ptr<FreeSlabs> free_;
  std::shared_ptr<Slab> current_;
  std::size_t used_ = 0;
};

}  // namespace tonewerk
