// SPDX-License-Identifier: Apache-2.0
#include "platform/MemoryReserve.h"

#include <atomic>
#include <cstdlib>
#include <new>

namespace tonewerk {
namespace {

// The handler of failed allocations gets no argument.
std::atomic<void*> reserve = nullptr;
std::atomic<bool> isInUse = false;

void onFailedAllocation() {
  if (!MemoryReserve::use()) throw std::bad_alloc();
}

}  // namespace

bool MemoryReserve::putAside() {
  void* const memory = std::malloc(kBytes);
  if (memory == nullptr) return false;
  std::free(reserve.exchange(memory));
  isInUse = false;
  std::set_new_handler(onFailedAllocation);
  return true;
}

std::size_t MemoryReserve::unusedBytes() { return reserve.load() == nullptr ? 0 : kBytes; }

bool MemoryReserve::isShort() { return isInUse.load(std::memory_order_relaxed); }

bool MemoryReserve::use() {
  void* const memory = reserve.exchange(nullptr);
  if (memory == nullptr) return false;
  isInUse = true;
  std::free(memory);
  return true;
}

bool MemoryReserve::tryToRecover() {
  if (!isShort()) return true;
  void* const spare = std::malloc(kBytes);
  const bool hasRecovered = spare != nullptr && putAside();
  std::free(spare);
  return hasRecovered;
}

}  // namespace tonewerk
