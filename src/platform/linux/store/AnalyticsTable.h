// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <unordered_map>
#include <vector>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/SqliteRows.h"
#include "platform/linux/store/StoreBatch.h"
#include "platform/linux/store/StoreNumbering.h"

namespace tonewerk {

// Writes the analytics rows and their names into an open report store. Used on the writer's thread, within
// its transactions. After a transaction was undone, a new object is needed: this one may remember names as
// stored that are not.
class AnalyticsTable final : private SqliteRows {
 public:
  // `database` outlives it. Prepares its statement. Whether that succeeded shows in the first insert().
  explicit AnalyticsTable(SqliteDatabase& database);

  // Inserts the batch's analytics rows under their identifiers. The lives of their sessions, and the sessions
  // of those that are messages, too, are in the file. False on failure. The database then has the problem.
  [[nodiscard]] bool insert(const StoreBatch& batch, const StoreNumbering& numbering);

 private:
  // The identifiers of so many name sets are remembered. When there are more, all are forgotten.
  static constexpr std::size_t kMaxKnown = 4096;

  std::size_t rowCount() const override;
  void read(std::size_t row, int column, SqliteCell& cell) const override;
  [[nodiscard]] std::optional<std::int64_t> nameSet(const EventKind& kind);
  [[nodiscard]] std::optional<std::int64_t> findNameSet(const EventKind& kind, bool& failed);
  [[nodiscard]] std::optional<std::int64_t> insertNameSet(const EventKind& kind);

  SqliteDatabase& database_;
  SqliteStatement insertRows_;
  SqliteStatement insertNextRows_;             // those with the next identifiers
  const StoreBatch* batch_ = nullptr;          // while its rows are inserted
  std::span<const std::int64_t> identifiers_;  // of its rows
  std::vector<std::int64_t> batchSets_;        // the name sets of batch_->kinds()
  std::unordered_map<EventKind, std::int64_t, EventKindHash> known_;
};

}  // namespace tonewerk
