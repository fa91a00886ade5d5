// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

#include "platform/linux/store/SqliteStatement.h"

struct sqlite3;

namespace tonewerk {

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
  // The first column of the first row. None on failure, and when there is no row.
  [[nodiscard]] std::optional<std::int64_t> number(const std::string& sql);

  // The number of rows that the last statement changed.
  std::int64_t changes() const;
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
