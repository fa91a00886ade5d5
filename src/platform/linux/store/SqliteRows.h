// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

struct sqlite3_context;

namespace tonewerk {

// Takes the value of one column of one row. It is set once; else it is null.
class SqliteCell {
 public:
  explicit SqliteCell(sqlite3_context* context) : context_(context) {}

  void set(std::int64_t number);
  void set(double number);
  // kNoUser becomes a null.
  void setUser(std::uint32_t user);
  // Not copied: valid UTF-8 that stays valid until the statement is reset.
  void set(std::string_view text);
  // Not copied either.
  void setBytes(std::string_view bytes);

 private:
  sqlite3_context* context_;
};

// Rows in memory that the statements of one SqliteDatabase read as a table (SqliteDatabase::addRows). One
// statement then inserts them all, which costs less than a statement for each row:
//
//   INSERT INTO event (time, text) SELECT c0, c1 FROM new_event
//
// Statements read the rows from the first to the last. The rows do not change while a statement runs.
class SqliteRows {
 public:
  virtual ~SqliteRows() = default;

  virtual std::size_t rowCount() const = 0;
  // Sets `cell` to the value of a column, counted from 0.
  virtual void read(std::size_t row, int column, SqliteCell& cell) const = 0;
};

}  // namespace tonewerk
