// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/PendingRecords.h"

#include <algorithm>
#include <cassert>

#include "platform/linux/journal/SegmentFormat.h"

namespace tonewerk {
namespace {

// More memory than this is not kept for later records.
constexpr std::size_t kKeptBytes = std::size_t{256} << 10;

}  // namespace

void PendingRecords::append(const Journal::Record& record) { appendRecord(bytes_, marker_, record); }

std::uint64_t PendingRecords::first() const {
  assert(!empty());
  return sequenceOfRecord(bytes());
}

std::size_t PendingRecords::wholeWithin(std::size_t most) const {
  const std::string_view records = bytes();
  if (records.size() <= most) return records.size();
  std::size_t end = 0;
  for (std::size_t next = 0; next <= most; next = end + sizeOfRecord(records.substr(end))) end = next;
  return end;
}

void PendingRecords::remove(std::size_t bytes) {
  begin_ += bytes;
  if (begin_ < bytes_.size()) {
    // Moving the rest down costs no more than what was removed.
    if (begin_ < bytes_.size() - begin_) return;
    bytes_.erase(0, begin_);
  } else {
    bytes_.clear();
    if (bytes_.capacity() > kKeptBytes) bytes_.shrink_to_fit();
  }
  begin_ = 0;
}

std::uint64_t PendingRecords::giveUp(std::size_t bytes) {
  std::uint64_t records = 0;
  std::size_t end = 0;
  for (const std::string_view all = this->bytes(); end < std::min(bytes, all.size()); ++records) {
    end += sizeOfRecord(all.substr(end));
  }
  remove(end);
  return records;
}

}  // namespace tonewerk
