// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Journal.h"
#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {

// The bytes of a segment: a head, then records. Numbers are little-endian.
//
//   head      0 "TWJourn\n"       8
//             8 version           4
//            12 marker            4
//            16 CRC-32C           4   of the bytes before
//
//   record    0 marker            4   that of the segment
//             4 head's CRC-32C    4   of the marker and the bytes 8 to 47
//             8 bytes' CRC-32C    4
//            12 length            4   of the record's bytes
//            16 sequence          8
//            24 time              8   a double, in seconds since 1970, within kLatestTime
//            32 client            8
//            40 user              4
//            44 kind              1   and three zeros
//            48 the record's bytes
//
// The marker is a random number of the process that wrote the segment. It is where a reader looks for the
// next record after damage. A client does not know it, so it cannot send bytes that would be taken for a
// record. The head has a CRC of its own, so that damage in the bytes of a record leaves its length known.
inline constexpr std::uint32_t kSegmentVersion = 1;
inline constexpr std::size_t kSegmentHeadBytes = 20;
inline constexpr std::size_t kRecordHeadBytes = 48;
// The longest frame, and some room for a frame that was encoded anew. More is damage.
inline constexpr std::size_t kMaxRecordBytes = kMaxFrameBytes + 1024;
// Some three thousand years: no clock shows a time further from 1970, so it is damage. Calendars and
// durations hold every time within.
inline constexpr double kLatestTime = 1e11;
// The most bytes of a segment.
inline constexpr std::size_t kMaxSegmentBytes = std::size_t{4} << 20;
static_assert(kSegmentHeadBytes + kRecordHeadBytes + kMaxRecordBytes <= kMaxSegmentBytes);

struct SegmentHead {
  std::uint32_t version = 0;
  std::uint32_t marker = 0;
};

std::string segmentHead(std::uint32_t marker);
// None when the bytes do not begin with a whole head, of any version.
std::optional<SegmentHead> readSegmentHead(std::string_view bytes);

// `record.bytes` has at most kMaxRecordBytes.
void appendRecord(std::string& out, std::uint32_t marker, const Journal::Record& record);

// The size and the number of the record at the beginning of `bytes`, which appendRecord() has written.
std::size_t sizeOfRecord(std::string_view bytes);
std::uint64_t sequenceOfRecord(std::string_view bytes);

// Finds the whole records of a segment, whatever its bytes are.
//
//   SegmentScan scan(bytes, 0);
//   while (const auto record = scan.next()) use(*record);
//
// A record whose number is not above that of the record before it counts as damage.
class SegmentScan {
 public:
  // `bytes` outlives the scan and its records. Numbers are above `after`.
  SegmentScan(std::string_view bytes, std::uint64_t after);

  std::optional<Journal::Record> next();

  // That of the last record, or of the head; none when both are damaged.
  std::optional<std::uint32_t> marker() const { return marker_; }
  // The number of the last record; `after` when there was none.
  std::uint64_t last() const { return last_; }
  // Where the last record ends; where the head ends when there was none.
  std::size_t end() const { return end_; }
  // The places without a whole record in front of the last record, and their bytes.
  std::uint64_t damagedPlaces() const { return damagedPlaces_; }
  std::uint64_t damagedBytes() const { return damagedBytes_; }

 private:
  struct Found {
    Journal::Record record;
    std::size_t begin = 0;
    std::size_t end = 0;  // beyond the segment when the record is cut off
    bool isWhole = false;
  };

  // The record whose head is at `begin`, if one is there.
  std::optional<Found> headAt(std::size_t begin) const;
  // The first record from `begin` on whose head is undamaged.
  std::optional<Found> findHead(std::size_t begin) const;
  std::size_t afterDamage(const Found& found) const;
  void take(const Found& found);

  const std::string_view bytes_;
  std::optional<std::uint32_t> marker_;  // none when the head is damaged, until there is a record
  std::size_t end_ = 0;
  std::uint64_t last_;
  std::uint64_t damagedPlaces_ = 0;
  std::uint64_t damagedBytes_ = 0;
};

}  // namespace tonewerk
