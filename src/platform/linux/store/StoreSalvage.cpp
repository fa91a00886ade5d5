// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreSalvage.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <string_view>
#include <system_error>

#include "platform/Heartbeat.h"
#include "platform/linux/store/StoreFloors.h"
#include "platform/linux/store/StoreMarks.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::chrono::milliseconds kPatience{500};

// For each of kStoreTables: the columns of every version, those that an earlier one lacks, and what must hold
// for a row that is copied.
struct SalvagedColumns {
  std::string_view always;
  std::array<std::string_view, 6> later;
  std::string_view condition;
};
constexpr std::array<SalvagedColumns, kStoreTables.size()> kColumns{{
    {"recorded_at, name_set, payload",
     {"user_id", "rtc_session", "rtc_bits", "session", "began_at", "ended_at"},
     "json_valid(payload)"},
    {"posted_at, identifier, record", {"user_id"}, "true"},
    {"recorded_at, event_group, name, payload", {"user_id"}, "json_valid(payload)"},
    {"started_at, session_info, user_info",
     {"user_id"},
     "json_valid(session_info) AND json_valid(user_info)"},
    {"sent_at, rtc_session, category, type, payload", {"user_id"}, "json_valid(payload)"},
    {"started_at, request, reporter_id, service, application, process, ended_at, ending, messages,"
     " redundant_messages, active_seconds, overloads",
     {"user_id"},
     "typeof(reporter_id) = 'integer'"},
    {"sent_at, endpoint, signal, records, bytes, first_event, last_event, status, outcome, rejected, problem",
     {"user_id"},
     "typeof(records) = 'integer' AND typeof(bytes) = 'integer'"},
}};

// The rest of an INSERT with so many values.
std::string parameters(int count) {
  std::string sql;
  for (int at = 1; at <= count; ++at) sql += (at > 1 ? ", ?" : "?") + std::to_string(at);
  return sql + ")";
}

}  // namespace

StoreSalvage::StoreSalvage(const std::string& damaged, const std::string& made) : path_(damaged) {
  isMade_ = made_.open(made, SqliteDatabase::Mode::kReadWrite, kPatience) && made_.run(storeFileSettings()) &&
            made_.run(storeSchema());
  if (!isMade_) problem_ = made_.problem();
  // A list of tables with a wrong entry is then read as far as it goes.
  if (isMade_ && damaged_.open(damaged, SqliteDatabase::Mode::kReadOnly, kPatience) &&
      damaged_.run("PRAGMA writable_schema = ON")) {
    if (made_.run("BEGIN") && copyAll() && made_.run("COMMIT")) {
      committedRows_ = rows_;
    } else {
      problem_ = made_.problem();
    }
  }
  damaged_.close();
  made_.close();
}

bool StoreSalvage::copyAll() {
  if (!copyNames()) return false;
  for (std::size_t table = 0; table < kStoreTables.size(); ++table) {
    if (!copyRows(table)) return false;
  }
  // New names must not get the numbers of lost ones, and the views show no event without a name.
  return copyAgeMarks() && copyFloors() && copyJournalMarks() &&
         made_.run(
             "INSERT INTO analytics_name (name_set, position, name)"
             " SELECT DISTINCT name_set, 0, 'unknown' FROM analytics_row"
             " WHERE name_set NOT IN (SELECT name_set FROM analytics_name)");
}

// The index has the names, too. It lacks what messages are, as the tables of earlier versions do.
bool StoreSalvage::copyNames() {
  if (!has("table", "analytics_name")) return true;
  const std::string columns = "name_set, position, name";
  const bool hasKinds = hasColumn("analytics_name", "source");
  Copied copied = copyTable("analytics_name", hasKinds ? columns + ", category, type, source" : columns,
                            hasKinds ? 6 : 3, " NOT INDEXED");
  if (copied == Copied::kSome && has("index", "analytics_name_by_name")) {
    copied = copyTable("analytics_name", columns, 3, " INDEXED BY analytics_name_by_name ORDER BY name");
  }
  return copied != Copied::kFailed && made_.run(storeKindsOfNames());
}

