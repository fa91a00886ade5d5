// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreReader.h"

#include <chrono>
#include <filesystem>
#include <system_error>

#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kPatience{5};

// The filter's conditions in the queries below. Parameters 2 to 6 are the filter's; parameter 1 is
// kStoreNamesPerRow.
std::string conditions(const EventFilter& filter, const std::string& name, const std::string& recordedAt) {
  std::string sql;
  if (filter.name) sql += " AND " + name + " GLOB ?3";
  if (filter.since) sql += " AND " + recordedAt + " >= ?4";
  if (filter.until) sql += " AND " + recordedAt + " <= ?5";
  return sql;
}

// Reads the tables instead of the view, because there the rows after an identifier are found by key.
std::string eventQuery(const EventFilter& filter) {
  std::string sql =
      "SELECT r.id * ?1 + n.position AS id, r.recorded_at AS recorded_at, n.name AS name, r.payload AS "
      "payload"
      " FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set"
      " WHERE r.id >= ?2 / ?1 AND r.id * ?1 + n.position > ?2";
  sql += conditions(filter, "n.name", "r.recorded_at");
  if (!filter.limit) return sql + " ORDER BY r.id, n.position";
  return "SELECT * FROM (" + sql + " ORDER BY r.id DESC, n.position DESC LIMIT ?6) ORDER BY id";
}

// Returns a query for the rows of `sql`, which has a column `id`, oldest first. With a limit, the query
// returns only that many of the newest rows.
std::string limitedById(const std::string& sql, const EventFilter& filter) {
  if (!filter.limit) return sql + " ORDER BY id";
  return "SELECT * FROM (" + sql + " ORDER BY id DESC LIMIT ?6) ORDER BY id";
}

std::string powerQuery(const EventFilter& filter) {
  const std::string sql =
      "SELECT id, recorded_at, event_group, name, payload FROM power_event WHERE id > ?2" +
      conditions(filter, "name", "recorded_at");
  return limitedById(sql, filter);
}

std::string metricQuery(const EventFilter& filter) {
  EventFilter unnamed = filter;
  unnamed.name.reset();
  const std::string sql = "SELECT id, posted_at, identifier, record FROM metric WHERE id > ?2" +
                          conditions(unnamed, "", "posted_at");
  return limitedById(sql, filter);
}

constexpr const char* kRtcServiceName = "s.user_info ->> 'kLinkReportUserInfoServiceName'";

std::string rtcSessionQuery(const EventFilter& filter) {
  const std::string sql =
      "SELECT s.id AS id, s.started_at, s.session_info, s.user_info FROM rtc_session AS s WHERE s.id > ?2";
  return limitedById(sql + conditions(filter, kRtcServiceName, "s.started_at"), filter);
}

// A message may still be stored when its session's row has been deleted. It then has no name. The session is
// asked for in a condition, because the messages of a join would be sorted.
std::string rtcMessageQuery(const EventFilter& filter) {
  const std::string name =
      "(SELECT " + std::string(kRtcServiceName) + " FROM rtc_session AS s WHERE s.id = rtc_session)";
  const std::string sql =
      "SELECT id, sent_at, rtc_session, category, type, payload FROM rtc_message WHERE id > ?2";
  return limitedById(sql + conditions(filter, name, "sent_at"), filter);
}

std::string engineOnQuery(const EventFilter& filter) {
  return "SELECT payload ->> 'ApplicationName', sum(payload ->> 'EngineOnDuration') AS duration, count(*)"
         " FROM (" +
         powerQuery(filter) +
         ") WHERE payload ->> 'EngineOnDuration' IS NOT NULL GROUP BY 1 ORDER BY duration DESC, 1";
}

}  // namespace

StoreReader::Outcome StoreReader::open(const std::string& directory) {
  path_ = directory + "/" + std::string(kStoreFileName);
  std::error_code error;
  if (!std::filesystem::exists(path_, error)) {
    if (error) return fail(error.message());
    problem_ = path_ + ": there is no such file";
    return Outcome::kNoStore;
  }
  const Outcome outcome = openAs(SqliteDatabase::Mode::kReadOnly);
  // Reading needs a side file, which a user without write permission for the directory cannot make. While a
  // daemon writes, the side file is there. Without one the file does not change, so that it can be read as it
  // is.
  if (outcome != Outcome::kFailed || std::filesystem::exists(path_ + "-wal", error)) return outcome;
  return openAs(SqliteDatabase::Mode::kImmutable);
}

bool StoreReader::readEvents(const EventFilter& filter,
                             const std::function<void(const StoredEvent& event)>& take) {
  return readRows(eventQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.text(2), row.text(3)});
  });
}

bool StoreReader::readPowerEvents(const EventFilter& filter,
                                  const std::function<void(const StoredPowerEvent& event)>& take) {
  return readRows(powerQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.integer(2), row.text(3), row.text(4)});
  });
}

bool StoreReader::readEngineOnTotals(const EventFilter& filter,
                                     const std::function<void(const EngineOnTotal& total)>& take) {
  return readRows(engineOnQuery(filter), filter, [&](const SqliteStatement& row) {
    EngineOnTotal total{std::nullopt, row.number(1), row.integer(2)};
    if (!row.isNull(0)) total.application = row.text(0);
    take(total);
  });
}

bool StoreReader::readMetrics(const EventFilter& filter,
                              const std::function<void(const StoredMetric& metric)>& take) {
  return readRows(metricQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.integer(2), row.bytes(3)});
  });
}

bool StoreReader::readRtcSessions(const EventFilter& filter,
                                  const std::function<void(const StoredRtcSession& session)>& take) {
  return readRows(rtcSessionQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.text(2), row.text(3)});
  });
}

bool StoreReader::readRtcMessages(const EventFilter& filter,
                                  const std::function<void(const StoredRtcMessage& message)>& take) {
  return readRows(rtcMessageQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.integer(2), row.integer(3), row.integer(4), row.text(5)});
  });
}

bool StoreReader::readRows(const std::string& sql, const EventFilter& filter,
                           const std::function<void(const SqliteStatement& row)>& take) {
  SqliteStatement select = database_.prepare(sql);
  select.bind(1, kStoreNamesPerRow);
  select.bind(2, filter.afterId);
  if (filter.name) select.bind(3, std::string_view(*filter.name));
  if (filter.since) select.bind(4, *filter.since);
  if (filter.until) select.bind(5, *filter.until);
  if (filter.limit) select.bind(6, *filter.limit);
  for (;;) {
    switch (select.step()) {
      case SqliteStatement::Step::kRow:
        take(select);
        break;
      case SqliteStatement::Step::kDone:
        return true;
      case SqliteStatement::Step::kFailed:
        problem_ = path_ + ": " + database_.problem();
        return false;
    }
  }
}

StoreReader::Outcome StoreReader::openAs(SqliteDatabase::Mode mode) {
  if (!database_.open(path_, mode, kPatience)) return fail(database_.problem());
  const auto version = database_.number("PRAGMA user_version");
  if (!version) return fail(database_.problem());
  if (*version > kStoreSchemaVersion) return fail("it was made by a newer version");
  if (*version == 0) {
    problem_ = path_ + ": nothing has been stored yet";
    return Outcome::kNoStore;
  }
  return Outcome::kDone;
}

StoreReader::Outcome StoreReader::fail(const std::string& problem) {
  problem_ = path_ + ": " + problem;
  return Outcome::kFailed;
}

}  // namespace tonewerk
