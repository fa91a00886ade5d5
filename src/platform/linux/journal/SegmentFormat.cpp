// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/SegmentFormat.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cassert>
#include <cmath>
#include <concepts>

#include "platform/linux/journal/Crc32c.h"

namespace tonewerk {
namespace {

constexpr std::string_view kMagic = "TWJourn\n";

constexpr std::size_t kVersionAt = 8;
constexpr std::size_t kSegmentMarkerAt = 12;
constexpr std::size_t kSegmentCrcAt = 16;

constexpr std::size_t kHeadCrcAt = 4;
constexpr std::size_t kBytesCrcAt = 8;
constexpr std::size_t kLengthAt = 12;
constexpr std::size_t kSequenceAt = 16;
constexpr std::size_t kTimeAt = 24;
constexpr std::size_t kClientAt = 32;
constexpr std::size_t kUserAt = 40;
constexpr std::size_t kKindAt = 44;

constexpr std::size_t kMarkerBytes = 4;

template <std::unsigned_integral Number>
void put(char* at, Number number) {
  for (std::size_t byte = 0; byte < sizeof(Number); ++byte) {
    at[byte] = static_cast<char>(static_cast<unsigned char>(number >> (8 * byte)));
  }
}

template <std::unsigned_integral Number>
Number get(std::string_view bytes, std::size_t at) {
  Number number = 0;
  for (std::size_t byte = 0; byte < sizeof(Number); ++byte) {
    number |= static_cast<Number>(Number{static_cast<unsigned char>(bytes[at + byte])} << (8 * byte));
  }
  return number;
}

bool isKind(std::uint8_t kind) {
  switch (static_cast<Journal::Kind>(kind)) {
    case Journal::Kind::kConnected:
    case Journal::Kind::kRequest:
    case Journal::Kind::kDisconnected:
    case Journal::Kind::kSingleMessagesEnded:
      return true;
  }
  return false;
}

// False for what is not a number, too.
bool isTime(double at) { return std::abs(at) <= kLatestTime; }

std::uint32_t headCrcOf(std::string_view head) {
  return crc32c(head.substr(kBytesCrcAt, kRecordHeadBytes - kBytesCrcAt),
                crc32c(head.substr(0, kMarkerBytes)));
}

}  // namespace

std::string segmentHead(std::uint32_t marker) {
  std::string head(kSegmentHeadBytes, '\0');
  std::copy(kMagic.begin(), kMagic.end(), head.begin());
  put(head.data() + kVersionAt, kSegmentVersion);
  put(head.data() + kSegmentMarkerAt, marker);
  put(head.data() + kSegmentCrcAt, crc32c(std::string_view(head).substr(0, kSegmentCrcAt)));
  return head;
}

std::optional<SegmentHead> readSegmentHead(std::string_view bytes) {
  if (bytes.size() < kSegmentHeadBytes || !bytes.starts_with(kMagic)) return std::nullopt;
  if (get<std::uint32_t>(bytes, kSegmentCrcAt) != crc32c(bytes.substr(0, kSegmentCrcAt))) return std::nullopt;
  return SegmentHead{get<std::uint32_t>(bytes, kVersionAt), get<std::uint32_t>(bytes, kSegmentMarkerAt)};
}

void appendRecord(std::string& out, std::uint32_t marker, const Journal::Record& record) {
  assert(record.bytes.size() <= kMaxRecordBytes);
  std::array<char, kRecordHeadBytes> head{};
  put(head.data(), marker);
  put(head.data() + kBytesCrcAt, crc32c(record.bytes));
  put(head.data() + kLengthAt, static_cast<std::uint32_t>(record.bytes.size()));
  put(head.data() + kSequenceAt, record.sequence);
  put(head.data() + kTimeAt, std::bit_cast<std::uint64_t>(record.origin.at));
  put(head.data() + kClientAt, record.origin.client);
  put(head.data() + kUserAt, record.origin.user);
  put(head.data() + kKindAt, static_cast<std::uint8_t>(record.kind));
  put(head.data() + kHeadCrcAt, headCrcOf({head.data(), head.size()}));
  out.append(head.data(), head.size());
  out.append(record.bytes);
}

std::size_t sizeOfRecord(std::string_view bytes) {
  return kRecordHeadBytes + get<std::uint32_t>(bytes, kLengthAt);
}

std::uint64_t sequenceOfRecord(std::string_view bytes) { return get<std::uint64_t>(bytes, kSequenceAt); }

SegmentScan::SegmentScan(std::string_view bytes, std::uint64_t after) : bytes_(bytes), last_(after) {
  const std::optional<SegmentHead> head = readSegmentHead(bytes);
  if (!head) return;
  marker_ = head->marker;
  end_ = kSegmentHeadBytes;
}

std::optional<Journal::Record> SegmentScan::next() {
  std::size_t at = end_;
  while (const std::optional<Found> found = findHead(at)) {
    if (found->isWhole) {
      take(*found);
      return found->record;
    }
    at = afterDamage(*found);
  }
  return std::nullopt;
}

// Where to look for the next record when the head of this one is good and its bytes are not. They are passed
// over without a look, if a record follows where they should end. Else some of them are missing.
std::size_t SegmentScan::afterDamage(const Found& found) const {
  const bool isEndRight = found.end == bytes_.size() || headAt(found.end);
  return isEndRight ? found.end : found.begin + kRecordHeadBytes;
}

void SegmentScan::take(const Found& found) {
  if (found.begin != end_) {
    ++damagedPlaces_;
    damagedBytes_ += found.begin - end_;
  }
  marker_ = get<std::uint32_t>(bytes_, found.begin);
  end_ = found.end;
  last_ = found.record.sequence;
}

std::optional<SegmentScan::Found> SegmentScan::findHead(std::size_t begin) const {
  std::array<char, kMarkerBytes> marker{};
  if (marker_) put(marker.data(), *marker_);
  for (std::size_t at = begin; at < bytes_.size(); ++at) {
    if (marker_) at = bytes_.find({marker.data(), marker.size()}, at);
    if (at == std::string_view::npos) break;
    if (const std::optional<Found> found = headAt(at)) return found;
  }
  return std::nullopt;
}

std::optional<SegmentScan::Found> SegmentScan::headAt(std::size_t begin) const {
  if (begin > bytes_.size() || bytes_.size() - begin < kRecordHeadBytes) return std::nullopt;
  const std::string_view head = bytes_.substr(begin, kRecordHeadBytes);
  if (marker_ && get<std::uint32_t>(head, 0) != *marker_) return std::nullopt;
  const auto kind = static_cast<std::uint8_t>(head[kKindAt]);
  const auto length = get<std::uint32_t>(head, kLengthAt);
  const auto sequence = get<std::uint64_t>(head, kSequenceAt);
  const auto at = std::bit_cast<double>(get<std::uint64_t>(head, kTimeAt));
  // The CRC comes last, because without a marker there is a head to be checked at every byte.
  const bool isHead = isKind(kind) && length <= kMaxRecordBytes && sequence > last_ && isTime(at) &&
                      get<std::uint32_t>(head, kHeadCrcAt) == headCrcOf(head);
  if (!isHead) return std::nullopt;
  Found found;
  found.begin = begin;
  found.end = begin + kRecordHeadBytes + length;
  found.record.sequence = sequence;
  found.record.kind = static_cast<Journal::Kind>(kind);
  found.record.origin.at = at;
  found.record.origin.client = get<std::uint64_t>(head, kClientAt);
  found.record.origin.user = get<std::uint32_t>(head, kUserAt);
  if (found.end > bytes_.size()) return found;
  found.record.bytes = bytes_.substr(begin + kRecordHeadBytes, length);
  found.isWhole = get<std::uint32_t>(head, kBytesCrcAt) == crc32c(found.record.bytes);
  return found;
}

}  // namespace tonewerk
