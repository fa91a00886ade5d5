// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/AnalyticsTable.h"

#include <string>

#include "platform/linux/store/StoreSchema.h"
#include "protocol/EventTexts.h"

namespace tonewerk {

static_assert(kStoreNamesPerRow == 2, "an event has two names at most");

namespace {

// What the columns of a name say of a message. Nothing of another event.
struct KindTexts {
  explicit KindTexts(const EventKind& kind) {
    if (kind.source == EventSource::kUnknown) return;
    category = TWReportingUtilityCategoryString(kind.category);
    type = TWReportingUtilityTypeString(kind.type);
    source = kind.source == EventSource::kClient ? "client" : "derived";
  }

  // Binds three parameters from `first` on.
  void bind(SqliteStatement& statement, int first) const {
    if (source.empty()) return;
    statement.bind(first, category);
    statement.bind(first + 1, type);
    statement.bind(first + 2, source);
  }

  std::string category;
  std::string type;
  std::string source;
};

}  // namespace

AnalyticsTable::AnalyticsTable(SqliteDatabase& database) : database_(database) {
  database.addRows("new_analytics_row", 10, *this);
  const std::string columns =
      "recorded_at, name_set, payload, rtc_session, rtc_bits, user_id, session, began_at, ended_at";
  const std::string values = "c1, c2, c3, c4, c5, c6, c7, c8, c9 FROM new_analytics_row";
  insertRows_ = database.prepare("INSERT INTO analytics_row (id, " + columns + ") SELECT c0, " + values);
  insertNextRows_ = database.prepare("INSERT INTO analytics_row (" + columns + ") SELECT " + values);
}

bool AnalyticsTable::insert(const StoreBatch& batch, const StoreNumbering& numbering) {
  if (batch.analytics().empty()) return true;
  batchSets_.clear();
  for (const EventKind& kind : batch.kinds()) {
    const std::optional<std::int64_t> set = nameSet(kind);
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
      return cell.set(batchSets_[event.kind]);
    case 3:
      return cell.set(batch_->text(event.payload));
    case 4:
      if (event.rtc) cell.set(batch_->sessions()[event.rtc->session]->place.identifier);
      return;
    case 5:
      if (event.rtc) cell.set(rtcBits(event.rtc->category, event.rtc->type, event.rtc->hidden));
      return;
    case 6:
      return cell.setUser(event.user);
    case 7:
      if (event.life != StoreBatch::kNone) cell.set(batch_->lives()[event.life]->place.identifier);
      return;
    case 8:
      if (event.stretch != StoreBatch::kNone) cell.set(batch_->stretches()[event.stretch].began);
      return;
    default:
      if (event.stretch != StoreBatch::kNone) cell.set(batch_->stretches()[event.stretch].ended);
      return;
  }
}

std::optional<std::int64_t> AnalyticsTable::nameSet(const EventKind& kind) {
  const auto known = known_.find(kind);
  if (known != known_.end()) return known->second;
  bool failed = false;
  std::optional<std::int64_t> found = findNameSet(kind, failed);
  if (failed) return std::nullopt;
  if (!found) found = insertNameSet(kind);
  if (!found) return std::nullopt;
  if (known_.size() >= kMaxKnown) known_.clear();
  known_.emplace(kind, *found);
  return found;
}

std::optional<std::int64_t> AnalyticsTable::findNameSet(const EventKind& kind, bool& failed) {
  SqliteStatement find = database_.prepare(
      "SELECT a.name_set FROM analytics_name AS a"
      " LEFT JOIN analytics_name AS b ON b.name_set = a.name_set AND b.position = 1"
      " WHERE a.name = ?1 AND a.position = 0 AND b.name IS ?2"
      " AND a.category IS ?3 AND a.type IS ?4 AND a.source IS ?5");
  const KindTexts texts(kind);
  find.bind(1, kind.names.first.view());
  if (!kind.names.second.empty()) find.bind(2, kind.names.second.view());
  texts.bind(find, 3);
  const SqliteStatement::Step step = find.step();
  failed = step == SqliteStatement::Step::kFailed;
  if (step != SqliteStatement::Step::kRow) return std::nullopt;
  return find.integer(0);
}

std::optional<std::int64_t> AnalyticsTable::insertNameSet(const EventKind& kind) {
  const std::optional<std::int64_t> set =
      database_.number("SELECT coalesce(max(name_set), 0) + 1 FROM analytics_name");
  if (!set) return std::nullopt;
  SqliteStatement insert = database_.prepare(
      "INSERT INTO analytics_name (name_set, position, name, category, type, source)"
      " VALUES (?1, ?2, ?3, ?4, ?5, ?6)");
  const KindTexts texts(kind);
  std::int64_t position = 0;
  for (const SharedString* name : {&kind.names.first, &kind.names.second}) {
    if (position > 0 && name->empty()) break;
    insert.bind(1, *set);
    insert.bind(2, position++);
    insert.bind(3, name->view());
    texts.bind(insert, 4);
    if (!insert.run()) return std::nullopt;
  }
  return set;
}

}  // namespace tonewerk
