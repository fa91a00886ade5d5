// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "platform/JournalPosition.h"
#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {

// For each user the last row of the user's requests that the file holds. The rows before it are there, too,
// because a user's requests run in order. It is written in the same transaction as the rows. So after a crash
// it tells which rows of the journal's requests are still missing.
using StoreMarks = std::map<std::uint32_t, JournalPosition::Row>;

// Reads the marks of the store's file at `path`. Empty when there is no file, or when none of its rows came
// with a mark. None on failure, which `problem` then describes.
[[nodiscard]] std::optional<StoreMarks> readStoreMarks(const std::string& path, std::string& problem);

// The SQL that makes the table of the marks when it is missing.
std::string storeMarkTable();

// The table of the marks in an open file. Used by one thread.
class StoreMarkTable {
 public:
  // Makes the table when it is missing.
  explicit StoreMarkTable(SqliteDatabase& database);

  [[nodiscard]] bool write(const StoreMarks& marks);

 private:
  SqliteStatement set_;
};

}  // namespace tonewerk
