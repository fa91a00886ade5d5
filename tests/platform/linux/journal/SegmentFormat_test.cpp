// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/SegmentFormat.h"

#include <cstddef>
#include <cstdint>
#include <gmock/gmock.h>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "platform/linux/journal/Crc32c.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::uint32_t kMarker = 0xA5C3'1E77;

Journal::Record recordOf(std::uint64_t sequence, std::string_view bytes) {
  return {sequence, Journal::Kind::kRequest, {1'763'633'880.0, 7, 1001}, bytes};
}

// A segment of records with the given bytes, numbered from `first`.
struct Segment {
  explicit Segment(const std::vector<std::string>& records, std::uint64_t first = 1)
      : bytes(segmentHead(kMarker)) {
    for (const std::string& record : records) {
      begins.push_back(bytes.size());
      appendRecord(bytes, kMarker, recordOf(first++, record));
    }
    begins.push_back(bytes.size());
  }

  std::string bytes;
  std::vector<std::size_t> begins;  // of the records, and the end of the last one
};

// What a scan has found. It checks what holds for each scan.
struct Found {
  explicit Found(std::string_view segment, std::uint64_t after = 0) {
    SegmentScan scan(segment, after);
    std::uint64_t last = after;
    std::size_t recordBytes = 0;
    while (const auto record = scan.next()) {
      EXPECT_GT(record->sequence, last);
      last = record->sequence;
      numbers.push_back(record->sequence);
      texts.emplace_back(record->bytes);
      recordBytes += kRecordHeadBytes + record->bytes.size();
    }
    EXPECT_EQ(scan.last(), last);
    places = scan.damagedPlaces();
    damaged = scan.damagedBytes();
    rest = segment.size() - scan.end();
    const std::size_t head = readSegmentHead(segment) ? kSegmentHeadBytes : 0;
    EXPECT_EQ(head + recordBytes + damaged + rest, segment.size()) << "every byte is one of these";
  }

  std::vector<std::uint64_t> numbers;
  std::vector<std::string> texts;
  std::uint64_t places = 0;
  std::uint64_t damaged = 0;
  std::uint64_t rest = 0;
};

TEST(SegmentFormatTest, FindsAllRecordsWithAllTheirFields) {
  std::string bytes = segmentHead(kMarker);
  const std::string binary("\0\x77\x1E\xC3\xA5\xFF", 6);
  appendRecord(bytes, kMarker,
               {~std::uint64_t{0} - 1, Journal::Kind::kDisconnected, {-0.5, 1, ~std::uint32_t{0}}, binary});
  EXPECT_EQ(sizeOfRecord(std::string_view(bytes).substr(kSegmentHeadBytes)), kRecordHeadBytes + 6);
  EXPECT_EQ(sequenceOfRecord(std::string_view(bytes).substr(kSegmentHeadBytes)), ~std::uint64_t{0} - 1);
  SegmentScan scan(bytes, 0);
  const auto record = scan.next();
  ASSERT_TRUE(record);
  EXPECT_EQ(record->sequence, ~std::uint64_t{0} - 1);
  EXPECT_EQ(record->kind, Journal::Kind::kDisconnected);
  EXPECT_EQ(record->origin.at, -0.5);
  EXPECT_EQ(record->origin.client, 1U);
  EXPECT_EQ(record->origin.user, ~std::uint32_t{0});
  EXPECT_EQ(record->bytes, binary);
  EXPECT_FALSE(scan.next());
  EXPECT_EQ(scan.end(), bytes.size());
}

// Other programs read the files of this version, so its bytes stay.
TEST(SegmentFormatTest, AVersionOneRecordHasTheseBytes) {
  std::string bytes;
  appendRecord(bytes, 0x0403'0201, {5, Journal::Kind::kConnected, {1.0, 6, 7}, "ab"});
  const std::string fields(
      "\x02\0\0\0\x05\0\0\0\0\0\0\0\0\0\0\0\0\0\xF0\x3F\x06\0\0\0\0\0\0\0\x07\0\0\0\x01\0\0\0", 36);
  EXPECT_EQ(bytes.substr(0, 4), "\x01\x02\x03\x04");
  EXPECT_EQ(bytes.substr(12, 36), fields);
  EXPECT_EQ(bytes.substr(48), "ab");
}

// The central promise: damage costs the records that it covers, and nothing else.
TEST(SegmentFormatTest, ADamagedByteCostsOnlyTheRecordThatItIsIn) {
  const std::vector<std::string> texts{"first", "", std::string(70, 'x'), "last but one", "last"};
  const Segment whole(texts);
  for (std::size_t at = 0; at < whole.bytes.size(); ++at) {
    for (const unsigned change : {0x01U, 0x80U, 0xFFU}) {
      std::string bytes = whole.bytes;
      bytes[at] = static_cast<char>(static_cast<unsigned char>(bytes[at]) ^ change);
      std::vector<std::string> expected;
      for (std::size_t record = 0; record < texts.size(); ++record) {
        if (at < whole.begins[record] || at >= whole.begins[record + 1]) expected.push_back(texts[record]);
      }
      const Found found(bytes);
      ASSERT_EQ(found.texts, expected) << "byte " << at;
      const bool isInLast = at >= whole.begins[texts.size() - 1];
      ASSERT_EQ(found.places, isInLast ? 0U : 1U) << "byte " << at;
      ASSERT_EQ(found.rest > 0, isInLast) << "byte " << at;
    }
  }
}

TEST(SegmentFormatTest, DamageThatCoversTheHeadAndRecordsLeavesTheOthers) {
  const std::vector<std::string> texts{"first", "second", "third", "fourth"};
  const Segment whole(texts);
  for (std::size_t begin = 0; begin <= whole.bytes.size(); ++begin) {
    for (std::size_t end = begin; end <= whole.bytes.size(); ++end) {
      std::string bytes = whole.bytes;
      std::fill(bytes.begin() + static_cast<std::ptrdiff_t>(begin),
                bytes.begin() + static_cast<std::ptrdiff_t>(end), '\0');
      std::vector<std::string> expected;
      for (std::size_t record = 0; record < texts.size(); ++record) {
        const std::size_t from = whole.begins[record];
        const std::size_t to = whole.begins[record + 1];
        // Zeros that were zeros before are no damage.
        if (bytes.compare(from, to - from, whole.bytes, from, to - from) == 0)
          expected.push_back(texts[record]);
      }
      ASSERT_EQ(Found(bytes).texts, expected) << begin << " to " << end;
    }
  }
}

TEST(SegmentFormatTest, BytesThatAreMissingOrTooManyCostOnlyTheRecordsAroundThem) {
  const std::vector<std::string> texts{"first", "second", "third", "fourth", "fifth"};
  const Segment whole(texts);
  std::mt19937 random(7);
  for (int turn = 0; turn < 2000; ++turn) {
    const std::size_t at = random() % whole.bytes.size();
    const std::size_t count = 1 + random() % 60;
    std::string bytes = whole.bytes;
    const bool isMissing = turn % 2 == 0;
    if (isMissing) {
      bytes.erase(at, count);
    } else {
      std::string more(count, '\0');
      for (char& byte : more) byte = static_cast<char>(random());
      bytes.insert(at, more);
    }
    std::vector<std::string> expected;
    for (std::size_t record = 0; record < texts.size(); ++record) {
      const std::size_t end = isMissing ? at + count : at;
      const bool isTouched = end > whole.begins[record] && at < whole.begins[record + 1];
      if (!isTouched) expected.push_back(texts[record]);
    }
    ASSERT_THAT(Found(bytes).texts, testing::IsSupersetOf(expected))
        << at << " " << count << " " << isMissing;
  }
}

TEST(SegmentFormatTest, ARecordThatIsCutOffIsTheRest) {
  const Segment whole({"first", "second"});
  for (std::size_t size = whole.begins[1]; size < whole.bytes.size(); ++size) {
    const Found found(std::string_view(whole.bytes).substr(0, size));
    ASSERT_THAT(found.numbers, ElementsAre(1));
    ASSERT_EQ(found.places, 0U);
    ASSERT_EQ(found.rest, size - whole.begins[1]);
  }
}

TEST(SegmentFormatTest, AnythingElseIsNoRecord) {
  std::mt19937 random(3);
  for (std::size_t size = 0; size < 400; ++size) {
    std::string bytes(size, '\0');
    for (char& byte : bytes) byte = static_cast<char>(random());
    EXPECT_THAT(Found(bytes).numbers, IsEmpty());
    EXPECT_THAT(Found(segmentHead(kMarker) + bytes).numbers, IsEmpty());
    EXPECT_THAT(Found(std::string(size, '\0')).numbers, IsEmpty());
  }
}

// A client could send a whole segment. It does not know the marker.
TEST(SegmentFormatTest, WhatAClientSendsIsNeverTakenForARecord) {
  std::string forged;
  appendRecord(forged, kMarker + 1, recordOf(2, "forged"));
  const Segment whole({forged + forged, "second", "third"});
  for (std::size_t at = whole.begins[0]; at < whole.begins[1]; ++at) {
    std::string bytes = whole.bytes;
    bytes[at] = static_cast<char>(~bytes[at]);
    ASSERT_THAT(Found(bytes).texts, ElementsAre("second", "third")) << "byte " << at;
  }
}

// Even if it knew the marker: with the head of its own record undamaged, these bytes are passed over.
TEST(SegmentFormatTest, TheBytesOfADamagedRecordAreNotSearched) {
  std::string forged;
  appendRecord(forged, kMarker, recordOf(2, "forged"));
  Segment segment({forged + "x", "second"});
  segment.bytes[segment.begins[1] - 1] = 'y';
  EXPECT_THAT(Found(segment.bytes).texts, ElementsAre("second"));
}

TEST(SegmentFormatTest, ARecordOfTheGreatestLengthIsFoundAndALongerOneIsDamage) {
  const Segment longest({std::string(kMaxRecordBytes, 'a'), "second"});
  EXPECT_THAT(Found(longest.bytes).numbers, ElementsAre(1, 2));
  // A longer one, with correct CRCs.
  std::string bytes = segmentHead(kMarker);
  appendRecord(bytes, kMarker, recordOf(1, "first"));
  const std::size_t begin = bytes.size();
  appendRecord(bytes, kMarker, recordOf(2, "x"));
  const auto length = static_cast<std::uint32_t>(kMaxRecordBytes + 1);
  for (std::size_t byte = 0; byte < 4; ++byte) {
    bytes[begin + 12 + byte] = static_cast<char>(length >> (8 * byte) & 0xFFU);
  }
  const std::uint32_t crc = crc32c(std::string_view(bytes).substr(begin + 8, 40));
  for (std::size_t byte = 0; byte < 4; ++byte) {
    bytes[begin + 4 + byte] = static_cast<char>(crc >> (8 * byte) & 0xFFU);
  }
  appendRecord(bytes, kMarker, recordOf(3, "third"));
  const Found found(bytes);
  EXPECT_THAT(found.numbers, ElementsAre(1, 3));
  EXPECT_EQ(found.places, 1U);
  EXPECT_EQ(found.damaged, kRecordHeadBytes + 1);
}

// No calendar holds such times, so nothing that plays the records must see them.
TEST(SegmentFormatTest, ATimeThatNoClockShowsIsDamage) {
  constexpr double kNone = std::numeric_limits<double>::quiet_NaN();
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  std::string bytes = segmentHead(kMarker);
  std::uint64_t sequence = 0;
  for (const double at : {0.0, kNone, -kLatestTime, 1e300, kLatestTime, -1e12, kInfinity, 1.0}) {
    appendRecord(bytes, kMarker, {++sequence, Journal::Kind::kRequest, {at, 7, 1001}, "x"});
  }
  const Found found(bytes);
  EXPECT_THAT(found.numbers, ElementsAre(1, 3, 5, 8));
  EXPECT_EQ(found.places, 3U);
}

TEST(SegmentFormatTest, ANumberThatDoesNotGrowIsDamage) {
  std::string bytes = segmentHead(kMarker);
  for (const std::uint64_t sequence : {5U, 5U, 4U, 6U}) appendRecord(bytes, kMarker, recordOf(sequence, "x"));
  const Found found(bytes, 3);
  EXPECT_THAT(found.numbers, ElementsAre(5, 6));
  EXPECT_EQ(found.places, 1U);
  EXPECT_EQ(found.damaged, 2 * (kRecordHeadBytes + 1));
  EXPECT_THAT(Found(bytes, 5).numbers, ElementsAre(6));
}

}  // namespace
}  // namespace tonewerk
