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

// The C library's allocator, as far as the reclaimer uses it.
struct Allocator {
  // Bytes that are free but that the allocator has not returned to the system. Walks over the free blocks;
  // takes about ten microseconds while the process is small.
  std::function<std::size_t()> idleBytes;
  // Returns free memory to the system. Threads that allocate meanwhile may wait until it has finished.
  std::function<void()> giveBack;

  // Free bytes that each thread's part of the memory may keep at its end, where giveBack() cannot reach them.
  // Left alone, the C library raises this to twice the largest block that was ever freed, up to 64 MiB.
  static constexpr int kMaxFreeEndBytes = 4 << 20;
  // Larger blocks are memory of their own, which returns to the system when they are freed.
  static constexpr int kMaxSharedBlockBytes = 1 << 20;

  // Sets both limits above for the whole process.
  static Allocator ofTheProcess();
};

// Returns memory to the system that the allocator would otherwise keep: that of a large session after its
// end, and that of unfinished frames after the end of their connections.
//
// It cannot see when a large session ends. Once all clients together have sent kSentBytesThreshold bytes,
// every message and every end of a client may be the end of a large session, so each of them schedules checks
// of the allocator: 1, 2, 4 ... 32 seconds later, because the store and the files may still be writing the
// session's data. After the last check nothing runs until checks are scheduled again.
class AllocatorReclaimer {
 public:
  // The allocator may keep this many free bytes, because it soon uses them again.
  static constexpr std::size_t kMaxIdleBytes = std::size_t{16} << 20;
  // Clients may send this many bytes in the daemon's life before the first check. An unfinished frame may
  // hold forty times its bytes in memory, so that these can leave little more than kMaxIdleBytes.
  static constexpr std::size_t kSentBytesThreshold = std::size_t{512} << 10;
  static constexpr std::chrono::seconds kFirstCheck{1};
  static constexpr int kLastCheckSeconds = 32;

  // `timers` outlives it. Checks run on the timers' thread.
  explicit AllocatorReclaimer(TimerService& timers, Allocator allocator = Allocator::ofTheProcess());
  AllocatorReclaimer(const AllocatorReclaimer&) = delete;
  AllocatorReclaimer& operator=(const AllocatorReclaimer&) = delete;
  ~AllocatorReclaimer();

  // All three: any thread. While checks are scheduled they only set a flag; then the whole series follows
  // once more.
  void clientSent(std::size_t bytes);
  void clientEnded() { clientSent(0); }
  void scheduleChecks();

 private:
  struct Checks;

  std::atomic<std::uint64_t> sentBytes_ = 0;
  const std::shared_ptr<Checks> checks_;  // shared with a running tick, which may outlive this object
};

}  // namespace tonewerk
