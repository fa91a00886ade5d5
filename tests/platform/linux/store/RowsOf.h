// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {

// Returns the first `columns` columns of each row that `sql` finds, joined by spaces.
inline std::vector<std::string> rowsOf(SqliteDatabase& database, const std::string& sql, int columns = 1) {
  SqliteStatement select = database.prepare(sql);
  EXPECT_TRUE(select) << sql << ": " << database.problem();
  std::vector<std::string> found;
  while (select && select.step() == SqliteStatement::Step::kRow) {
    std::string row;
    for (int column = 0; column < columns; ++column) row += (column > 0 ? " " : "") + select.text(column);
    found.push_back(row);
  }
  return found;
}

}  // namespace tonewerk
