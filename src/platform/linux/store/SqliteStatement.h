// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

struct sqlite3_stmt;

namespace tonewerk {

// A prepared statement of a SqliteDatabase, which outlives it. One thread.
//
// Prepared once and used often: bind what its parameters (?1, ?2, ...) stand for, step through the rows,
// reset. One that could not be prepared is empty; its steps fail.
class SqliteStatement {
 public:
  enum class Step { kRow, kDone, kFailed };

  SqliteStatement() = default;
  explicit SqliteStatement(sqlite3_stmt* statement) : statement_(statement) {}
  SqliteStatement(SqliteStatement&& other) noexcept;
  SqliteStatement& operator=(SqliteStatement&& other) noexcept;
  ~SqliteStatement();

  explicit operator bool() const { return statement_ != nullptr; }

  // Parameters count from 1. A text is not copied: it stays valid until reset().
  void bind(int parameter, std::int64_t number);
  void bind(int parameter, double number);
  void bind(int parameter, std::string_view text);
  // Likewise not copied.
  void bindBytes(int parameter, std::string_view bytes);
  void bindNull(int parameter);

  [[nodiscard]] Step step();
  // Makes it ready for the next use; what was bound stays bound.
  void reset();
  // For a statement without rows: step and reset. False on failure.
  [[nodiscard]] bool run();

  // Columns of the current row, from 0.
  std::int64_t integer(int column) const;
  double number(int column) const;
  // UTF-8, whoever wrote to the file.
  std::string text(int column) const;
  std::string bytes(int column) const;
  bool isNull(int column) const;

 private:
  sqlite3_stmt* statement_ = nullptr;
};

}  // namespace tonewerk
