// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>

#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {

// How much the report store keeps.
struct StoreBounds {
  std::int64_t bytes = 256LL << 20;  // the database file and its write-ahead log together
  double seconds = 30 * 86'400.0;

  // What the write-ahead log may take of `bytes`; the rest is the database file's.
  std::int64_t walBytes() const;
  std::int64_t fileBytes() const { return bytes - walBytes(); }

  friend bool operator==(const StoreBounds&, const StoreBounds&) = default;
};

// Keeps an open report store within its bounds: deletes the oldest rows, of whatever table, and gives pages
// back to the file system. The writer's thread, outside transactions.
//
// Works in slices of some milliseconds, so that rows to write never wait long. At its bound the file keeps
// its size: new rows take the pages of deleted ones, and what is in use stays between nine tenths of the
// bound and all of it, unless a single row is larger than what lies between. Age is looked at where the
// oldest rows are; rows recorded while the clock was ahead can hold back those behind them until their own
// time has come.
class StoreTrimmer {
 public:
  enum class Outcome { kDone, kMoreToDo, kFailed };

  explicit StoreTrimmer(SqliteDatabase& database) : database_(database) {}

  // One slice of keeping to the time bound; `now` in seconds since 1970. On failure the database says why.
  [[nodiscard]] Outcome trimAge(const StoreBounds& bounds, double now);
  // The same of keeping to the size bound. Cheap when there is nothing to do: for every batch.
  [[nodiscard]] Outcome trimSize(const StoreBounds& bounds);

 private:
  [[nodiscard]] Outcome deleteForSize(std::int64_t fileBytes);
  [[nodiscard]] Outcome vacuum(std::int64_t fileBytes);
  [[nodiscard]] bool measure();
  [[nodiscard]] std::int64_t deleteUpTo(double time);
  [[nodiscard]] std::int64_t deleteOldest(std::int64_t bytes);
  [[nodiscard]] std::optional<bool> emptyNewest(std::int64_t mostBytes);

  SqliteDatabase& database_;
  std::int64_t pageBytes_ = 0;
  std::int64_t pages_ = 0;
  std::int64_t freePages_ = 0;
  bool shrinking_ = false;  // over the bound; on until there is room again
};

}  // namespace tonewerk
