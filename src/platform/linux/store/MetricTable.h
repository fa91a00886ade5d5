// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/SqliteRows.h"
#include "platform/linux/store/StoreBatch.h"

namespace tonewerk {

// Writes the metric records into an open report store. Used on the writer's thread, within its transactions.
class MetricTable final : private SqliteRows {
 public:
  // `database` outlives it. Prepares its statement. Whether that succeeded shows in the first insert().
  explicit MetricTable(SqliteDatabase& database);

  // Inserts the batch's metric records. False on failure. The database then has the problem.
  [[nodiscard]] bool insert(const StoreBatch& batch);

 private:
  std::size_t rowCount() const override;
  void read(std::size_t row, int column, SqliteCell& cell) const override;

  SqliteStatement insertRows_;
  const StoreBatch* batch_ = nullptr;  // while its rows are inserted
};

}  // namespace tonewerk
