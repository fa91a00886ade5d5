// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreRow.h"

namespace tonewerk {

// Writes the metric records into an open report store. Used on the writer's thread, within its transactions.
class MetricTable {
 public:
  // `database` outlives it. Prepares its statement. Whether that succeeded shows in the first insert().
  explicit MetricTable(SqliteDatabase& database);

  // False on failure. The database then has the problem.
  [[nodiscard]] bool insert(const MetricRow& row);

 private:
  SqliteStatement insertRow_;
};

}  // namespace tonewerk
