// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/StoredSessions.h"

#include "tools/twctl/sessions/ViewRows.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr const char* kSelect =
    "SELECT id, reporter_id, service, application, process, user_id, started_at, ended_at, ending, messages, "
    "redundant_messages, active_seconds, overloads FROM session";

StoredSession sessionOf(const ViewRow& row) {
  return {.id = row.integer(0).value_or(0),
          .reporterID = row.integer(1).value_or(0),
          .service = row.text(2),
          .application = row.text(3),
          .process = row.text(4),
          .user = row.integer(5).value_or(0),
          .startedAt = row.number(6).value_or(0.0),
          .endedAt = row.number(7),
          .ending = row.text(8),
          .messages = row.integer(9),
          .redundantMessages = row.integer(10),
          .activeSeconds = row.number(11),
          .overloads = row.integer(12)};
}

std::string orNull(const std::optional<double>& number) { return number ? textOf(*number) : "NULL"; }

std::string conditionOf(const SessionFilter& filter) {
  std::string sql = " WHERE (" + orNull(filter.since) +
                    " IS NULL OR coalesce(ended_at, 1e18) >= " + orNull(filter.since) + ") AND (" +
                    orNull(filter.until) + " IS NULL OR started_at <= " + orNull(filter.until) + ")";
  if (filter.application) sql += " AND application GLOB ?1";
  if (filter.service) sql += " AND coalesce(service, 'unknown') GLOB ?2";
  if (filter.session) sql += " AND id = " + std::to_string(*filter.session);
  if (filter.device) {
    sql +=
        " AND id IN (SELECT session FROM volume_stretch WHERE started_at IS NOT NULL AND device GLOB ?3"
        " UNION ALL SELECT session FROM input_stretch WHERE started_at IS NOT NULL AND device GLOB ?3"
        " UNION ALL SELECT session FROM gather_stretch WHERE started_at IS NOT NULL AND device GLOB ?3)";
  }
  return sql;
}

}  // namespace

bool readSessions(SqlReader& reader, const SessionFilter& filter, std::string& problem,
                  const std::function<void(const StoredSession& session)>& take) {
  std::string sql = kSelect + conditionOf(filter);
  constexpr const char* kOldestFirst = " ORDER BY started_at, id";
  if (filter.limit) {
    sql = "SELECT * FROM (" + sql + " ORDER BY started_at DESC, id DESC LIMIT " +
          std::to_string(*filter.limit) + ")";
  }
  return eachRow(reader, sql + kOldestFirst, {filter.application, filter.service, filter.device}, problem,
                 [&](const ViewRow& row) { take(sessionOf(row)); });
}

std::optional<StoredSession> readSession(SqlReader& reader, std::int64_t id, std::string& problem) {
  std::optional<StoredSession> found;
  const bool isRead = eachRow(reader, std::string(kSelect) + " WHERE id = " + std::to_string(id), {}, problem,
                              [&](const ViewRow& row) { found = sessionOf(row); });
  if (!isRead || found) return found;
  problem = "the store has no session " + std::to_string(id);
  std::string similar;
  std::string ignored;
  (void)eachRow(
      reader,
      "SELECT id FROM session WHERE reporter_id = " + std::to_string(id) + " ORDER BY id DESC LIMIT 5", {},
      ignored, [&](const ViewRow& row) {
        similar.append(similar.empty() ? "" : ", ");
        similar += std::to_string(row.integer(0).value_or(0));
      });
  if (!similar.empty()) {
    problem += "; the reporter identifier " + std::to_string(id) +
               " is that of these sessions, newest first: " + similar;
  } else {
    problem += "; `twctl sessions` lists those that there are";
  }
  return std::nullopt;
}

}  // namespace tonewerk
