// SPDX-License-Identifier: Apache-2.0
#include "client/RingMemory.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
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

using ::testing::HasSubstr;
using ::testing::Not;

// The kernel's list of what holds for the mapping that `address` is in, as in "VmFlags: rd wr mr mw me ac";
// empty when there is no such mapping. A mapping's first line is its range in hexadecimal, "begin-end ...".
std::string flagsAt(const void* address) {
  const auto wanted = reinterpret_cast<std::uintptr_t>(address);
  std::ifstream mappings("/proc/self/smaps");
  bool isWanted = false;
  for (std::string line; std::getline(mappings, line);) {
    std::uintptr_t begin = 0;
    std::uintptr_t end = 0;
    const char* const last = line.data() + line.size();
    const auto first = std::from_chars(line.data(), last, begin, 16);
    const bool isRange = first.ec == std::errc() && first.ptr != last && *first.ptr == '-' &&
                         std::from_chars(first.ptr + 1, last, end, 16).ec == std::errc();
    if (isRange) isWanted = begin <= wanted && wanted < end;
    if (isWanted && line.starts_with("VmFlags:")) return line + " ";
  }
  return {};
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

// Otherwise, the kernel would move its pages while a real-time thread uses them.
TEST(RingMemoryTest, IsLeftAloneByTheKernelOnceItIsMade) {
  if (!std::filesystem::exists("/sys/kernel/mm/transparent_hugepage")) {
    GTEST_SKIP() << "the kernel has no huge pages";
  }
  const RingMemory memory(2 * RingMemory::kHugePageBytes);
  for (const unsigned char* at : {&memory.bytes().front(), &memory.bytes().back()}) {
    EXPECT_THAT(flagsAt(at), HasSubstr(" nh "));
    EXPECT_THAT(flagsAt(at), Not(HasSubstr(" hg ")));
  }
}

TEST(RingMemoryTest, OfALargeRingIsUnmappedAtTheEnd) {
  void* begin = nullptr;
  {
    const RingMemory memory(RingMemory::kHugePageBytes);
    begin = memory.bytes().data();
  }
  unsigned char page = 0;
  EXPECT_EQ(::mincore(begin, 1, &page), -1);
  EXPECT_EQ(errno, ENOMEM);
}

}  // namespace
}  // namespace tonewerk
