// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <utility>
#include <vector>

#include "client/RingMemory.h"
#include "tonewerk/reporting.h"

namespace tonewerk {

// Data that one thread often writes and data that another thread often reads belong into different cache
// lines.
inline constexpr std::size_t kCacheLineBytes = 64;

// Counts the messages that a session has lost, in its queue and in its senders' rings. Each message that is
// taken keeps the count of that moment, and so the number of losses before it, in whatever order messages are
// sent. Any thread may call it; it takes no lock, allocates nothing and makes no system call. Producers read
// it for each message, so it has a cache line of its own.
class alignas(kCacheLineBytes) LossCount {
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

// Counts the losses that sent messages have reported already.
struct ReportedLosses {
  std::uint64_t counted = 0;   // up to this value of LossCount
  std::uint64_t lostLate = 0;  // lost after they were taken; LossCount does not contain them

  bool hasUnreported(std::uint64_t lostBefore) const { return lostLate > 0 || lostBefore > counted; }
  // Returns how many losses a message reports, when `lostBefore` were lost before it, and counts them as
  // reported.
  std::uint64_t take(std::uint64_t lostBefore) {
    std::uint64_t number = std::exchange(lostLate, 0);
    if (lostBefore > counted) number += lostBefore - std::exchange(counted, lostBefore);
    return number;
  }
};

// A message on its way to the daemon.
struct RingMessage {
  std::uint32_t category;
  std::uint16_t type;
  double time;                           // seconds since 1970
  std::uint64_t lostBefore;              // losses of its session before it, since the session was made
  std::uint32_t entries;                 // how many entries its map has; `bytes` contains them
  std::span<const unsigned char> bytes;  // MessagePack, without the map's header
};

// The wall clock, precise to a few milliseconds. Reading it makes no system call, whatever the clock source
// is.
double coarseSeconds();

// Holds the messages of a real-time thread until a background thread takes them.
//
//   producer: push() ...            consumer: front(), pop(), front(), pop() ...
//
// One thread at a time may use each side. Both sides are wait-free: neither ever waits for the other, and the
// producer makes no system call, takes no lock and allocates nothing. A message that finds no room is dropped
// and counted, here and in the session.
class MessageRing {
 public:
  // A message takes a header and its bytes, rounded up to a multiple of kAlignmentBytes.
  static constexpr std::size_t kHeaderBytes = 32;
  static constexpr std::size_t kAlignmentBytes = 8;
  static constexpr std::size_t kMinBytes = 64;

  // Rounds `bytes` up to a power of two from kMinBytes to TWR_MOST_RING_BYTES. Touches the memory, so that no
  // page fault happens later. `losses` outlives the producer.
  MessageRing(std::size_t bytes, LossCount& losses);
  MessageRing(const MessageRing&) = delete;
  MessageRing& operator=(const MessageRing&) = delete;

  std::size_t capacity() const { return memory_.bytes().size(); }

  // Producer. Returns TWR_OK; TWR_FULL when there is no room at present; TWR_TOO_LARGE when there never can
  // be; TWR_INVALID for a list; or the payload's problem. A message that is not taken counts as dropped.
  [[nodiscard]] twr_status push(std::uint32_t category, std::uint16_t type, const twr_payload& payload);

  // Consumer. The oldest message; the same one until pop(). Its bytes are valid until then.
  [[nodiscard]] std::optional<RingMessage> front();
  // Consumer. Removes the message that front() returned.
  void pop();

  // Any thread. Positions only grow. All messages from before a call of writtenPosition() were read once
  // readPosition() has reached its result.
  std::uint64_t writtenPosition() const { return producer_.written.load(std::memory_order_acquire); }
  std::uint64_t readPosition() const { return consumer_.read.load(std::memory_order_acquire); }
  std::uint64_t dropped() const { return producer_.dropped.load(std::memory_order_acquire); }

 private:
  struct Header;

  [[nodiscard]] twr_status drop(std::uint32_t category, twr_status why);
  [[nodiscard]] bool hasRoom(std::uint64_t written, std::size_t bytes);
  void writeAround(std::uint64_t position, const Header& header, const unsigned char* bytes);
  std::span<const unsigned char> bytesAt(std::uint64_t position, std::size_t size);

  const RingMemory memory_;

  // The two sides write to different cache lines, so that they do not slow each other down, and each has all
  // that it needs in its own line. Each side reads the other's position only when its own copy of it says
  // that there is no room, or no message.
  struct alignas(kCacheLineBytes) Producer {
    const std::span<unsigned char> bytes;
    LossCount& losses;
    std::atomic<std::uint64_t> written;
    std::atomic<std::uint64_t> dropped;
    std::uint64_t seenRead;
  };
  struct alignas(kCacheLineBytes) Consumer {
    const std::span<const unsigned char> bytes;
    std::atomic<std::uint64_t> read;
    std::uint64_t seenWritten;
    std::size_t frontBytes;
    std::vector<unsigned char> joined;  // the front message's bytes when they wrap around the ring's end
  };
  Producer producer_;
  Consumer consumer_;
};

}  // namespace tonewerk
