// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace tonewerk {

// What can be seen of a report store from outside.
struct StoreFacts {
  std::string path;
  bool exists = false;
  std::string problem;             // why it cannot be read; empty when it can
  bool isForbidden = false;        // the problem is that the caller may not read it
  std::uint64_t bytes = 0;         // with its write-ahead log
  std::optional<double> oldestAt;  // of the rows, in seconds since 1970; none without rows
  std::optional<double> newestAt;
  std::optional<std::int64_t> newerSchema;  // a file of a newer daemon lies beside it
  bool hasDamagedCopy = false;              // an earlier file was damaged and set aside

  // By how much it grows, from its size and the age of its oldest row; none when that is younger than an
  // hour.
  std::optional<double> bytesPerDay(double now) const;
};

// Looks at the store in `directory`, and changes nothing.
[[nodiscard]] StoreFacts readStoreFacts(const std::string& directory);

// How many messages programs say they have dropped, in rows since a time; none when the store cannot be read.
// Reads the whole store.
[[nodiscard]] std::optional<std::int64_t> messagesDroppedByPrograms(const StoreFacts& store, double since);

}  // namespace tonewerk
