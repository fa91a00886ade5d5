// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreTrimmer.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstddef>
#include <queue>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kMinWalBytes = 256 << 10;
constexpr std::int64_t kMaxWalBytes = 8 << 20;

// The number of rows of a table that one statement deletes for their age.
constexpr std::int64_t kChunkRows = 500;
// The number of bytes that one round deletes for their size, and of the rows or bytes that it looks at.
constexpr std::int64_t kBytesPerRound = 2 << 20;
constexpr int kLookedRowsPerRound = 6000;
constexpr std::int64_t kLookedBytesPerRound = 6 << 20;
constexpr int kRoundsPerSlice = 16;
// The number of pages that a slice gives back.
constexpr std::int64_t kVacuumPages = 512;
// At least this many free pages stay for new rows, unless the file is too large.
constexpr std::int64_t kSpareFreePages = 64;
// Rows of more bytes have pages of their own.
constexpr std::int64_t kSmallRowBytes = 4096;

// What rows must fulfil to be deleted.
std::string conditionOf(const StoreTable& table) {
  return table.name == "session_row" ? " AND ended_at IS NOT NULL" : "";
}

// Orders by identifier, which changes of the clock do not affect. The newest row stays, so that its
// identifier is not used again: a reader that continues after the last row it saw misses none. That of
// rtc_row may go when an analytics row has a higher identifier, because new messages are numbered above both.
// The row of a session that runs stays, too: its end completes the row. When others are deleted for the size
// meanwhile, it is later deleted for its age only. A daemon's start ends the rows that an earlier one left.
std::string oldestRows(const StoreTable& table, const std::string& columns) {
  const std::string name(table.name);
  std::string newest = "(SELECT max(id) FROM " + name + ")";
  if (name == "rtc_row") newest = "max(" + newest + ", coalesce((SELECT max(id) FROM analytics_row), 0))";
  return "SELECT " + columns + " FROM " + name + " WHERE id >= ?1 AND id < " + newest + conditionOf(table) +
         " ORDER BY id";
}

std::string oldestChunk(const StoreTable& table) {
  return oldestRows(table, "id") + " LIMIT " + std::to_string(kChunkRows);
}

// What a round may still look at.
struct RoundBudget {
  int rows = kLookedRowsPerRound;
  std::int64_t bytes = kLookedBytesPerRound;

  bool isUsedUp() const { return rows <= 0 || bytes <= 0; }
  void use(std::int64_t rowBytes) {
    --rows;
    bytes -= rowBytes;
  }
};

// For each mark of age, from the oldest on, the newest rows that it or an older one covers.
using CoveredRows = std::vector<StoreRowIds>;

std::optional<CoveredRows> readCoveredRows(SqliteDatabase& database) {
  std::string sql = "SELECT ";
  for (const StoreTable& table : kStoreTables) sql.append(table.name).append(", ");
  SqliteStatement select = database.prepare(sql + "age FROM age_mark ORDER BY age");
  CoveredRows covered;
  SqliteStatement::Step step = SqliteStatement::Step::kDone;
  while ((step = select.step()) == SqliteStatement::Step::kRow) {
    StoreRowIds rows = covered.empty() ? StoreRowIds{} : covered.back();
    for (std::size_t table = 0; table < rows.size(); ++table) {
      rows[table] = std::max(rows[table], select.integer(static_cast<int>(table)));
    }
    covered.push_back(rows);
  }
  if (step == SqliteStatement::Step::kFailed) return std::nullopt;
  return covered;
}

// Walks through the rows of one user in one table, from the oldest on. The rows of other users between them
// are looked at, too, because there is no index by user: it would cost every commit another page.
class OldestRows {
 public:
  // `newest` is the highest identifier of the table, which is the one at `place` of kStoreTables. `covered`
  // outlives it.
  OldestRows(SqliteDatabase& database, std::size_t place, std::uint32_t user, std::int64_t from,
             std::int64_t newest, const CoveredRows& covered)
      : user_(user), place_(place), covered_(&covered), from_(from) {
    const StoreTable& table = kStoreTables[place];
    if (from > newest) return;
    select_ = database.prepare(
        oldestRows(table, "id, " + std::string(table.time) + ", " + std::string(table.bytes) + ", user_id"));
    select_.bind(1, from);
    step();
  }

