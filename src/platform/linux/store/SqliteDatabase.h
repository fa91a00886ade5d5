// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

struct sqlite3;
struct sqlite3_stmt;

namespace tonewerk {

class SqliteRows;

// A prepared statement of a SqliteDatabase, which outlives it. Used by one thread at a time.
//
// It is prepared once and used often: bind values to its parameters (?1, ?2, ...), step through the rows,
// reset. A statement that could not be prepared is empty, and its steps fail.
class SqliteStatement {
 public:
  enum class Step { kRow, kDone, kFailed };

  SqliteStatement() = default;
  explicit SqliteStatement(sqlite3_stmt* statement) : statement_(statement) {}
  SqliteStatement(SqliteStatement&& other) noexcept;
  SqliteStatement& operator=(SqliteStatement&& other) noexcept;
  ~SqliteStatement();

  explicit operator bool() const { return statement_ != nullptr; }

  // Parameters count from 1. A text is not copied: it must stay valid until reset().
  void bind(int parameter, std::int64_t number);
  void bind(int parameter, double number);
  void bind(int parameter, std::string_view text);
  // Not copied either.
  void bindBytes(int parameter, std::string_view bytes);
  void bindNull(int parameter);
  // 0 becomes a null.
  void bindUnlessZero(int parameter, std::int64_t number);
  // kNoUser becomes a null.
  void bindUser(int parameter, std::uint32_t user);
  // A value of another statement's current row, of any type. It is copied.
  void bindColumn(int parameter, const SqliteStatement& row, int column);

  [[nodiscard]] Step step();
  // Prepares for the next use. The parameters keep their values.
  void reset();
  // Steps and resets a statement that has no rows. False on failure.
  [[nodiscard]] bool run();

  // Steps once and resets. The first column of the first row; none on failure, and when there is no row.
  [[nodiscard]] std::optional<std::int64_t> firstNumber();

  // Columns of the current row, counted from 0.
  std::int64_t integer(int column) const;
  double number(int column) const;
  // Valid UTF-8, whatever program wrote to the file.
  std::string text(int column) const;
  std::string bytes(int column) const;
  bool isNull(int column) const;
  // Whether it is anything but a text that is no UTF-8.
  bool isValid(int column) const;

 private:
  sqlite3_stmt* statement_ = nullptr;
};

// A connection to a SQLite database file. Used by one thread at a time. After a failure, problem() and
// isCorrupt() describe it until the next call.
class SqliteDatabase {
 public:
  enum class Mode {
    kReadWrite,  // creates the file when there is none
    kReadOnly,
    kImmutable,  // read-only, without the side files that a directory without write permission cannot hold
  };

  SqliteDatabase() = default;
  SqliteDatabase(const SqliteDatabase&) = delete;
  SqliteDatabase& operator=(const SqliteDatabase&) = delete;
  ~SqliteDatabase();

  // After a failure it counts as closed, and problem() still describes the failure. `patience` is how long a
  // statement waits for another process's lock.
  [[nodiscard]] bool open(const std::string& path, Mode mode, std::chrono::milliseconds patience);
  // Its statements must be destroyed before.
  void close();
  bool isOpen() const { return isOpen_; }

  // Runs one or more statements and discards their rows.
  [[nodiscard]] bool run(const std::string& sql);
  [[nodiscard]] SqliteStatement prepare(const std::string& sql);
  // Makes `rows` a table of this connection alone, with the columns c0, c1, ... They outlive the statements
  // that read it. A failure shows when such a statement is prepared.
  void addRows(const std::string& name, int columns, const SqliteRows& rows);
  // The first column of the first row. None on failure, and when there is no row.
  [[nodiscard]] std::optional<std::int64_t> number(const std::string& sql);

  // The number of rows that the last statement changed.
  std::int64_t changes() const;
  // The number of the last row that a statement has inserted.
  std::int64_t insertedRow() const;
  // Whether the file is no longer at the path where it was opened.
  bool hasMoved() const;

  std::string problem() const;
  // Whether the last failure means that the file is damaged or no database.
  bool isCorrupt() const;

 private:
  sqlite3* database_ = nullptr;
  bool isOpen_ = false;
};

}  // namespace tonewerk
