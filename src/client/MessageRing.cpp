// SPDX-License-Identifier: Apache-2.0
#include "client/MessageRing.h"

#include <algorithm>
#include <bit>
#include <cassert>
#include <cstring>
#include <ctime>
#include <new>

#include "client/MessageFrame.h"
#include "client/Payload.h"

namespace tonewerk {
namespace {

constexpr std::size_t aligned(std::size_t bytes) {
  constexpr std::size_t kMask = MessageRing::kAlignmentBytes - 1;
  return (bytes + kMask) & ~kMask;
}

std::size_t capacityFor(std::size_t bytes) {
  return std::bit_ceil(
      std::clamp(bytes, MessageRing::kMinBytes, static_cast<std::size_t>(TWR_MOST_RING_BYTES)));
}

constexpr std::int64_t kNanoseconds = 1'000'000'000;  // in a second

std::int64_t coarseNanoseconds() {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME_COARSE, &now);
  return now.tv_sec * kNanoseconds + now.tv_nsec;
}

double secondsOf(std::int64_t nanoseconds) {
  const std::int64_t seconds = nanoseconds / kNanoseconds;
  return static_cast<double>(seconds) + static_cast<double>(nanoseconds % kNanoseconds) / 1e9;
}

// Does the same as memcpy(), without a call: the function's code is seldom in the caches of a thread that has
// done other work before.
inline void copy(unsigned char* to, const unsigned char* from, std::size_t size) {
  constexpr std::size_t kStepBytes = 64;
  if (size < kStepBytes) {
    if (size > 0) std::memcpy(to, from, size);  // `from` may otherwise be null
    return;
  }
  const std::size_t last = size - kStepBytes;
  for (std::size_t at = 0; at < last; at += kStepBytes) std::memcpy(to + at, from + at, kStepBytes);
  std::memcpy(to + last, from + last, kStepBytes);  // overlaps the step before it
}

void copyIn(std::span<unsigned char> ring, std::uint64_t position, const void* from, std::size_t size) {
  if (size == 0) return;  // `from` may then be null
  const std::size_t at = position & (ring.size() - 1);
  const std::size_t upToEnd = std::min(size, ring.size() - at);
  std::memcpy(ring.data() + at, from, upToEnd);
  if (upToEnd < size) {
    std::memcpy(ring.data(), static_cast<const unsigned char*>(from) + upToEnd, size - upToEnd);
  }
}

void copyOut(std::span<const unsigned char> ring, std::uint64_t position, void* to, std::size_t size) {
  const std::size_t at = position & (ring.size() - 1);
  const std::size_t upToEnd = std::min(size, ring.size() - at);
  std::memcpy(to, ring.data() + at, upToEnd);
  std::memcpy(static_cast<unsigned char*>(to) + upToEnd, ring.data(), size - upToEnd);
}

}  // namespace

struct MessageRing::Header {
  std::int64_t time;  // nanoseconds since 1970, so that only the consumer divides
  std::uint64_t lostBefore;
  std::uint32_t category;
  std::uint32_t entries;
  std::uint32_t bytes;
  std::uint16_t type;
  std::uint16_t unused;
};

double coarseSeconds() { return secondsOf(coarseNanoseconds()); }

MessageRing::MessageRing(std::size_t bytes, LossCount& losses)
    : memory_(capacityFor(bytes)),
      producer_{memory_.bytes(), losses, 0, 0, 0},
      consumer_{memory_.bytes(), 0, 0, 0, {}} {
  static_assert(sizeof(Header) == kHeaderBytes && kHeaderBytes % kAlignmentBytes == 0);
}

[[gnu::hot]] twr_status MessageRing::push(std::uint32_t category, std::uint16_t type,
                                          const twr_payload& payload) {
  if (const twr_status problem = problemOfMap(payload); problem != TWR_OK) [[unlikely]] {
    return drop(category, problem);
  }
  const std::uint32_t size = payload.size;
  const std::size_t needed = kHeaderBytes + aligned(size);
  if (needed > producer_.bytes.size() || !fitsMessageFrame(size, 1)) [[unlikely]] {
    return drop(category, TWR_TOO_LARGE);
  }
  const std::uint64_t written = producer_.written.load(std::memory_order_relaxed);
  if (!hasRoom(written, needed)) [[unlikely]] {
    return drop(category, TWR_FULL);
  }

  const std::span<unsigned char> ring = producer_.bytes;
  const std::size_t at = written & (ring.size() - 1);
  const auto header = [&]() -> Header {
    return {coarseNanoseconds(), producer_.losses.count(), category, payload.entries, size, type, 0};
  };
  if (needed <= ring.size() - at) [[likely]] {
    ::new (ring.data() + at) Header(header());  // made in its place, because copying it takes longer
    copy(ring.data() + at + kHeaderBytes, payload.bytes, size);
  } else {
    writeAround(written, header(), payload.bytes);
  }
  producer_.written.store(written + needed, std::memory_order_release);
  return TWR_OK;
}

std::optional<RingMessage> MessageRing::front() {
  const std::uint64_t read = consumer_.read.load(std::memory_order_relaxed);
  if (read == consumer_.seenWritten) consumer_.seenWritten = writtenPosition();
  if (read == consumer_.seenWritten) return std::nullopt;
  Header header{};
  copyOut(consumer_.bytes, read, &header, sizeof(header));
  consumer_.frontBytes = kHeaderBytes + aligned(header.bytes);
  return RingMessage{header.category,   header.type,    secondsOf(header.time),
                     header.lostBefore, header.entries, bytesAt(read + kHeaderBytes, header.bytes)};
}

void MessageRing::pop() {
  assert(consumer_.frontBytes > 0);
  const std::uint64_t read = consumer_.read.load(std::memory_order_relaxed);
  consumer_.read.store(read + std::exchange(consumer_.frontBytes, 0), std::memory_order_release);
}

// Its code is kept apart from that of a message that is taken.
[[gnu::cold, gnu::noinline]] twr_status MessageRing::drop(std::uint32_t category, twr_status why) {
  producer_.losses.add(category);
  producer_.dropped.store(producer_.dropped.load(std::memory_order_relaxed) + 1, std::memory_order_release);
  return why;
}

inline bool MessageRing::hasRoom(std::uint64_t written, std::size_t bytes) {
  const std::size_t capacity = producer_.bytes.size();
  if (bytes <= capacity - (written - producer_.seenRead)) [[likely]] {
    return true;
  }
  producer_.seenRead = readPosition();
  return bytes <= capacity - (written - producer_.seenRead);
}

// For a message that wraps around the ring's end.
[[gnu::noinline]] void MessageRing::writeAround(std::uint64_t position, const Header& header,
                                                const unsigned char* bytes) {
  copyIn(producer_.bytes, position, &header, sizeof(header));
  copyIn(producer_.bytes, position + sizeof(header), bytes, header.bytes);
}

std::span<const unsigned char> MessageRing::bytesAt(std::uint64_t position, std::size_t size) {
  const std::size_t at = position & (consumer_.bytes.size() - 1);
  if (at + size <= consumer_.bytes.size()) return consumer_.bytes.subspan(at, size);
  consumer_.joined.resize(size);
  copyOut(consumer_.bytes, position, consumer_.joined.data(), size);
  return consumer_.joined;
}

}  // namespace tonewerk