  // Goes on to a row of the user. False when the budget is used up before.
  bool find(RoundBudget& budget) {
    while (at_ == SqliteStatement::Step::kRow && userOf(select_, 3) != user_) {
      if (budget.isUsedUp()) return false;
      budget.use(bytes());
      hasPassedOthers_ = passed_ != 0;
      step();
    }
    return true;
  }
  bool hasFailed() const { return at_ == SqliteStatement::Step::kFailed; }
  bool hasRow() const { return at_ == SqliteStatement::Step::kRow; }
  // The wall clock may jump, so the marks of age decide. Times order only what no mark separates.
  bool isOlderThan(const OldestRows& other) const {
    return mark_ != other.mark_ ? mark_ < other.mark_ : time() < other.time();
  }

  // Moves to the next row of any user, and marks the current one for deletion. Returns the bytes that the
  // current row counts.
  std::int64_t pass(RoundBudget& budget) {
    const std::int64_t passedBytes = bytes();
    budget.use(passedBytes);
    passed_ = select_.integer(0);
    if (first_ == 0) first_ = passed_;
    areOthersBetween_ = areOthersBetween_ || hasPassedOthers_;
    step();
    return passedBytes;
  }
  // The identifiers of the first and of the last marked row; 0 when there is none.
  std::int64_t first() const { return first_; }
  std::int64_t passed() const { return passed_; }
  // Whether rows of other users are between these.
  bool areOthersBetween() const { return areOthersBetween_; }
  // No row of the user that is not marked has a lower identifier.
  std::int64_t from() const { return from_; }

 private:
  double time() const { return select_.number(1); }
  std::int64_t bytes() const { return select_.integer(2) + kStoreRowBytes; }
  void step() {
    if (at_ == SqliteStatement::Step::kRow) from_ = select_.integer(0) + 1;
    at_ = select_.step();
    if (at_ != SqliteStatement::Step::kRow) return;
    while (mark_ < covered_->size() && (*covered_)[mark_][place_] < select_.integer(0)) ++mark_;
  }

  const std::uint32_t user_;
  const std::size_t place_;
  const CoveredRows* const covered_;
  std::size_t mark_ = 0;  // the first one that covers the row
  std::int64_t from_;
  SqliteStatement select_;
  SqliteStatement::Step at_ = SqliteStatement::Step::kDone;
  std::int64_t first_ = 0;
  std::int64_t passed_ = 0;
  bool hasPassedOthers_ = false;
  bool areOthersBetween_ = false;
};

// The highest identifiers of kStoreTables.
using NewestIds = std::array<std::int64_t, kStoreTables.size()>;

// A user whose oldest rows are deleted in one round.
class OldestRowsOfUser {
 public:
  OldestRowsOfUser(SqliteDatabase& database, StoreHolding& holding, const NewestIds& newest,
                   const CoveredRows& covered)
      : holding_(&holding), left_(holding.bytes) {
    tables_.reserve(kStoreTables.size());
    for (std::size_t at = 0; at < kStoreTables.size(); ++at) {
      tables_.emplace_back(database, at, holding.user, holding.from[at], newest[at], covered);
    }
  }

  const StoreHolding& holding() const { return *holding_; }
  // What is left to the user after the marked rows.
  std::int64_t left() const { return left_; }
  // Whether no more of the user's rows can be deleted.
  bool isDone() const { return isDone_; }

  // Marks the oldest row of all tables for deletion, and returns what it counts. 0 when the budget is used up
  // before, and when no row is left, which isDone() then says.
  std::int64_t pass(RoundBudget& budget) {
    OldestRows* oldest = nullptr;
    for (OldestRows& table : tables_) {
      if (!table.find(budget)) return 0;
      if (table.hasRow() && (oldest == nullptr || table.isOlderThan(*oldest))) oldest = &table;
    }
    isDone_ = oldest == nullptr;
    if (isDone_ || budget.isUsedUp()) return 0;
    const std::int64_t bytes = oldest->pass(budget);
    left_ -= bytes;
    return bytes;
  }
  bool hasFailed() const {
    return std::any_of(tables_.begin(), tables_.end(),
                       [](const OldestRows& table) { return table.hasFailed(); });
  }

