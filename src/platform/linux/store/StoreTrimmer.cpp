// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreTrimmer.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <string>
#include <vector>

#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kMinWalBytes = 256 << 10;
constexpr std::int64_t kMaxWalBytes = 8 << 20;

// The number of rows of a table that one statement deletes for their age.
constexpr std::int64_t kChunkRows = 500;
// The number of rows of all tables, or of bytes, that one round deletes for their size.
constexpr int kRowsPerRound = 2000;
constexpr std::int64_t kBytesPerRound = 2 << 20;
constexpr int kRoundsPerSlice = 16;
// The number of pages that a slice gives back.
constexpr std::int64_t kVacuumPages = 512;
// At least this many free pages stay for new rows, unless the file is too large.
constexpr std::int64_t kSpareFreePages = 64;

// Orders by identifier, which changes of the clock do not affect. The newest row stays, so that its
// identifier is not used again: a reader that continues after the last row it saw misses none. That of
// rtc_row may go when an analytics row has a higher identifier, because new messages are numbered above both.
std::string oldestRows(const StoreTable& table, const std::string& columns) {
  const std::string name(table.name);
  std::string newest = "(SELECT max(id) FROM " + name + ")";
  if (name == "rtc_row") newest = "max(" + newest + ", coalesce((SELECT max(id) FROM analytics_row), 0))";
  return "SELECT " + columns + " FROM " + name + " WHERE id < " + newest + " ORDER BY id";
}

std::string oldestChunk(const StoreTable& table) {
  return oldestRows(table, "id") + " LIMIT " + std::to_string(kChunkRows);
}

// Walks through one table, from its oldest row on.
class OldestRows {
 public:
  OldestRows(SqliteDatabase& database, const StoreTable& table)
      : select_(database.prepare(
            oldestRows(table, "id, " + std::string(table.time) + ", " + std::string(table.bytes)))) {
    step();
  }

  bool hasFailed() const { return at_ == SqliteStatement::Step::kFailed; }
  bool hasRow() const { return at_ == SqliteStatement::Step::kRow; }
  double time() const { return select_.number(1); }

  // Moves to the next row, and marks the current one for deletion. Returns the bytes that the current row
  // holds.
  std::int64_t pass() {
    passed_ = select_.integer(0);
    const std::int64_t bytes = select_.integer(2) + kLeastRowBytes;
    step();
    return bytes;
  }
  // The identifier of the last marked row; 0 when there is none.
  std::int64_t passed() const { return passed_; }

 private:
  // The least bytes of a row: its identifier, its time and the lengths of its columns.
  static constexpr std::int64_t kLeastRowBytes = 16;

  void step() { at_ = select_.step(); }

  SqliteStatement select_;
  SqliteStatement::Step at_ = SqliteStatement::Step::kDone;
  std::int64_t passed_ = 0;
};

// The table whose current row is the oldest of all. Null when no row is left.
OldestRows* oldestOf(std::vector<OldestRows>& tables) {
  OldestRows* oldest = nullptr;
  for (OldestRows& table : tables) {
    if (table.hasRow() && (oldest == nullptr || table.time() < oldest->time())) oldest = &table;
  }
  return oldest;
}

}  // namespace

std::int64_t StoreBounds::walBytes() const { return std::clamp(bytes / 8, kMinWalBytes, kMaxWalBytes); }

StoreTrimmer::StoreTrimmer(SqliteDatabase& database)
    : database_(database),
      countPages_(database.prepare("PRAGMA page_count")),
      countFreePages_(database.prepare("PRAGMA freelist_count")) {}

StoreTrimmer::Outcome StoreTrimmer::trimAge(const StoreBounds& bounds, double now) {
  for (int round = 0; round < kRoundsPerSlice; ++round) {
    const std::int64_t deleted = deleteUpTo(now - bounds.seconds);
    if (deleted < 0) return Outcome::kFailed;
    if (deleted == 0) return Outcome::kDone;
  }
  return Outcome::kMoreToDo;
}

StoreTrimmer::Outcome StoreTrimmer::trimSize(const StoreBounds& bounds) {
  const Outcome outcome = deleteForSize(bounds.fileBytes());
  return outcome == Outcome::kDone ? vacuum(bounds.fileBytes()) : outcome;
}

StoreTrimmer::Outcome StoreTrimmer::deleteForSize(std::int64_t fileBytes) {
  // The space that is freed at once lasts for a while: it is a 32nd of the file.
  const std::int64_t high = fileBytes - fileBytes / 32;
  const std::int64_t low = high - fileBytes / 32;
  for (int round = 0; round < kRoundsPerSlice; ++round) {
    if (!measure()) return Outcome::kFailed;
    const std::int64_t used = (pages_ - freePages_) * pageBytes_;
    shrinking_ = used > (shrinking_ ? low : high);
    if (!shrinking_) return Outcome::kDone;
    const std::optional<bool> hasEmptied = emptyNewest(low);
    if (!hasEmptied) return Outcome::kFailed;
    if (*hasEmptied) continue;
    // A row takes less than twice its bytes in pages, so half of the excess is never too much.
    const std::int64_t deleted = deleteOldest(std::clamp((used - low) / 2, pageBytes_, kBytesPerRound));
    if (deleted < 0) return Outcome::kFailed;
    if (deleted == 0) return Outcome::kDone;  // no row is left to delete
  }
  return Outcome::kMoreToDo;
}

