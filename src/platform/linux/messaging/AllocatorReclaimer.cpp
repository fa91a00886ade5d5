// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messaging/AllocatorReclaimer.h"

#include <algorithm>
#include <atomic>
#include <fstream>
#include <malloc.h>
#include <unistd.h>
#include <utility>

#include "values/Mutex.h"

namespace tonewerk {
namespace {

// Memory that is the process's own: without files and what is shared with others.
std::size_t residentBytes() {
  std::ifstream statm("/proc/self/statm");
  std::size_t size = 0;
  std::size_t resident = 0;
  std::size_t shared = 0;
  if (!(statm >> size >> resident >> shared)) return 0;
  return (resident - std::min(shared, resident)) * static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
}

std::size_t bytesKeptIdle() {
  const std::size_t resident = residentBytes();
  if (resident <= AllocatorReclaimer::kSpareBytes) return 0;  // no need to ask the allocator
  const struct mallinfo2 all = ::mallinfo2();
  const std::size_t used = all.uordblks + all.hblkhd;
  return resident - std::min(used, resident);
}

bool isPowerOfTwo(int number) { return (number & (number - 1)) == 0; }

}  // namespace

Allocator Allocator::ofTheProcess() {
  return {bytesKeptIdle, [] { ::malloc_trim(0); }};
}

struct AllocatorReclaimer::Looks {
  TimerService& timers;
  const Allocator allocator;
  std::atomic<bool> isAskedFor = false;
  Mutex mutex;
  std::unique_ptr<Timer> timer GUARDED_BY(mutex);
  int seconds GUARDED_BY(mutex) = 0;  // since the looks began

  Looks(TimerService& service, Allocator looked) : timers(service), allocator(std::move(looked)) {}

  void begin(const std::weak_ptr<Looks>& self) {
    const MutexLock lock(mutex);
    if (timer != nullptr) return;
    timer = timers.repeat(kFirstLook, [self] {
      if (const auto looks = self.lock()) looks->tick();
    });
  }

  void tick() {
    if (isLookDue() && allocator.idleBytes() > kSpareBytes) allocator.giveBack();
  }

  bool isLookDue() {
    const MutexLock lock(mutex);
    // Asked for again from now on means looks after those that are under way.
    if (seconds == 0) isAskedFor = false;
    const bool isDue = isPowerOfTwo(++seconds);
    if (seconds < kLastLook) return isDue;
    seconds = 0;
    if (!isAskedFor) timer = nullptr;
    return isDue;
  }
};

AllocatorReclaimer::AllocatorReclaimer(TimerService& timers, Allocator allocator)
    : looks_(std::make_shared<Looks>(timers, std::move(allocator))) {}

AllocatorReclaimer::~AllocatorReclaimer() {
  const MutexLock lock(looks_->mutex);
  looks_->timer = nullptr;
}

// Who brought it does not matter: many small clients leave as much behind as a large one, and what one of
// them brought may be held by another's session.
void AllocatorReclaimer::clientBrought(std::size_t bytes) {
  if (broughtBytes_.fetch_add(bytes, std::memory_order_relaxed) + bytes >= kMuchBytes) lookSoon();
}

void AllocatorReclaimer::lookSoon() {
  // Mostly it is asked for already, and reading costs least.
  if (looks_->isAskedFor.load(std::memory_order_relaxed)) return;
  if (!looks_->isAskedFor.exchange(true)) looks_->begin(looks_);
}

}  // namespace tonewerk
