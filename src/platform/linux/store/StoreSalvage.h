// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {

// Copies the rows that can be read of a damaged report store, of this version or an earlier one, into a new
// file, with their identifiers. Used by one thread.
//
// It reads the tables row by row. Where a page is damaged it searches for the next row that can be read, by
// its identifier. A row is copied when it can be read whole, its texts are UTF-8 and its payload is JSON; the
// bytes of a metric cannot be checked. What the store knows of its rows is copied, too: their age, and which
// of the journal's requests they are of. New rows of a table that may have lost its newest ones are numbered
// above those (StoreFloors.h). It finds nothing when the file's list of tables is damaged.
class StoreSalvage {
 public:
  // Makes the file `made`, which must not exist. Without room on the disk it may lack rows, and isMade() is
  // false when it is no store at all. The files of `damaged` stay as they are.
  StoreSalvage(const std::string& damaged, const std::string& made);
  StoreSalvage(const StoreSalvage&) = delete;
  StoreSalvage& operator=(const StoreSalvage&) = delete;

  bool isMade() const { return isMade_; }
  // The number of rows that were copied, of all tables.
  std::int64_t rows() const { return committedRows_; }
  // Why rows were not copied that can be read; empty when there are none.
  const std::string& problem() const { return problem_; }

 private:
  // Rows are committed in pieces, so that those before a failure are kept.
  static constexpr std::int64_t kRowsPerCommit = 5000;
  // The store makes no larger identifiers; a damaged page may have them.
  static constexpr std::int64_t kMaxIdentifier = std::int64_t{1} << 53;

  // What became of an attempt to copy rows.
  enum class Copied { kAll, kSome, kFailed };  // kSome: the rest is damaged; kFailed: it cannot be written

  [[nodiscard]] bool copyAll();
  [[nodiscard]] bool copyNames();
  [[nodiscard]] bool copyRows(std::size_t table);
  [[nodiscard]] bool copyAgeMarks();
  [[nodiscard]] bool copyFloors();
  // Before copyAgeMarks() removes them.
  [[nodiscard]] bool learnFromAgeMarks();
  [[nodiscard]] bool copyJournalMarks();
  // Copies the rows that `select` finds; `insert` takes their columns.
  [[nodiscard]] Copied copy(SqliteStatement& select, SqliteStatement& insert, int columns);
  [[nodiscard]] Copied copyTable(const std::string& table, const std::string& columns, int count,
                                 const std::string& how);
  // The identifier after `failed` from which on rows can be read; above kMaxIdentifier when there is none.
  std::int64_t nextReadable(const std::string& from, std::int64_t failed);
  [[nodiscard]] bool commitSome();
  bool has(std::string_view type, std::string_view name);
  std::int64_t damagedBytes() const;
  bool hasColumn(std::string_view table, std::string_view column);

  const std::string path_;  // of the damaged file
  // Two connections, because SQLite writes no more within a transaction that has found damage.
  SqliteDatabase damaged_;
  SqliteDatabase made_;
  bool isMade_ = false;
  std::int64_t rows_ = 0;
  std::int64_t committedRows_ = 0;
  // For each of kStoreTables: the highest identifier that is known, and whether rows after it may be lost.
  StoreRowIds highest_{};
  std::array<bool, kStoreTables.size()> isEndLost_{};
  std::string problem_;
};

}  // namespace tonewerk