StoreTrimmer::Outcome StoreTrimmer::vacuum(std::int64_t fileBytes) {
  if (!measure()) return Outcome::kFailed;
  // Moving pages costs writes. So free pages stay for new rows, unless the file is too large or mostly empty.
  const std::int64_t spare = std::max(pages_ / 4, kSpareFreePages);
  const std::int64_t over = pages_ - fileBytes / pageBytes_;
  const std::int64_t wanted = std::min(freePages_, std::max(freePages_ - spare, over));
  if (wanted <= 0) return Outcome::kDone;
  const std::int64_t pages = std::min(wanted, kVacuumPages);
  if (!database_.run("PRAGMA incremental_vacuum(" + std::to_string(pages) + ")")) return Outcome::kFailed;
  if (pages < wanted) return Outcome::kMoreToDo;
  // Only a checkpoint makes the file itself shorter. When a reader prevents it, SQLite makes one later; its
  // failure is therefore ignored.
  (void)database_.run("PRAGMA wal_checkpoint(PASSIVE)");
  return Outcome::kDone;
}

bool StoreTrimmer::measure() {
  if (pageBytes_ == 0) pageBytes_ = database_.number("PRAGMA page_size").value_or(0);
  const auto pages = countPages_.firstNumber();
  const auto freePages = countFreePages_.firstNumber();
  if (pageBytes_ == 0 || !pages || !freePages) return false;
  pages_ = *pages;
  freePages_ = *freePages;
  return true;
}

// Deletes, of the oldest chunk of every table, the rows that are not younger than `time`. Returns the number
// of rows, or a negative number on failure.
std::int64_t StoreTrimmer::deleteUpTo(double time) {
  std::int64_t deleted = 0;
  for (const StoreTable& table : kStoreTables) {
    SqliteStatement statement =
        database_.prepare("DELETE FROM " + std::string(table.name) + " WHERE " + std::string(table.time) +
                          " <= ?1 AND id IN (" + oldestChunk(table) + ")");
    statement.bind(1, time);
    if (!statement.run()) return -1;
    deleted += database_.changes();
  }
  return deleted;
}

// The newest row of a table stays, with the exception that oldestRows() names, and may be too large for the
// bound. Then this empties the largest of these rows, because deleting all others would not help. True when
// it emptied one; none on failure.
std::optional<bool> StoreTrimmer::emptyNewest(std::int64_t maxBytes) {
  std::int64_t sum = 0;
  std::int64_t largest = 0;
  std::string emptyLargest;
  for (const StoreTable& table : kStoreTables) {
    const std::string name(table.name);
    const std::string newest = " WHERE id = (SELECT max(id) FROM " + name + ")";
    std::string question = "SELECT ";
    question.append(table.bytes).append(" FROM ").append(name).append(newest);
    SqliteStatement select = database_.prepare(question);
    const SqliteStatement::Step step = select.step();
    if (step == SqliteStatement::Step::kFailed) return std::nullopt;
    if (step == SqliteStatement::Step::kDone) continue;
    const std::int64_t held = select.integer(0);
    sum += held;
    if (held <= largest) continue;
    largest = held;
    emptyLargest = "UPDATE ";
    emptyLargest.append(name).append(" SET ").append(table.empty).append(newest);
  }
  if (sum <= maxBytes) return false;
  return database_.run(emptyLargest) ? std::optional(true) : std::nullopt;
}

// Deletes the oldest rows of all tables until they come to `bytes` or a round is full. Returns the number of
// rows, or a negative number on failure.
std::int64_t StoreTrimmer::deleteOldest(std::int64_t bytes) {
  std::vector<OldestRows> tables;
  tables.reserve(kStoreTables.size());
  for (const StoreTable& table : kStoreTables) tables.emplace_back(database_, table);
  std::array<std::int64_t, kStoreTables.size()> ends{};
  for (int row = 0; row < kRowsPerRound && bytes > 0; ++row) {
    OldestRows* oldest = oldestOf(tables);
    if (oldest == nullptr) break;
    bytes -= oldest->pass();
  }
  if (std::any_of(tables.begin(), tables.end(), [](const OldestRows& table) { return table.hasFailed(); })) {
    return -1;
  }
  std::transform(tables.begin(), tables.end(), ends.begin(),
                 [](const OldestRows& table) { return table.passed(); });
  tables.clear();  // ends their reads before the rows are deleted

  std::int64_t deleted = 0;
  for (std::size_t at = 0; at < ends.size(); ++at) {
    if (ends[at] == 0) continue;
    SqliteStatement statement =
        database_.prepare("DELETE FROM " + std::string(kStoreTables[at].name) + " WHERE id <= ?1");
    statement.bind(1, ends[at]);
    if (!statement.run()) return -1;
    deleted += database_.changes();
  }
  return deleted;
}

}  // namespace tonewerk
