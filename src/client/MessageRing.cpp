// SPDX-License-Identifier: Apache-2.0
#include "client/MessageRing.h"

#include <algorithm>
#include <bit>
#include <cassert>
#include <cstring>
#include <ctime>

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

}  // namespace

struct MessageRing::Header {
  double time;
  std::uint64_t lostBefore;
  std::uint32_t category;
  std::uint32_t entries;
  std::uint32_t bytes;
  std::uint16_t type;
  std::uint16_t unused;
};

double coarseSeconds() {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME_COARSE, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

MessageRing::MessageRing(std::size_t bytes, LossCount& losses)
    : memory_(capacityFor(bytes)), losses_(losses) {
  static_assert(sizeof(Header) == kHeaderBytes && kHeaderBytes % kAlignmentBytes == 0);
}

twr_status MessageRing::push(std::uint32_t category, std::uint16_t type, const twr_payload& payload) {
  if (const twr_status problem = problemOfMap(payload); problem != TWR_OK) return drop(category, problem);
  const std::size_t needed = kHeaderBytes + aligned(payload.size);
  if (needed > capacity() || !fitsMessageFrame(payload.size, 1)) return drop(category, TWR_TOO_LARGE);
  const std::uint64_t written = written_.load(std::memory_order_relaxed);
  if (!hasRoom(written, needed)) return drop(category, TWR_FULL);

  const Header header{coarseSeconds(), losses_.count(), category, payload.entries, payload.size, type, 0};
  copyIn(written, &header, sizeof(header));
  copyIn(written + sizeof(header), payload.bytes, payload.size);
  written_.store(written + needed, std::memory_order_release);
  return TWR_OK;
}

std::optional<RingMessage> MessageRing::front() {
  const std::uint64_t read = read_.load(std::memory_order_relaxed);
  if (read == seenWritten_) seenWritten_ = written_.load(std::memory_order_acquire);
  if (read == seenWritten_) return std::nullopt;
  Header header{};
  copyOut(read, &header, sizeof(header));
  frontBytes_ = kHeaderBytes + aligned(header.bytes);
  return RingMessage{header.category,   header.type,    header.time,
                     header.lostBefore, header.entries, bytesAt(read + kHeaderBytes, header.bytes)};
}

void MessageRing::pop() {
  assert(frontBytes_ > 0);
  read_.store(read_.load(std::memory_order_relaxed) + frontBytes_, std::memory_order_release);
  frontBytes_ = 0;
}

twr_status MessageRing::drop(std::uint32_t category, twr_status why) {
  losses_.add(category);
  dropped_.store(dropped_.load(std::memory_order_relaxed) + 1, std::memory_order_release);
  return why;
}

bool MessageRing::hasRoom(std::uint64_t written, std::size_t bytes) {
  if (bytes <= capacity() - (written - seenRead_)) return true;
  seenRead_ = read_.load(std::memory_order_acquire);
  return bytes <= capacity() - (written - seenRead_);
}

void MessageRing::copyIn(std::uint64_t position, const void* from, std::size_t size) {
  if (size == 0) return;  // `from` may then be null
  const std::size_t at = position & (capacity() - 1);
  const std::size_t upToEnd = std::min(size, capacity() - at);
  std::memcpy(memory_.data() + at, from, upToEnd);
  if (upToEnd < size) {
    std::memcpy(memory_.data(), static_cast<const unsigned char*>(from) + upToEnd, size - upToEnd);
  }
}

void MessageRing::copyOut(std::uint64_t position, void* to, std::size_t size) const {
  const std::size_t at = position & (capacity() - 1);
  const std::size_t upToEnd = std::min(size, capacity() - at);
  std::memcpy(to, memory_.data() + at, upToEnd);
  std::memcpy(static_cast<unsigned char*>(to) + upToEnd, memory_.data(), size - upToEnd);
}

std::span<const unsigned char> MessageRing::bytesAt(std::uint64_t position, std::size_t size) {
  const std::size_t at = position & (capacity() - 1);
  if (at + size <= capacity()) return {memory_.data() + at, size};
  joined_.resize(size);
  copyOut(position, joined_.data(), size);
  return joined_;
}

}  // namespace tonewerk
