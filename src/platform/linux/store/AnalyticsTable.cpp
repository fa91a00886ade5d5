// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/AnalyticsTable.h"

#include <string>

#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {

static_assert(kStoreNamesPerRow == 2, "an event has two names at most");

AnalyticsTable::AnalyticsTable(SqliteDatabase& database) : database_(database) {
  database.addRows("new_analytics_row", 7, *this);
  const std::string columns = "recorded_at, name_set, payload, rtc_session, rtc_bits, user_id";
  const std::string values = "c1, c2, c3, c4, c5, c6 FROM new_analytics_row";
  insertRows_ = database.prepare("INSERT INTO analytics_row (id, " + columns + ") SELECT c0, " + values);
  insertNextRows_ = database.prepare("INSERT INTO analytics_row (" + columns + ") SELECT " + values);
}

bool AnalyticsTable::insert(const StoreBatch& batch, const StoreNumbering& numbering) {
  if (batch.analytics().empty()) return true;
  batchSets_.clear();
  for (const EventNames& names : batch.names()) {
    const std::optional<std::int64_t> set = nameSet(names);
    if (!set) return false;
    batchSets_.push_back(*set);
  }
  batch_ = &batch;
  identifiers_ = numbering.analytics();
  const bool inserted = (numbering.analyticsAreNext() ? insertNextRows_ : insertRows_).run();
  batch_ = nullptr;
  return inserted;
}

std::size_t AnalyticsTable::rowCount() const { return batch_ == nullptr ? 0 : batch_->analytics().size(); }

void AnalyticsTable::read(std::size_t row, int column, SqliteCell& cell) const {
  const StoreBatch::Analytics& event = batch_->analytics()[row];
  switch (column) {
    case 0:
      return cell.set(identifiers_[row]);
    case 1:
      return cell.set(event.recordedAt);
    case 2:
      return cell.set(batchSets_[event.names]);
    case 3:
      return cell.set(batch_->text(event.payload));
    case 4:
      if (event.rtc) cell.set(batch_->sessions()[event.rtc->session]->place.identifier);
      return;
    case 5:
      if (event.rtc) cell.set(rtcBits(event.rtc->category, event.rtc->type, event.rtc->hidden));
      return;
    default:
      return cell.setUser(event.user);
  }
}

std::optional<std::int64_t> AnalyticsTable::nameSet(const EventNames& names) {
  const auto known = known_.find(names);
  if (known != known_.end()) return known->second;
  bool failed = false;
  std::optional<std::int64_t> found = findNameSet(names, failed);
  if (failed) return std::nullopt;
  if (!found) found = insertNameSet(names);
  if (!found) return std::nullopt;
  if (known_.size() >= kMaxKnown) known_.clear();
  known_.emplace(names, *found);
  return found;
}

std::optional<std::int64_t> AnalyticsTable::findNameSet(const EventNames& names, bool& failed) {
  SqliteStatement find = database_.prepare(
      "SELECT a.name_set FROM analytics_name AS a"
      " LEFT JOIN analytics_name AS b ON b.name_set = a.name_set AND b.position = 1"
      " WHERE a.name = ?1 AND a.position = 0 AND b.name IS ?2");
  find.bind(1, names.first.view());
  if (!names.second.empty()) find.bind(2, names.second.view());
  const SqliteStatement::Step step = find.step();
  failed = step == SqliteStatement::Step::kFailed;
  if (step != SqliteStatement::Step::kRow) return std::nullopt;
  return find.integer(0);
}

std::optional<std::int64_t> AnalyticsTable::insertNameSet(const EventNames& names) {
  const std::optional<std::int64_t> set =
      database_.number("SELECT coalesce(max(name_set), 0) + 1 FROM analytics_name");
  if (!set) return std::nullopt;
  SqliteStatement insert =
      database_.prepare("INSERT INTO analytics_name (name_set, position, name) VALUES (?1, ?2, ?3)");
  std::int64_t position = 0;
  for (const SharedString* name : {&names.first, &names.second}) {
    if (position > 0 && name->empty()) break;
    insert.bind(1, *set);
    insert.bind(2, position++);
    insert.bind(3, name->view());
    if (!insert.run()) return std::nullopt;
  }
  return set;
}

}  // namespace tonewerk
