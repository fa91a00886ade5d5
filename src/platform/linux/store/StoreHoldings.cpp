// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreHoldings.h"

#include <algorithm>
#include <optional>
#include <span>
#include <string>

namespace tonewerk {

std::uint32_t userOf(const SqliteStatement& row, int column) {
  return row.isNull(column) ? kNoUser : static_cast<std::uint32_t>(row.integer(column));
}

// The sums are made here: SQLite would sort the rows by user, payloads included.
bool StoreHoldings::read() {
  if (hasRead_) return true;
  forget();
  for (std::size_t table = 0; table < kStoreTables.size(); ++table) {
    std::string sql = "SELECT id, user_id, ";
    sql.append(kStoreTables[table].bytes).append(" FROM ").append(kStoreTables[table].name);
    SqliteStatement select = database_.prepare(sql + " ORDER BY id");
    SqliteStatement::Step step = SqliteStatement::Step::kDone;
    while ((step = select.step()) == SqliteStatement::Step::kRow) {
      const std::uint32_t user = userOf(select, 1);
      std::size_t at = indexOf(user);
      if (at == kNone) {
        at = holdings_.size();
        append({.user = user});
      }
      holdings_[at].bytes += select.integer(2) + kStoreRowBytes;
      if (holdings_[at].from[table] == 0) holdings_[at].from[table] = select.integer(0);
    }
    if (step == SqliteStatement::Step::kFailed) return false;
    // A user's first row of this table comes after those that are there.
    const std::optional<std::int64_t> newest =
        database_.number("SELECT coalesce(max(id), 0) FROM " + std::string(kStoreTables[table].name));
    if (!newest) return false;
    for (StoreHolding& holding : holdings_) {
      if (holding.from[table] == 0) holding.from[table] = *newest + 1;
    }
  }
  hasRead_ = true;
  return true;
}

void StoreHoldings::forget() {
  holdings_.clear();
  indices_.clear();
  hasRead_ = false;
  isInTransaction_ = false;
}

void StoreHoldings::begin() {
  atBegin_ = holdings_;
  isInTransaction_ = true;
}

void StoreHoldings::undo() {
  if (!isInTransaction_) return;
  isInTransaction_ = false;
  for (std::size_t at = atBegin_.size(); at < holdings_.size(); ++at) indices_.erase(holdings_[at].user);
  holdings_.swap(atBegin_);
}

bool StoreHoldings::add(const StoreBatch& batch) {
  if (!hasRead_) return true;
  const auto addAll = [this](const auto& rows, const auto& part) {
    for (const auto& row : rows) {
      StoreHolding* const holding = holdingOf(row.user);
      if (holding == nullptr) return false;
      holding->bytes += static_cast<std::int64_t>(part(row).size) + kStoreRowBytes;
    }
    return true;
  };
  const auto payload = [](const auto& row) { return row.payload; };
  const auto haveHoldings = [this](std::span<const std::uint32_t> users) {
    return std::all_of(users.begin(), users.end(),
                       [this](std::uint32_t user) { return holdingOf(user) != nullptr; });
  };
  return haveHoldings(batch.lifeUsers()) && haveHoldings(batch.sessionUsers()) &&
         addAll(batch.analytics(), payload) && addAll(batch.power(), payload) &&
         addAll(batch.rtcMessages(), payload) &&
         addAll(batch.metrics(), [](const StoreBatch::Metric& row) { return row.record; }) &&
         addAll(batch.sendings(), [](const StoreBatch::Sending& row) {
           return StoreBatch::Part{row.endpoint.begin, row.endpoint.size + row.problem.size};
         });
}

void StoreHoldings::addRow(std::uint32_t user, std::int64_t bytes) {
  const std::size_t at = indexOf(user);
  if (at != kNone) holdings_[at].bytes += bytes + kStoreRowBytes;
}

void StoreHoldings::removeRow(std::uint32_t user, std::int64_t bytes) {
  const std::size_t at = indexOf(user);
  if (at != kNone)
    holdings_[at].bytes = std::max<std::int64_t>(0, holdings_[at].bytes - bytes - kStoreRowBytes);
}

std::int64_t StoreHoldings::of(std::uint32_t user) const {
  const std::size_t at = indexOf(user);
  return at == kNone ? 0 : holdings_[at].bytes;
}

std::size_t StoreHoldings::indexOf(std::uint32_t user) const {
  if (lastFound_ < holdings_.size() && holdings_[lastFound_].user == user) return lastFound_;
  const auto found = indices_.find(user);
  if (found == indices_.end()) return kNone;
  return lastFound_ = found->second;
}

StoreHolding* StoreHoldings::holdingOf(std::uint32_t user) {
  const std::size_t at = indexOf(user);
  if (at != kNone) return &holdings_[at];
  StoreHolding made{.user = user};
  for (std::size_t table = 0; table < kStoreTables.size(); ++table) {
    const std::optional<std::int64_t> newest =
        database_.number("SELECT coalesce(max(id), 0) FROM " + std::string(kStoreTables[table].name));
    if (!newest) return nullptr;
    made.from[table] = *newest + 1;
  }
  return &append(made);
}

StoreHolding& StoreHoldings::append(const StoreHolding& holding) {
  indices_.emplace(holding.user, holdings_.size());
  return holdings_.emplace_back(holding);
}

}  // namespace tonewerk
