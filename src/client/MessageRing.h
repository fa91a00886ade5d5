// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <utility>
#include <vector>

#include "tonewerk/reporting.h"

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

// A message on its way to the daemon.
struct RingMessage {
  std::uint32_t category;
  std::uint16_t type;
  double time;                           // seconds since 1970
  std::uint64_t lostBefore;              // of its session, since that was made
  std::uint32_t entries;                 // of its map, which `bytes` hold one after the other
  std::span<const unsigned char> bytes;  // MessagePack, without the map's header
};

// The wall clock to a few milliseconds, which no system call answers whatever the clock source is.
double coarseSeconds();

// What a real-time thread says, until a background thread takes it.
//
//   producer: push() ...            consumer: front(), pop(), front(), pop() ...
//
// One thread at a time on each side. Wait-free on both: neither ever waits for the other, and the producer
// makes no system call, takes no lock and allocates nothing. A message that finds no room is dropped and
// counted, here and as the session's.
class MessageRing {
 public:
  // A message's own, next to its bytes, which are rounded up to a multiple of kAlignmentBytes.
  static constexpr std::size_t kHeaderBytes = 32;
  static constexpr std::size_t kAlignmentBytes = 8;
  static constexpr std::size_t kLeastBytes = 64;

  // Rounds up to a power of two of at least kLeastBytes and at most TWR_MOST_RING_BYTES, and touches the
  // memory, so that no page of it is missing later. `losses` outlives the producer.
  MessageRing(std::size_t bytes, LossCount& losses);
  MessageRing(const MessageRing&) = delete;
  MessageRing& operator=(const MessageRing&) = delete;

  std::size_t capacity() const { return memory_.size(); }

  // Producer. TWR_OK; TWR_FULL for now; TWR_TOO_LARGE for ever; TWR_INVALID for a list; the payload's
  // problem. Whatever is not taken counts as dropped.
  [[nodiscard]] twr_status push(std::uint32_t category, std::uint16_t type, const twr_payload& payload);

  // Consumer. The oldest message, and the same again until pop(); its bytes are valid until then.
  [[nodiscard]] std::optional<RingMessage> front();
  // Consumer, after front() gave one.
  void pop();

  // Any thread. Positions grow for ever: everything written before is read once readPosition() has come to
  // what writtenPosition() was.
  std::uint64_t writtenPosition() const { return written_.load(std::memory_order_acquire); }
  std::uint64_t readPosition() const { return read_.load(std::memory_order_acquire); }
  std::uint64_t dropped() const { return dropped_.load(std::memory_order_acquire); }

 private:
  struct Header;

  [[nodiscard]] twr_status drop(std::uint32_t category, twr_status why);
  bool hasRoom(std::uint64_t written, std::size_t bytes);
  void copyIn(std::uint64_t position, const void* from, std::size_t size);
  void copyOut(std::uint64_t position, void* to, std::size_t size) const;
  std::span<const unsigned char> bytesAt(std::uint64_t position, std::size_t size);

  // What one side writes lies apart from what the other does, so that neither pulls the other's cache line
  // away; each looks at the other's position only when its own copy of it says that there is nothing to do.
  static constexpr std::size_t kCacheLineBytes = 64;

  std::vector<unsigned char> memory_;
  LossCount& losses_;

  alignas(kCacheLineBytes) std::atomic<std::uint64_t> written_{0};
  std::atomic<std::uint64_t> dropped_{0};
  std::uint64_t seenRead_ = 0;

  alignas(kCacheLineBytes) std::atomic<std::uint64_t> read_{0};
  std::uint64_t seenWritten_ = 0;
  std::size_t frontBytes_ = 0;
  std::vector<unsigned char> joined_;  // the bytes of a front that goes over the ring's end
};

}  // namespace tonewerk
