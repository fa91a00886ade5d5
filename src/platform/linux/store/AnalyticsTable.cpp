// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/AnalyticsTable.h"

#include <string>

#include "platform/JsonService.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {

static_assert(kStoreNamesPerRow == 2, "an event has two names at most");

AnalyticsTable::AnalyticsTable(SqliteDatabase& database, const JsonService& json)
    : database_(database),
      json_(json),
      insertRow_(database.prepare(
          "INSERT INTO analytics_row (recorded_at, name_set, payload) VALUES (?1, ?2, ?3)")) {}

bool AnalyticsTable::insert(const AnalyticsRow& row) {
  const std::optional<std::int64_t> names = nameSet(row.names);
  if (!names) return false;
  const std::string payload = json_.compact(row.payload);
  insertRow_.bind(1, row.recordedAt);
  insertRow_.bind(2, *names);
  insertRow_.bind(3, payload);
  return insertRow_.run();
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
