// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a segment of the journal. Whatever it is, each of its bytes belongs to the head, to a
// record or to damage, and the records that are found, written anew, are found again.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <optional>
#include <string>
#include <string_view>

#include "platform/linux/journal/SegmentFormat.h"

namespace tonewerk {
namespace {

constexpr std::uint32_t kMarker = 0x1234'5678;

void expect(bool condition) {
  if (!condition) std::abort();
}

bool isSame(const Journal::Record& a, const Journal::Record& b) {
  std::string first;
  std::string second;
  appendRecord(first, kMarker, a);
  appendRecord(second, kMarker, b);
  return first == second;
}

// Returns the records as a segment without damage.
std::string readSegment(std::string_view bytes) {
  std::string undamaged = segmentHead(kMarker);
  SegmentScan scan(bytes, 0);
  std::size_t used = readSegmentHead(bytes) ? kSegmentHeadBytes : 0;
  std::uint64_t last = 0;
  while (const std::optional<Journal::Record> record = scan.next()) {
    expect(record->sequence > last && record->bytes.size() <= kMaxRecordBytes);
    expect(record->bytes.data() >= bytes.data() &&
           record->bytes.data() + record->bytes.size() <= bytes.data() + bytes.size());
    last = record->sequence;
    used += kRecordHeadBytes + record->bytes.size();
    expect(scan.end() == used + scan.damagedBytes());
    appendRecord(undamaged, kMarker, *record);
  }
  expect(scan.last() == last && scan.end() <= bytes.size());
  expect((scan.damagedPlaces() == 0) == (scan.damagedBytes() == 0));
  return undamaged;
}

void read(std::string_view bytes) {
  const std::string undamaged = readSegment(bytes);
  SegmentScan found(bytes, 0);
  SegmentScan again(undamaged, 0);
  while (const std::optional<Journal::Record> record = found.next()) {
    const std::optional<Journal::Record> same = again.next();
    expect(same && isSame(*record, *same));
  }
  expect(!again.next() && again.damagedPlaces() == 0 && again.end() == undamaged.size());
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({reinterpret_cast<const char*>(data), size});
  return 0;
}
