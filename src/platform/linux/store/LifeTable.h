// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <utility>
#include <vector>

#include "platform/SessionBook.h"
#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreBatch.h"

namespace tonewerk {

// Writes the lives of sessions into an open report store. Used on the writer's thread, within its
// transactions. After a transaction was undone, a new object is needed.
//
// A life has one row, which its first row in a batch makes, whatever that says, and later ones change. When
// the journal is played after a crash, a life that the file has already is known again by the request with
// which it began.
class LifeTable {
 public:
  // The files that this process wrote have ever higher numbers.
  struct FileNumbers {
    std::uint64_t own = 0;
    // This file has what was saved of the files from this number on. The same as `own` when there are none.
    std::uint64_t firstSaved = 0;
  };

  // `database` outlives it. The first row is numbered above `floor`. Prepares its statements. Whether that
  // succeeded shows in the first write().
  LifeTable(SqliteDatabase& database, FileNumbers file, std::int64_t floor);
  LifeTable(const LifeTable&) = delete;
  LifeTable& operator=(const LifeTable&) = delete;
  // Takes back the place of lives that were not committed.
  ~LifeTable();

  // Inserts the batch's lives that the file lacks, and changes the others as the batch says. False on
  // failure. The database then has the problem.
  [[nodiscard]] bool write(const StoreBatch& batch);
  // The users of the rows that the last write() has inserted.
  std::span<const std::uint32_t> newRows() const { return newRows_; }
  // The rows are in the file.
  void committed() { uncommitted_.clear(); }

  // Ends the lives that a daemon left open which is no more, at the time of the newest event. Call it when no
  // life of this process can be in the file.
  [[nodiscard]] static bool endInterrupted(SqliteDatabase& database);

 private:
  // How a life is known again: its request, and its reporter's identifier.
  using Key = std::pair<std::uint64_t, std::int64_t>;

  [[nodiscard]] bool place(const std::shared_ptr<SessionLife>& life, std::uint32_t user);
  // Finds the row of a life whose place is in a file that was saved, or inserts it if it was lost.
  [[nodiscard]] bool placeSaved(const std::shared_ptr<SessionLife>& life, std::uint32_t user);
  // Inserts the row of a life and makes it the life's place.
  [[nodiscard]] bool placeNew(const std::shared_ptr<SessionLife>& life, std::uint32_t user,
                              std::int64_t identifier);
  // The row of a life that an earlier daemon, or an earlier file, had; 0 when there is none. None on failure.
  [[nodiscard]] std::optional<std::int64_t> find(const SessionBeginning& beginning);
  [[nodiscard]] bool readRowsFrom(std::uint64_t request);
  // Inserts a row with this identifier, or with the next one when it is 0.
  [[nodiscard]] bool insert(const SessionBeginning& beginning, std::uint32_t user,
                            std::int64_t identifier = 0);
  [[nodiscard]] bool change(const StoreBatch& batch, const StoreBatch::Session& row);

  SqliteDatabase& database_;
  const FileNumbers file_;
  std::int64_t floor_;  // 0 when the rows in the table say it
  SqliteStatement insert_;
  SqliteStatement change_;
  std::optional<std::uint64_t> newestRequest_;  // of all rows; none until it is read
  // While a journal is played: the rows of its requests.
  std::map<Key, std::int64_t> rows_;
  std::optional<std::uint64_t> rowsFrom_;  // the lowest request in rows_
  // The lives whose places are not committed, with those from before.
  std::vector<std::pair<std::shared_ptr<SessionLife>, SessionLife::Place>> uncommitted_;
  std::vector<std::uint32_t> newRows_;
};

}  // namespace tonewerk
