// SPDX-License-Identifier: Apache-2.0
#include "client/RingMemory.h"

#include <algorithm>
#include <cstdint>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>
#include <vector>

namespace tonewerk {
namespace {

std::size_t alignmentOf(const RingMemory& memory, std::size_t alignment) {
  return reinterpret_cast<std::uintptr_t>(memory.bytes().data()) % alignment;
}

// Counts the pages of the memory that the system has not provided yet.
std::size_t missingPages(const RingMemory& memory) {
  const auto pageBytes = static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
  std::vector<unsigned char> pages((memory.bytes().size() + pageBytes - 1) / pageBytes);
  if (::mincore(memory.bytes().data(), memory.bytes().size(), pages.data()) != 0) return pages.size();
  return static_cast<std::size_t>(
      std::count_if(pages.begin(), pages.end(), [](unsigned char page) { return (page & 1U) == 0; }));
}

TEST(RingMemoryTest, HasTheSizeThatWasAskedFor) {
  EXPECT_EQ(RingMemory(64).bytes().size(), 64U);
  EXPECT_EQ(RingMemory(RingMemory::kHugePageBytes).bytes().size(), RingMemory::kHugePageBytes);
}

TEST(RingMemoryTest, BeginsWhereACacheLineOrAHugePageBegins) {
  EXPECT_EQ(alignmentOf(RingMemory(64), 64), 0U);
  EXPECT_EQ(alignmentOf(RingMemory(RingMemory::kHugePageBytes / 2), 64), 0U);
  EXPECT_EQ(alignmentOf(RingMemory(RingMemory::kHugePageBytes), RingMemory::kHugePageBytes), 0U);
}

TEST(RingMemoryTest, LeavesNoPageFaultToItsUser) {
  EXPECT_EQ(missingPages(RingMemory(2 * RingMemory::kHugePageBytes)), 0U);
}

}  // namespace
}  // namespace tonewerk
