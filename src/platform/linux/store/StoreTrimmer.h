// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <optional>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreAge.h"
#include "platform/linux/store/StoreHoldings.h"

namespace tonewerk {

class Clock;

// How much the report store keeps.
struct StoreBounds {
  std::int64_t bytes = 256LL << 20;  // the database file and its write-ahead log together
  double seconds = 30 * 86'400.0;

  // The part of `bytes` that the write-ahead log may take; the rest is for the database file.
  std::int64_t walBytes() const;
  std::int64_t fileBytes() const { return bytes - walBytes(); }

  friend bool operator==(const StoreBounds&, const StoreBounds&) = default;
};

// The rows of a table with these identifiers and those between them. `first` is 0 when there are none.
struct RowRange {
  std::int64_t first = 0;
  std::int64_t last = 0;
};

// Keeps an open report store within its bounds: deletes the oldest rows of all tables and gives pages back to
// the file system. Used on the writer's thread, outside transactions.
//
// For the bound of size, the oldest rows of the user who holds the most are deleted. So a user who holds less
// than an equal part of what all rows count loses none, however much others record, and one user alone may
// use the whole file.
//
// It works in slices, so that rows do not wait long to be written. A slice has at most 16 rounds, each of
// which is a transaction. After kSliceTime it ends earlier, but while the file is over its bound not before
// it has freed kLeastPerSlice, which is more than a batch of rows adds.
//
// At its bound the file keeps its size: new rows take the pages of deleted ones, and the pages in use are
// between nine tenths of the bound and all of it, unless a single row is larger than the difference. How old
// rows are, StoreAge says, not their times.
class StoreTrimmer {
 public:
  enum class Outcome { kDone, kMoreToDo, kFailed };

  static constexpr std::chrono::milliseconds kSliceTime{5};
  static constexpr std::int64_t kLeastPerSlice = 1 << 20;

  // `database` is open and outlives it, and so do `clock` and `holdings`, which follows what is deleted.
  // After a failure the caller undoes the transactions of both.
  StoreTrimmer(SqliteDatabase& database, StoreHoldings& holdings, const Clock& clock);

  // One slice of deleting for age: the rows up to these. On failure the database has the problem.
  [[nodiscard]] Outcome trimAge(const StoreRowIds& old);
  // One slice of deleting for size, after the holdings were read. It costs little when there is nothing to
  // do, so it can follow every batch.
  [[nodiscard]] Outcome trimSize(const StoreBounds& bounds);

 private:
  [[nodiscard]] Outcome deleteForSize(std::int64_t fileBytes);
  [[nodiscard]] Outcome vacuum(std::int64_t fileBytes);
  [[nodiscard]] bool measure();
  [[nodiscard]] bool begin();
  [[nodiscard]] bool commit();
  [[nodiscard]] std::int64_t deleteUpTo(const StoreRowIds& old);
  [[nodiscard]] std::int64_t deleteOldest(std::int64_t bytes);
  [[nodiscard]] bool deleteRows(const StoreTable& table, std::uint32_t user, const RowRange& rows);
  [[nodiscard]] bool closeGaps(const StoreTable& table, const RowRange& rows);
  [[nodiscard]] std::optional<bool> emptyNewest(std::int64_t maxBytes);

  SqliteDatabase& database_;
  StoreHoldings& holdings_;
  const Clock& clock_;
  // Used after every batch, so they are prepared once.
  SqliteStatement countPages_;
  SqliteStatement countFreePages_;
  std::array<SqliteStatement, kStoreTables.size()> newestIds_;
  std::int64_t pageBytes_ = 0;
  std::int64_t pages_ = 0;
  std::int64_t freePages_ = 0;
  bool shrinking_ = false;  // the file is over its bound, and stays so until there is room again
};

}  // namespace tonewerk