  struct Marked {
    RowRange rows;
    bool areOthersBetween = false;  // rows of other users, which stay or are marked, too
  };
  // Ends the reads, so that rows can be deleted, and keeps the result.
  void endReads() {
    for (std::size_t at = 0; at < marked_.size(); ++at) {
      const OldestRows& table = tables_[at];
      marked_[at] = {{table.first(), table.passed()}, table.areOthersBetween()};
      from_[at] = table.from();
    }
    tables_.clear();
  }
  // After endReads(): the marked rows are not the user's any more.
  void reduceHolding() {
    holding_->from = from_;
    holding_->bytes = std::max<std::int64_t>(0, left_);
  }
  // After endReads(): the marked rows of each table.
  const std::array<Marked, kStoreTables.size()>& marked() const { return marked_; }

 private:
  StoreHolding* holding_;
  std::int64_t left_;
  bool isDone_ = false;
  std::array<std::int64_t, kStoreTables.size()> from_{};
  std::vector<OldestRows> tables_;
  std::array<Marked, kStoreTables.size()> marked_;
};

// Joins ranges that overlap.
std::vector<RowRange> joined(std::vector<RowRange> ranges) {
  std::sort(ranges.begin(), ranges.end(),
            [](const RowRange& a, const RowRange& b) { return a.first < b.first; });
  std::vector<RowRange> found;
  for (const RowRange& range : ranges) {
    if (found.empty() || range.first > found.back().last) {
      found.push_back(range);
    } else {
      found.back().last = std::max(found.back().last, range.last);
    }
  }
  return found;
}

}  // namespace

std::int64_t StoreBounds::walBytes() const { return std::clamp(bytes / 8, kMinWalBytes, kMaxWalBytes); }

StoreTrimmer::StoreTrimmer(SqliteDatabase& database, StoreHoldings& holdings, const Clock& clock)
    : database_(database),
      holdings_(holdings),
      clock_(clock),
      countPages_(database.prepare("PRAGMA page_count")),
      countFreePages_(database.prepare("PRAGMA freelist_count")) {
  for (std::size_t at = 0; at < newestIds_.size(); ++at) {
    newestIds_[at] =
        database.prepare("SELECT coalesce(max(id), 0) FROM " + std::string(kStoreTables[at].name));
  }
}

