// SPDX-License-Identifier: Apache-2.0
#include "client/RingMemory.h"

#include <cstdint>
#include <cstring>
#include <new>
#include <sys/mman.h>

namespace tonewerk {
namespace {

constexpr std::align_val_t kCacheLineBytes{64};

// Maps `size` bytes that begin where a huge page begins.
unsigned char* mapAligned(std::size_t size) {
  constexpr std::size_t kAlignment = RingMemory::kHugePageBytes;
  const std::size_t mappedBytes = size + kAlignment;
  void* const mapped =
      ::mmap(nullptr, mappedBytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (mapped == MAP_FAILED) throw std::bad_alloc();
  auto* const begin = static_cast<unsigned char*>(mapped);
  const std::size_t before = (kAlignment - reinterpret_cast<std::uintptr_t>(begin) % kAlignment) % kAlignment;
  // What cannot be unmapped is never touched, and takes only addresses.
  if (before > 0) static_cast<void>(::munmap(begin, before));
  static_cast<void>(::munmap(begin + before + size, kAlignment - before));
  return begin + before;
}

unsigned char* make(std::size_t size) {
  if (size < RingMemory::kHugePageBytes) {
    auto* const bytes = static_cast<unsigned char*>(::operator new[](size, kCacheLineBytes));
    std::memset(bytes, 0, size);
    return bytes;
  }
  unsigned char* const bytes = mapAligned(size);
  // Without huge pages the memory is as good, only slower.
  static_cast<void>(::madvise(bytes, size, MADV_HUGEPAGE));
  std::memset(bytes, 0, size);
  // Huge pages stay. Without them, the kernel would later move the small pages into huge ones, and the
  // real-time thread would have page faults meanwhile.
  static_cast<void>(::madvise(bytes, size, MADV_NOHUGEPAGE));
  return bytes;
}

}  // namespace

RingMemory::RingMemory(std::size_t size) : bytes_(make(size), Free{size}) {}

void RingMemory::Free::operator()(unsigned char* bytes) const {
  if (size < kHugePageBytes) {
    ::operator delete[](bytes, kCacheLineBytes);
  } else {
    static_cast<void>(::munmap(bytes, size));
  }
}

}  // namespace tonewerk
