// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstdint>
#include <utility>

namespace tonewerk {

// How many messages a session has lost so far: of its queue and of its senders' rings, whichever. What is
// taken remembers the count, and so how much was lost before it, in whatever order it goes out. Any thread;
// no lock, no allocation, no system call.
class LossCount {
 public:
  void add(std::uint32_t category) {
    setLastCategory(category);
    count_.fetch_add(1, std::memory_order_release);
  }
  void setLastCategory(std::uint32_t category) { lastCategory_.store(category, std::memory_order_relaxed); }

  std::uint64_t count() const { return count_.load(std::memory_order_acquire); }
  std::uint32_t lastCategory() const { return lastCategory_.load(std::memory_order_relaxed); }

 private:
  std::atomic<std::uint64_t> count_{0};
  std::atomic<std::uint32_t> lastCategory_{0};
};

// How many of them the messages that go out have told.
struct ToldLosses {
  std::uint64_t counted = 0;  // of the count
  std::uint64_t late = 0;     // messages that were taken first and lost later; not part of the count

  bool owes(std::uint64_t lostBefore) const { return late > 0 || lostBefore > counted; }
  // What a message tells before which so many were lost.
  std::uint64_t take(std::uint64_t lostBefore) {
    std::uint64_t told = std::exchange(late, 0);
    if (lostBefore > counted) told += lostBefore - std::exchange(counted, lostBefore);
    return told;
  }
};

}  // namespace tonewerk
