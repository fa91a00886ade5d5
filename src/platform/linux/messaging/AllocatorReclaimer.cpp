// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messaging/AllocatorReclaimer.h"

#include <algorithm>
#include <atomic>
#include <fstream>
#include <malloc.h>
#include <unistd.h>
#include <utility>

#include "platform/MemoryReserve.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

// The process's own memory in RAM, without files and memory shared with other processes.
std::size_t residentBytes() {
  std::ifstream statm("/proc/self/statm");
  std::size_t size = 0;
  std::size_t resident = 0;
  std::size_t shared = 0;
  if (!(statm >> size >> resident >> shared)) return 0;
  return (resident - std::min(shared, resident)) * static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
}

std::size_t idleBytesOfTheProcess() {
  const std::size_t resident = residentBytes();
  if (resident <= AllocatorReclaimer::kMaxIdleBytes) return 0;  // cannot be above kMaxIdleBytes
  const struct mallinfo2 all = ::mallinfo2();
  // The reserve is allocated, but not in RAM.
  const std::size_t used = all.uordblks + all.hblkhd - MemoryReserve::unusedBytes();
  return resident - std::min(used, resident);
}

bool isPowerOfTwo(int number) { return (number & (number - 1)) == 0; }

}  // namespace

Allocator Allocator::ofTheProcess() {
  // Either call also keeps the C library from changing the limits.
  ::mallopt(M_TRIM_THRESHOLD, kMaxFreeEndBytes);
  ::mallopt(M_MMAP_THRESHOLD, kMaxSharedBlockBytes);
  return {idleBytesOfTheProcess, [] { ::malloc_trim(0); }};
}

struct AllocatorReclaimer::Checks {
  TimerService& timers;
  const Allocator allocator;
  std::atomic<bool> isRequested = false;
  Mutex mutex;
  std::unique_ptr<Timer> timer GUARDED_BY(mutex);
  int seconds GUARDED_BY(mutex) = 0;  // since the series of checks began

  Checks(TimerService& service, Allocator processAllocator)
      : timers(service), allocator(std::move(processAllocator)) {}

  void begin(const std::weak_ptr<Checks>& self) {
    const MutexLock lock(mutex);
    if (timer != nullptr) return;
    timer = timers.repeat(kFirstCheck, [self] {
      if (const auto checks = self.lock()) checks->tick();
    });
  }

  void tick() {
    if (isCheckDue() && allocator.idleBytes() > kMaxIdleBytes) allocator.giveBack();
  }

  bool isCheckDue() {
    const MutexLock lock(mutex);
    // A request from now on makes another series of checks follow this one.
    if (seconds == 0) isRequested = false;
    const bool isDue = isPowerOfTwo(++seconds);
    if (seconds < kLastCheckSeconds) return isDue;
    seconds = 0;
    if (!isRequested) timer = nullptr;
    return isDue;
  }
};

AllocatorReclaimer::AllocatorReclaimer(TimerService& timers, Allocator allocator)
    : checks_(std::make_shared<Checks>(timers, std::move(allocator))) {}

AllocatorReclaimer::~AllocatorReclaimer() {
  const MutexLock lock(checks_->mutex);
  checks_->timer = nullptr;
}

// Counts all clients together: many small clients leave as much memory behind as a large one, and the session
// of one client may hold what another has sent.
void AllocatorReclaimer::clientSent(std::size_t bytes) {
  if (sentBytes_.fetch_add(bytes, std::memory_order_relaxed) + bytes >= kSentBytesThreshold) scheduleChecks();
}

void AllocatorReclaimer::scheduleChecks() {
  // Usually checks are already requested, and a load is cheaper than an exchange.
  if (checks_->isRequested.load(std::memory_order_relaxed)) return;
  if (!checks_->isRequested.exchange(true)) checks_->begin(checks_);
}

}  // namespace tonewerk
