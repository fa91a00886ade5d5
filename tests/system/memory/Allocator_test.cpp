// SPDX-License-Identifier: Apache-2.0
//
// Tests the C library's allocator. Sanitizers replace it by allocators without these figures.
#include <cstddef>
#include <gtest/gtest.h>
#include <memory>
#include <vector>

#include "platform/linux/messaging/AllocatorReclaimer.h"
#include "system/memory/Sanitizers.h"

namespace tonewerk {
namespace {

using Block = std::unique_ptr<std::vector<char>>;

// Small enough for the heap; large blocks are returned to the system when they are freed.
constexpr std::size_t kBlockBytes = 1000;
constexpr std::size_t kBlocks = std::size_t{64} << 10;
constexpr std::size_t kMegabyte = std::size_t{1} << 20;

TEST(AllocatorTest, KnowsWhatItKeepsAndGivesItBack) {
  if (kHasSanitizer) GTEST_SKIP() << "a sanitizer's allocator has no such figures";
  const Allocator allocator = Allocator::ofTheProcess();
  std::vector<Block> blocks(kBlocks);
  for (Block& block : blocks) block = std::make_unique<std::vector<char>>(kBlockBytes, 'x');
  const std::size_t inUse = allocator.idleBytes();
  const Block last = std::move(blocks.back());  // at the end of the heap, so memory before it is not returned
  blocks.clear();
  const std::size_t freed = allocator.idleBytes();
  EXPECT_GT(freed, inUse + 50 * kMegabyte);
  allocator.giveBack();
  EXPECT_LT(allocator.idleBytes(), freed - 50 * kMegabyte);
  EXPECT_EQ(last->back(), 'x');
}

}  // namespace
}  // namespace tonewerk
