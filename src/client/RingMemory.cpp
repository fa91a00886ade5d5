// SPDX-License-Identifier: Apache-2.0
#include "client/RingMemory.h"

#include <cstring>
#include <new>
#include <sys/mman.h>

namespace tonewerk {
namespace {

constexpr std::size_t kCacheLineBytes = 64;

constexpr std::align_val_t alignmentOf(std::size_t size) {
  return std::align_val_t{size < RingMemory::kHugePageBytes ? kCacheLineBytes : RingMemory::kHugePageBytes};
}

}  // namespace

RingMemory::RingMemory(std::size_t size)
    : bytes_(static_cast<unsigned char*>(::operator new[](size, alignmentOf(size))), Free{size}) {
  // Without huge pages the memory is as good, only slower.
  if (size >= kHugePageBytes) static_cast<void>(::madvise(bytes_.get(), size, MADV_HUGEPAGE));
  std::memset(bytes_.get(), 0, size);
}

void RingMemory::Free::operator()(unsigned char* bytes) const {
  ::operator delete[](bytes, alignmentOf(size));
}

}  // namespace tonewerk
