// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "platform/Journal.h"

namespace tonewerk {

// The records that are not written yet, as they will be in the segment. Not thread-safe.
class PendingRecords {
 public:
  // `marker` is that of the segments that the records go to.
  explicit PendingRecords(std::uint32_t marker) : marker_(marker) {}

  void append(const Journal::Record& record);

  bool empty() const { return begin_ == bytes_.size(); }
  std::string_view bytes() const { return std::string_view(bytes_).substr(begin_); }
  // The number of the oldest record. There is one.
  std::uint64_t first() const;
  // The bytes of the whole records within the first `most` bytes.
  std::size_t wholeWithin(std::size_t most) const;

  // Removes the oldest records, which have this many bytes together.
  void remove(std::size_t bytes);
  // Removes the oldest records until they had at least this many bytes. Returns their number.
  std::uint64_t giveUp(std::size_t bytes);

 private:
  const std::uint32_t marker_;
  std::string bytes_;
  std::size_t begin_ = 0;  // what is before is removed, but still in memory
};

}  // namespace tonewerk
