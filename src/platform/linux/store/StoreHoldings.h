// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <unordered_map>
#include <vector>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreBatch.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {

// What one user holds in a report store. kNoUser holds the rows that have no user.
struct StoreHolding {
  std::uint32_t user = kNoUser;
  // The sum of what the rows count: what may be large in them (StoreTable::bytes), and kStoreRowBytes for
  // each.
  std::int64_t bytes = 0;
  // For each of kStoreTables: no row of the user has a lower identifier.
  std::array<std::int64_t, kStoreTables.size()> from{};
};

// Knows how much each user holds in a report store. It reads all rows once, and then follows what is inserted
// and deleted, also when the same file is closed and opened again. Rows that another program inserts are not
// counted. Used on the writer's thread.
class StoreHoldings {
 public:
  // `database` outlives it.
  explicit StoreHoldings(SqliteDatabase& database) : database_(database) {}

  // Reads all rows, if that has not been done. False on failure. The database then has the problem.
  [[nodiscard]] bool read();
  // The file is another one, or damaged: the next read() reads its rows.
  void forget();

  // What follows belongs to one transaction, until commit(). After a failure, undo() gives back what was held
  // at begin(); it does nothing outside transactions.
  void begin();
  void commit() { isInTransaction_ = false; }
  void undo();

  // Counts the rows of the batch, without its sessions. To be called before they are inserted, in the same
  // transaction. False on failure. The database then has the problem.
  [[nodiscard]] bool add(const StoreBatch& batch);
  // Counts one row of a user who is in the batch that was added last; `bytes` without kStoreRowBytes. This
  // and add() do nothing before read(), which will find the rows in the file.
  void addRow(std::uint32_t user, std::int64_t bytes);
  // A deleted row.
  void removeRow(std::uint32_t user, std::int64_t bytes);

  // The sum of the user's rows.
  std::int64_t of(std::uint32_t user) const;
  // Every user who holds something, and some who do not any more. Valid until the next add().
  std::span<StoreHolding> all() { return holdings_; }

 private:
  static constexpr std::size_t kNone = static_cast<std::size_t>(-1);

  std::size_t indexOf(std::uint32_t user) const;
  // The user's holding, which is made when it is missing: the user's rows will come after all that are there.
  // Null on failure.
  [[nodiscard]] StoreHolding* holdingOf(std::uint32_t user);
  StoreHolding& append(const StoreHolding& holding);

  SqliteDatabase& database_;
  bool hasRead_ = false;
  std::vector<StoreHolding> holdings_;
  std::unordered_map<std::uint32_t, std::size_t> indices_;  // in holdings_, by user
  mutable std::size_t lastFound_ = 0;                       // neighbouring rows are mostly one user's
  std::vector<StoreHolding> atBegin_;
  bool isInTransaction_ = false;
};

// The user of a row, from a column with the user.
std::uint32_t userOf(const SqliteStatement& row, int column);

}  // namespace tonewerk