bool StoreSalvage::copyAgeMarks() {
  if (!has("table", "age_mark") || !has("table", "age_clock")) return true;
  std::string isWhole;
  std::string columns = "id, age, time_off";
  int count = 3;
  for (const StoreTable& table : kStoreTables) {
    if (!hasColumn("age_mark", table.name)) continue;  // a file of an earlier version
    columns.append(", ").append(table.name);
    ++count;
    isWhole.append(isWhole.empty() ? " WHERE " : " AND ").append(table.name);
    isWhole.append(" BETWEEN 0 AND ").append(std::to_string(kMaxIdentifier));
  }
  const Copied marks = copyTable("age_mark", columns, count, isWhole);
  const Copied clock = copyTable("age_clock", "id, age, wall, uptime", 4, "");
  if (marks == Copied::kFailed || clock == Copied::kFailed || !learnFromAgeMarks()) return false;
  if (marks == Copied::kAll && clock == Copied::kAll) return true;
  // Without any, they are made from the times of the rows.
  return made_.run("DELETE FROM age_mark; DELETE FROM age_clock");
}

bool StoreSalvage::learnFromAgeMarks() {
  for (std::size_t at = 0; at < highest_.size(); ++at) {
    std::string sql = "SELECT coalesce(max(";
    const auto marked = made_.number(sql.append(kStoreTables[at].name).append("), 0) FROM age_mark"));
    if (!marked) return false;
    highest_[at] = std::max(highest_[at], *marked);
  }
  return true;
}

bool StoreSalvage::copyFloors() {
  if (has("table", "row_floor")) {
    const std::string isWhole =
        " WHERE typeof(id) = 'integer' AND id BETWEEN 1 AND " + std::to_string(kMaxIdentifier);
    if (!made_.run(storeFloorTable()) || copyTable("row_floor", "name, id", 2, isWhole) == Copied::kFailed) {
      return false;
    }
  }
  for (std::size_t at = 0; at < highest_.size(); ++at) {
    const std::string name(kStoreTables[at].name);
    // What no mark knows was in the file: it has lost fewer rows than it has bytes.
    const std::int64_t floor = highest_[at] + (isEndLost_[at] ? damagedBytes() : 0);
    const auto newest = made_.number("SELECT coalesce(max(id), 0) FROM " + name);
    if (!newest) return false;
    if (floor <= *newest) continue;
    std::string set = "INSERT INTO row_floor (name, id) VALUES ('" + name + "', " + std::to_string(floor);
    set += ") ON CONFLICT (name) DO UPDATE SET id = max(id, excluded.id)";
    if (!made_.run(storeFloorTable()) || !made_.run(set)) return false;
  }
  return true;
}

std::int64_t StoreSalvage::damagedBytes() const {
  std::int64_t bytes = 0;
  for (const char* suffix : {"", "-wal"}) {
    std::error_code error;
    const std::uintmax_t size = std::filesystem::file_size(path_ + suffix, error);
    if (!error) bytes += static_cast<std::int64_t>(size);
  }
  return bytes;
}

// A user without a mark has its rows recorded again by a recovery. One whose mark is too high loses some.
bool StoreSalvage::copyJournalMarks() {
  if (!has("table", "journal_mark")) return true;
  const std::string isWhole =
      " WHERE user_id BETWEEN 0 AND 4294967295 AND typeof(sequence) = 'integer' AND sequence BETWEEN 1 AND " +
      std::to_string(kMaxIdentifier) + " AND typeof(row) = 'integer' AND row BETWEEN 0 AND 4294967295";
  return made_.run(storeMarkTable()) &&
         copyTable("journal_mark", "user_id, sequence, row", 3, isWhole) != Copied::kFailed;
}

StoreSalvage::Copied StoreSalvage::copyTable(const std::string& table, const std::string& columns, int count,
                                             const std::string& how) {
  SqliteStatement select = damaged_.prepare("SELECT " + columns + " FROM " + table + how);
  SqliteStatement insert =
      made_.prepare("INSERT OR IGNORE INTO " + table + " (" + columns + ") VALUES (" + parameters(count));
  const std::int64_t rows = rows_;
  const Copied copied = copy(select, insert, count);
  rows_ = rows;  // these are no reports
  return copied;
}

StoreSalvage::Copied StoreSalvage::copy(SqliteStatement& select, SqliteStatement& insert, int columns) {
  SqliteStatement::Step step = SqliteStatement::Step::kFailed;
  while (select && (step = select.step()) == SqliteStatement::Step::kRow) {
    bool isWhole = true;
    for (int column = 0; column < columns; ++column) {
      isWhole = isWhole && select.isValid(column);
      insert.bindColumn(column + 1, select, column);
    }
    if (!isWhole) continue;
    if (!insert.run()) return Copied::kFailed;
    rows_ += made_.changes();
  }
  select.reset();
  return step == SqliteStatement::Step::kDone ? Copied::kAll : Copied::kSome;
}

