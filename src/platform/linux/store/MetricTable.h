// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreRow.h"

namespace tonewerk {

// The metric records in an open report store. The writer's thread, within its transactions.
class MetricTable {
 public:
  // `database` outlives it. Prepares its statement; whether that went well shows in the first insert().
  explicit MetricTable(SqliteDatabase& database);

  // False on failure; the database says which.
  [[nodiscard]] bool insert(const MetricRow& row);

 private:
  SqliteStatement insertRow_;
};

}  // namespace tonewerk