StoreTrimmer::Outcome StoreTrimmer::trimAge(const StoreRowIds& old) {
  const std::chrono::nanoseconds end = clock_.monotonic() + kSliceTime;
  for (int round = 0; round < kRoundsPerSlice; ++round) {
    const std::int64_t deleted = deleteUpTo(old);
    if (deleted < 0) return Outcome::kFailed;
    if (deleted == 0) return Outcome::kDone;
    if (clock_.monotonic() >= end) break;
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
  const std::chrono::nanoseconds end = clock_.monotonic() + kSliceTime;
  std::int64_t usedBefore = 0;
  for (int round = 0; round < kRoundsPerSlice; ++round) {
    if (!measure()) return Outcome::kFailed;
    const std::int64_t used = (pages_ - freePages_) * pageBytes_;
    shrinking_ = used > (shrinking_ ? low : high);
    if (!shrinking_) return Outcome::kDone;
    if (round == 0) usedBefore = used;
    const bool mayEnd = round > 0 && (used <= fileBytes || usedBefore - used >= kLeastPerSlice);
    if (mayEnd && clock_.monotonic() >= end) break;
    const std::optional<bool> hasEmptied = emptyNewest(low);
    if (!hasEmptied) return Outcome::kFailed;
    if (*hasEmptied) continue;
    // A row takes less than twice its bytes in pages, so half of the excess is never too much.
    const std::int64_t looked = deleteOldest(std::clamp((used - low) / 2, pageBytes_, kBytesPerRound));
    if (looked < 0) return Outcome::kFailed;
    if (looked == 0) return Outcome::kDone;  // no row is left to delete
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

bool StoreTrimmer::begin() {
  holdings_.begin();
  return database_.run("BEGIN IMMEDIATE");
}

bool StoreTrimmer::commit() {
  if (!database_.run("COMMIT")) return false;
  holdings_.commit();
  return true;
}

// Deletes, of the oldest chunk of every table, the rows up to that of `old`. Returns the number of rows, or a
// negative number on failure.
std::int64_t StoreTrimmer::deleteUpTo(const StoreRowIds& old) {
  if (!begin()) return -1;
  std::int64_t deleted = 0;
  for (std::size_t at = 0; at < old.size(); ++at) {
    const StoreTable& table = kStoreTables[at];
    SqliteStatement statement =
        database_.prepare("DELETE FROM " + std::string(table.name) + " WHERE id <= ?2 AND id IN (" +
                          oldestChunk(table) + ") RETURNING user_id, " + std::string(table.bytes));
    statement.bind(1, std::int64_t{0});
    statement.bind(2, old[at]);
    SqliteStatement::Step step = SqliteStatement::Step::kDone;
    while ((step = statement.step()) == SqliteStatement::Step::kRow) {
      holdings_.removeRow(userOf(statement, 0), statement.integer(1));
      ++deleted;
    }
    if (step == SqliteStatement::Step::kFailed) return -1;
  }
  return commit() ? deleted : -1;
}

// The newest row of a table stays, with the exception that oldestRows() names, and may be too large for the
// bound. Then this empties the largest of these rows, because deleting all others would not help. True when
// it emptied one; none on failure.
std::optional<bool> StoreTrimmer::emptyNewest(std::int64_t maxBytes) {
  std::int64_t sum = 0;
  std::int64_t largest = 0;
  std::uint32_t user = kNoUser;
  std::string emptyLargest;
  for (const StoreTable& table : kStoreTables) {
    const std::string name(table.name);
    const std::string newest = " WHERE id = (SELECT max(id) FROM " + name + ")";
    std::string question = "SELECT ";
    question.append(table.bytes).append(", user_id FROM ").append(name).append(newest);
    SqliteStatement select = database_.prepare(question);
    const SqliteStatement::Step step = select.step();
    if (step == SqliteStatement::Step::kFailed) return std::nullopt;
    if (step == SqliteStatement::Step::kDone) continue;
    const std::int64_t held = select.integer(0);
    sum += held;
    if (held <= largest) continue;
    largest = held;
    user = userOf(select, 1);
    emptyLargest = "UPDATE ";
    emptyLargest.append(name).append(" SET ").append(table.empty).append(newest);
    emptyLargest.append(" RETURNING ").append(table.bytes);
  }
  if (sum <= maxBytes) return false;
  SqliteStatement update = database_.prepare(emptyLargest);
  if (update.step() != SqliteStatement::Step::kRow) return std::nullopt;
  const std::int64_t left = update.integer(0);
  if (update.step() != SqliteStatement::Step::kDone) return std::nullopt;
  holdings_.removeRow(user, largest);
  holdings_.addRow(user, left);
  return true;
}

// Deletes the oldest rows of all tables until they come to `bytes` or a round is full; always those of the
// user who then holds the most. Returns the number of rows that it has looked at, or a negative number on
// failure.
std::int64_t StoreTrimmer::deleteOldest(std::int64_t bytes) {
  NewestIds newest{};
  for (std::size_t at = 0; at < newest.size(); ++at) {
    const auto found = newestIds_[at].firstNumber();
    if (!found) return -1;
    newest[at] = *found;
  }
  const std::optional<CoveredRows> covered = readCoveredRows(database_);
  if (!covered) return -1;
  // Those without a number in `users` have lost nothing in this round.
  struct Candidate {
    std::int64_t left;
    std::size_t holding;
    std::size_t user;
    // Of those who hold the same, the first one comes first.
    bool operator<(const Candidate& other) const {
      return left != other.left ? left < other.left : holding > other.holding;
    }
  };
  constexpr std::size_t kNotYet = static_cast<std::size_t>(-1);
  std::priority_queue<Candidate> candidates;
  const std::span<StoreHolding> all = holdings_.all();
  for (std::size_t at = 0; at < all.size(); ++at) {
    if (all[at].bytes > 0) candidates.push({all[at].bytes, at, kNotYet});
  }
  std::vector<OldestRowsOfUser> users;
  RoundBudget budget;
  while (bytes > 0 && !budget.isUsedUp() && !candidates.empty()) {
    Candidate candidate = candidates.top();
    candidates.pop();
    if (candidate.user == kNotYet) {
      candidate.user = users.size();
      users.emplace_back(database_, all[candidate.holding], newest, *covered);
    }
    OldestRowsOfUser& largest = users[candidate.user];
    const std::int64_t second = candidates.empty() ? 0 : candidates.top().left;
    while (bytes > 0 && largest.left() >= second) {
      const std::int64_t passed = largest.pass(budget);
      if (passed == 0) break;
      bytes -= passed;
    }
    candidate.left = largest.left();
    if (!largest.isDone() && candidate.left > 0) candidates.push(candidate);
  }
  if (std::any_of(users.begin(), users.end(),
                  [](const OldestRowsOfUser& user) { return user.hasFailed(); })) {
    return -1;
  }
  // All reads end before the first row is deleted.
  for (OldestRowsOfUser& user : users) user.endReads();
  if (!begin()) return -1;
  for (OldestRowsOfUser& user : users) user.reduceHolding();
  for (std::size_t at = 0; at < kStoreTables.size(); ++at) {
    std::vector<RowRange> mixed;
    for (const OldestRowsOfUser& user : users) {
      const OldestRowsOfUser::Marked& marked = user.marked()[at];
      if (marked.rows.first == 0) continue;
      if (!deleteRows(kStoreTables[at], user.holding().user, marked.rows)) return -1;
      if (marked.areOthersBetween) mixed.push_back(marked.rows);
    }
    for (const RowRange& range : joined(std::move(mixed))) {
      if (!closeGaps(kStoreTables[at], range)) return -1;
    }
  }
  return commit() ? kLookedRowsPerRound - budget.rows : -1;
}

bool StoreTrimmer::deleteRows(const StoreTable& table, std::uint32_t user, const RowRange& rows) {
  SqliteStatement statement =
      database_.prepare("DELETE FROM " + std::string(table.name) +
                        " WHERE id BETWEEN ?1 AND ?2 AND user_id IS ?3" + conditionOf(table));
  statement.bind(1, rows.first);
  statement.bind(2, rows.last);
  statement.bindUser(3, user);
  return statement.run();
}

// Deleting rows between those of others leaves pages that are half empty, and SQLite joins pages only when
// two thirds of them are empty. The others' rows would then take up to three times their bytes and, although
// few, the room of everybody. So they are written again, close together. Each row is written again at most
// once for each other user. Within a transaction.
bool StoreTrimmer::closeGaps(const StoreTable& table, const RowRange& rows) {
  const std::string name = "main." + std::string(table.name);
  const std::string kept = "temp.kept_" + std::string(table.name);
  const std::string isMoved =
      " WHERE id BETWEEN ?1 AND ?2 AND " + std::string(table.bytes) + " < " + std::to_string(kSmallRowBytes);
  if (!database_.run("CREATE TABLE IF NOT EXISTS " + kept + " AS SELECT * FROM " + name + " WHERE false")) {
    return false;
  }
  SqliteStatement copy =
      database_.prepare("INSERT INTO " + kept + " SELECT * FROM " + name + isMoved + " ORDER BY id");
  copy.bind(1, rows.first);
  copy.bind(2, rows.last);
  if (!copy.run()) return false;
  if (database_.changes() == 0) return true;
  SqliteStatement remove = database_.prepare("DELETE FROM " + name + isMoved);
  remove.bind(1, rows.first);
  remove.bind(2, rows.last);
  return remove.run() &&
         database_.run("INSERT INTO " + name + " SELECT * FROM " + kept + "; DELETE FROM " + kept);
}

}  // namespace tonewerk