bool StoreSalvage::copyRows(std::size_t table) {
  const std::string name(kStoreTables[table].name);
  std::string from = name;
  if (name == "rtc_row" && !has("table", name)) from = "rtc_message";  // before version 2
  if (!has("table", from)) return true;
  std::string columns = "id, " + std::string(kColumns[table].always);
  for (const std::string_view later : kColumns[table].later) {
    if (!later.empty() && hasColumn(from, later)) columns.append(", ").append(later);
  }
  const int count = static_cast<int>(std::count(columns.begin(), columns.end(), ',')) + 1;
  std::string sql = "SELECT " + columns + " FROM " + from + " WHERE id = ?1 AND ";
  sql.append(kColumns[table].condition);
  // The user comes after the payload, where damage of a page shows in nothing else.
  if (hasColumn(from, "user_id")) sql += " AND (user_id IS NULL OR user_id BETWEEN 0 AND 4294967294)";
  SqliteStatement select = damaged_.prepare(sql);
  SqliteStatement insert =
      made_.prepare("INSERT OR IGNORE INTO " + name + " (" + columns + ") VALUES (" + parameters(count));
  SqliteStatement identifiers = damaged_.prepare("SELECT id FROM " + from + " WHERE id >= ?1 ORDER BY id");
  isEndLost_[table] = true;
  std::int64_t next = 1;
  while (next <= kMaxIdentifier) {
    const std::int64_t wanted = next;
    identifiers.bind(1, wanted);
    SqliteStatement::Step step = SqliteStatement::Step::kDone;
    // On damaged pages the order of identifiers may be wrong.
    while ((step = identifiers.step()) == SqliteStatement::Step::kRow && identifiers.integer(0) >= next &&
           identifiers.integer(0) <= kMaxIdentifier) {
      highest_[table] = identifiers.integer(0);
      next = identifiers.integer(0) + 1;
      select.bind(1, identifiers.integer(0));
      if (copy(select, insert, count) == Copied::kFailed || !commitSome()) return false;
    }
    const bool isAtEnd = step == SqliteStatement::Step::kDone ||
                         (step == SqliteStatement::Step::kRow && identifiers.integer(0) > kMaxIdentifier);
    isEndLost_[table] = step != SqliteStatement::Step::kDone;
    identifiers.reset();
    if (isAtEnd) return true;
    next = nextReadable(from, std::max(wanted, next - 1));
  }
  return true;
}

// Where the rows of a damaged page end is not known, and such a page may have rows that belong elsewhere. The
// search goes on in growing steps, and then back to the first identifier that can be looked for.
std::int64_t StoreSalvage::nextReadable(const std::string& from, std::int64_t failed) {
  SqliteStatement find = damaged_.prepare("SELECT id FROM " + from + " WHERE id >= ?1 ORDER BY id LIMIT 1");
  const auto isReadable = [&](std::int64_t identifier) {
    find.bind(1, identifier);
    const SqliteStatement::Step step = find.step();
    const bool readable = step == SqliteStatement::Step::kDone ||
                          (step == SqliteStatement::Step::kRow && find.integer(0) >= identifier &&
                           find.integer(0) <= kMaxIdentifier);
    find.reset();
    return readable;
  };
  std::int64_t step = 1;
  while (!isReadable(failed + step)) {
    if (failed + step > kMaxIdentifier) return failed + step;
    step += step / 4 + 1;
  }
  std::int64_t unreadable = failed;
  std::int64_t readable = failed + step;
  while (readable - unreadable > 1) {
    const std::int64_t middle = unreadable + (readable - unreadable) / 2;
    (isReadable(middle) ? readable : unreadable) = middle;
  }
  return readable;
}

bool StoreSalvage::commitSome() {
  Heartbeat::beatHere();
  if (rows_ - committedRows_ < kRowsPerCommit) return true;
  if (!made_.run("COMMIT")) return false;
  committedRows_ = rows_;
  return made_.run("BEGIN");
}

bool StoreSalvage::has(std::string_view type, std::string_view name) {
  std::string sql = "SELECT count(*) FROM sqlite_master WHERE type = '";
  sql.append(type).append("' AND name = '").append(name).append("'");
  return damaged_.number(sql).value_or(0) > 0;
}

bool StoreSalvage::hasColumn(std::string_view table, std::string_view column) {
  std::string sql = "SELECT count(*) FROM pragma_table_info('";
  sql.append(table).append("') WHERE name = '").append(column).append("'");
  return damaged_.number(sql).value_or(0) > 0;
}

}  // namespace tonewerk
