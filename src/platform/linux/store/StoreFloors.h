// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {

// A file that was saved from a damaged one may lack the newest rows of a table. The table of floors says what
// identifiers those may have had, and new rows are numbered above: else the marks of age would take them for
// as old as the lost ones, and readers that continue after the last row they saw would miss them. Other files
// have no such table.

// The SQL that makes the table when it is missing.
std::string storeFloorTable();

// For each table of an open file the identifier above which its next row is numbered; 0 when the rows that
// are there say it. None on failure, which the database then has.
[[nodiscard]] std::optional<StoreRowIds> readStoreFloors(SqliteDatabase& database);

}  // namespace tonewerk
