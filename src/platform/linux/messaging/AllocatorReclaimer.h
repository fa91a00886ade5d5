// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>

#include "platform/TimerService.h"

namespace tonewerk {

// What the C library's allocator has of the system.
struct Allocator {
  // Memory that nobody uses, but that the allocator keeps for later. Costs a walk over what is free, and some
  // ten microseconds while the process is small.
  std::function<std::size_t()> idleBytes;
  // Gives it back. Who allocates meanwhile may wait for as long as that takes.
  std::function<void()> giveBack;

  static Allocator ofTheProcess();
};

// Gives memory back to the system that the allocator would keep for good: what a large session held when it
// has ended, what unfinished frames held when their connections have gone.
//
// Nobody has to know when that is. Once clients have brought much, all of them together, whatever one of them
// sends may be what ends a large session, and so may its end. So each of both asks for looks at the
// allocator: 1, 2, 4 ... 32 seconds later, since the store and the files may still be writing what a session
// had. After the last look nothing runs until somebody asks again.
class AllocatorReclaimer {
 public:
  // What the allocator may keep: less is soon used again.
  static constexpr std::size_t kSpareBytes = std::size_t{16} << 20;
  // What clients may bring in the daemon's life before anybody looks. A frame that never ends may hold forty
  // times its bytes, so that this can leave little more than the allocator may keep.
  static constexpr std::size_t kMuchBytes = std::size_t{512} << 10;
  static constexpr std::chrono::seconds kFirstLook{1};
  static constexpr int kLastLook = 32;

  // `timers` outlives it; the looks are on their thread.
  explicit AllocatorReclaimer(TimerService& timers, Allocator allocator = Allocator::ofTheProcess());
  AllocatorReclaimer(const AllocatorReclaimer&) = delete;
  AllocatorReclaimer& operator=(const AllocatorReclaimer&) = delete;
  ~AllocatorReclaimer();

  // Any thread, all three. They cost next to nothing while looks are under way; when these are done, all of
  // them follow once more.
  void clientBrought(std::size_t bytes);
  void clientWent() { clientBrought(0); }
  void lookSoon();

 private:
  struct Looks;

  std::atomic<std::uint64_t> broughtBytes_ = 0;
  const std::shared_ptr<Looks> looks_;  // a tick that is running may outlive us
};

}  // namespace tonewerk
