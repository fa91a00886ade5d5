// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreQueries.h"

namespace tonewerk {
namespace {

// The filter's conditions in the queries below.
std::string conditions(const EventFilter& filter, const std::string& name, const std::string& recordedAt) {
  std::string sql;
  if (filter.name) sql += " AND " + name + " GLOB ?3";
  if (filter.since) sql += " AND " + recordedAt + " >= ?4";
  if (filter.until) sql += " AND " + recordedAt + " <= ?5";
  return sql;
}

// Returns a query for the rows of `sql`, which has a column `id`, oldest first. With a limit, the query
// returns only that many of the newest rows.
std::string limitedById(const std::string& sql, const EventFilter& filter) {
  if (!filter.limit) return sql + " ORDER BY id";
  return "SELECT * FROM (" + sql + " ORDER BY id DESC LIMIT ?6) ORDER BY id";
}

// Chooses rows by their session. The sessions are found first; their stretches by an index.
std::string sessionConditions(const EventFilter& filter) {
  std::string sql;
  if (filter.session) sql += " AND r.session = ?10";
  if (!filter.application && !filter.service && !filter.device) return sql;
  sql += " AND r.session IN (SELECT id FROM session_row WHERE 1";
  if (filter.application) sql += " AND application GLOB ?7";
  if (filter.service) sql += " AND coalesce(service, 'unknown') GLOB ?9";
  if (filter.device) {
    sql +=
        " AND id IN (SELECT session FROM analytics_row WHERE began_at IS NOT NULL AND"
        " payload ->> 'active_devices' GLOB ?8)";
  }
  return sql + ")";
}

constexpr const char* kRtcApplication = "s.user_info ->> 'HostApplicationDisplayID'";
constexpr const char* kRtcServiceName = "s.user_info ->> 'kLinkReportUserInfoServiceName'";

std::string rtcConditions(const EventFilter& filter, const std::string& time) {
  std::string sql = conditions(filter, kRtcServiceName, time);
  if (filter.application) sql.append(" AND ").append(kRtcApplication).append(" GLOB ?7");
  if (filter.service) sql.append(" AND ").append(kRtcServiceName).append(" GLOB ?9 || '_session'");
  return sql;
}

}  // namespace

std::string messageQuery(const EventFilter& filter, bool knowsSessions) {
  std::string sql = "SELECT r.id AS id, r.recorded_at, n.name, m.name, r.payload, ";
  sql += knowsSessions ? "r.session, s.application, n.source IS 'derived'" : "NULL, NULL, 0";
  sql +=
      " FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set AND n.position = 0"
      " LEFT JOIN analytics_name AS m ON m.name_set = r.name_set AND m.position = 1";
  if (knowsSessions) sql += " LEFT JOIN session_row AS s ON s.id = r.session";
  sql += " WHERE r.id > ?2";
  if (filter.name) sql += " AND (n.name GLOB ?3 OR m.name GLOB ?3)";
  EventFilter unnamed = filter;
  unnamed.name.reset();
  sql += conditions(unnamed, "", "r.recorded_at") + sessionConditions(filter);
  if (!filter.limit) return sql + " ORDER BY r.id";
  return "SELECT * FROM (" + sql + " ORDER BY r.id DESC LIMIT ?6) ORDER BY id";
}

// Reads the tables instead of the view, because there the rows after an identifier are found by key.
std::string eventQuery(const EventFilter& filter) {
  std::string sql =
      "SELECT r.id * ?1 + n.position AS id, r.recorded_at AS recorded_at, n.name AS name, r.payload AS "
      "payload"
      " FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set"
      " WHERE r.id >= ?2 / ?1 AND r.id * ?1 + n.position > ?2";
  sql += conditions(filter, "n.name", "r.recorded_at") + sessionConditions(filter);
  if (!filter.limit) return sql + " ORDER BY r.id, n.position";
  return "SELECT * FROM (" + sql + " ORDER BY r.id DESC, n.position DESC LIMIT ?6) ORDER BY id";
}

std::string powerQuery(const EventFilter& filter) {
  std::string sql = "SELECT id, recorded_at, event_group, name, payload FROM power_event WHERE id > ?2" +
                    conditions(filter, "name", "recorded_at");
  if (filter.application) sql += " AND payload ->> 'ApplicationName' GLOB ?7";
  return limitedById(sql, filter);
}

std::string metricQuery(const EventFilter& filter) {
  EventFilter unnamed = filter;
  unnamed.name.reset();
  const std::string sql = "SELECT id, posted_at, identifier, record FROM metric WHERE id > ?2" +
                          conditions(unnamed, "", "posted_at");
  return limitedById(sql, filter);
}

std::string rtcSessionQuery(const EventFilter& filter) {
  const std::string sql =
      "SELECT s.id AS id, s.started_at, s.session_info, s.user_info FROM rtc_session AS s WHERE s.id > ?2";
  return limitedById(sql + rtcConditions(filter, "s.started_at"), filter);
}

// A message may still be stored when its session's row has been deleted. It then has no name. Because
// the query selects `id`, SQLite merges both tables of the view by key, and sorts nothing.
std::string rtcMessageQuery(const EventFilter& filter) {
  const std::string sql =
      "SELECT m.id AS id, m.sent_at, m.rtc_session, m.category, m.type, m.payload"
      " FROM rtc_message AS m LEFT JOIN rtc_session AS s ON s.id = m.rtc_session WHERE m.id > ?2";
  return limitedById(sql + rtcConditions(filter, "m.sent_at"), filter);
}

std::string engineOnQuery(const EventFilter& filter) {
  return "SELECT payload ->> 'ApplicationName', sum(payload ->> 'EngineOnDuration') AS duration, count(*)"
         " FROM (" +
         powerQuery(filter) +
         ") WHERE payload ->> 'EngineOnDuration' IS NOT NULL GROUP BY 1 ORDER BY duration DESC, 1";
}

}  // namespace tonewerk
