// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreRow.h"

namespace tonewerk {

class JsonService;

// Writes the power events into an open report store. Used on the writer's thread, within its transactions.
class PowerTable {
 public:
  // `database` and `json` outlive it. Prepares its statement. Whether that succeeded shows in the first
  // insert().
  PowerTable(SqliteDatabase& database, const JsonService& json);

  // False on failure. The database then has the problem.
  [[nodiscard]] bool insert(const PowerRow& row);

 private:
  const JsonService& json_;
  SqliteStatement insertRow_;
};

}  // namespace tonewerk
