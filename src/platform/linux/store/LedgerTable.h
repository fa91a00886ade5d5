// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/SqliteRows.h"
#include "platform/linux/store/StoreBatch.h"

namespace tonewerk {

// Writes what was sent to endpoints into an open report store. Used on the writer's thread, within its
// transactions.
class LedgerTable final : private SqliteRows {
 public:
  // `database` outlives it. The first row is numbered above `floor`. Prepares its statements. Whether that
  // succeeded shows in the first insert(). After a transaction was undone, a new object is needed.
  LedgerTable(SqliteDatabase& database, std::int64_t floor);

  // Inserts the batch's sendings. False on failure. The database then has the problem.
  [[nodiscard]] bool insert(const StoreBatch& batch);

 private:
  std::size_t rowCount() const override;
  void read(std::size_t row, int column, SqliteCell& cell) const override;

  SqliteStatement insertRows_;
  SqliteStatement insertAboveFloor_;   // the first rows, if there is a floor
  const StoreBatch* batch_ = nullptr;  // while its rows are inserted
};

}  // namespace tonewerk
