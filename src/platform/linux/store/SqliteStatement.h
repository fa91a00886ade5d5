// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

struct sqlite3_stmt;

namespace tonewerk {

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

  [[nodiscard]] Step step();
  // Prepares for the next use. The parameters keep their values.
  void reset();
  // Steps and resets a statement that has no rows. False on failure.
  [[nodiscard]] bool run();

  // Columns of the current row, counted from 0.
  std::int64_t integer(int column) const;
  double number(int column) const;
  // Valid UTF-8, whatever program wrote to the file.
  std::string text(int column) const;
  std::string bytes(int column) const;
  bool isNull(int column) const;

 private:
  sqlite3_stmt* statement_ = nullptr;
};

}  // namespace tonewerk
