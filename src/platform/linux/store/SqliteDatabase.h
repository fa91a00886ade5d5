// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

#include "platform/linux/store/SqliteStatement.h"

struct sqlite3;

namespace tonewerk {

// A connection to a SQLite database file. One thread. After a failure problem() and isCorrupt() speak of it
// until the next call.
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

  // On failure it is closed; the failure can still be asked for. `patience` is how long a statement waits for
  // another process's lock.
  [[nodiscard]] bool open(const std::string& path, Mode mode, std::chrono::milliseconds patience);
  // Statements of this database must be gone.
  void close();
  bool isOpen() const { return isOpen_; }

  // One or more statements whose rows nobody wants.
  [[nodiscard]] bool run(const std::string& sql);
  [[nodiscard]] SqliteStatement prepare(const std::string& sql);
  // The first column of the first row; none on failure and without a row.
  [[nodiscard]] std::optional<std::int64_t> number(const std::string& sql);

  // Rows touched by the last statement.
  std::int64_t changes() const;
  // Whether the file is no longer where it was opened.
  bool hasMoved() const;

  std::string problem() const;
  // Whether the last failure says that the file is damaged, or no database at all.
  bool isCorrupt() const;

 private:
  sqlite3* database_ = nullptr;
  bool isOpen_ = false;
};

}  // namespace tonewerk
