// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SessionRecords.h"

#include "tools/twctl/sessions/ViewRows.h"

namespace tonewerk {
namespace {

// The condition by which the rows of a session are found in the views whose identifiers are those of events.
// There is no index on the session, because each message would pay for it. So all events are read once, and
// the views only from the session's first event to its last. None on a failure.
std::optional<std::string> rowsOf(SqlReader& reader, std::int64_t session, std::string& problem) {
  std::string condition = "session = " + std::to_string(session);
  const std::string ends = "SELECT min(id), max(id) FROM event WHERE " + condition;
  const bool isRead = eachRow(reader, ends, {}, problem, [&](const ViewRow& row) {
    if (row.integer(0) && row.integer(1))
      condition +=
          " AND id BETWEEN " + std::to_string(*row.integer(0)) + " AND " + std::to_string(*row.integer(1));
  });
  return isRead ? std::optional(condition) : std::nullopt;
}

std::string stretchesOf(const std::string& rows) {
  return "SELECT id, 'Volume', started_at, ended_at, seconds, device, volume FROM volume_stretch WHERE " +
         rows +
         " UNION ALL SELECT id, 'Input', started_at, ended_at, seconds, device, NULL FROM input_stretch "
         "WHERE " +
         rows +
         " UNION ALL SELECT id, 'Gather', started_at, ended_at, seconds, device, NULL FROM gather_stretch "
         "WHERE " +
         rows + " ORDER BY 3, 1";
}

bool hasGlitches(SqlReader& reader) {
  return !reader.rows("SELECT 1 FROM sqlite_master WHERE name = 'glitch'").empty();
}

// A store that an earlier daemon has made does not have the view.
bool readVerdicts(SqlReader& reader, const std::string& rows, SessionRecords& records, std::string& problem) {
  std::map<std::int64_t, GlitchVerdict> verdicts;
  if (!hasGlitches(reader)) return true;
  if (!eachRow(reader, std::string("SELECT ") + GlitchVerdict::columns() + " FROM glitch WHERE " + rows, {},
               problem, [&](const ViewRow& row) {
                 GlitchVerdict verdict = GlitchVerdict::of(row);
                 if (verdict.isJudged()) verdicts.emplace(verdict.event, std::move(verdict));
               })) {
    return false;
  }
  for (SessionRecords::Issue& issue : records.issues) {
    const auto found = verdicts.find(issue.event);
    if (found != verdicts.end()) issue.verdict = found->second;
  }
  return true;
}

}  // namespace

std::optional<SessionRecords> readRecords(SqlReader& reader, std::int64_t session, std::string& problem) {
  SessionRecords records;
  const std::optional<std::string> rows = rowsOf(reader, session, problem);
  if (!rows) return std::nullopt;
  const bool isRead =
      eachRow(reader,
              "SELECT category, type, coalesce(source, ''), count(*) FROM event WHERE " + *rows +
                  " GROUP BY 1, 2, 3 ORDER BY 4 DESC, 1, 2, 3",
              {}, problem,
              [&](const ViewRow& row) {
                records.kinds.push_back({row.text(0).value_or(""), row.text(1).value_or(""),
                                         row.text(2).value_or(""), row.integer(3).value_or(0)});
              }) &&
      eachRow(reader, stretchesOf(*rows), {}, problem,
              [&](const ViewRow& row) {
                records.stretches.push_back({row.integer(0).value_or(0), row.text(1).value_or(""),
                                             row.number(2), row.number(3), row.number(4).value_or(0.0),
                                             row.text(5), row.number(6)});
              }) &&
      eachRow(reader,
              "SELECT id, at, kind, node, duration_seconds, buffer_frames FROM issue WHERE " + *rows +
                  " ORDER BY at, id",
              {}, problem,
              [&](const ViewRow& row) {
                records.issues.push_back({row.integer(0).value_or(0), row.number(1).value_or(0.0),
                                          row.text(2).value_or("issue"), row.text(3), row.number(4),
                                          row.integer(5)});
              }) &&
      eachRow(reader,
              "SELECT id, category, payload ->> 'msgidx' FROM event WHERE " + *rows +
                  " AND type = 'Summary' AND category IN ('Volume', 'Input', 'Gather') AND source IS NOT "
                  "'client'",
              {}, problem,
              [&](const ViewRow& row) {
                const std::pair name(row.text(1).value_or(""), row.integer(2).value_or(0));
                records.summaries.emplace(name, row.integer(0).value_or(0));
              }) &&
      readVerdicts(reader, *rows, records, problem);
  return isRead ? std::optional(std::move(records)) : std::nullopt;
}

std::optional<std::vector<StoredPayload>> readPayloads(SqlReader& reader, std::int64_t session,
                                                       std::string& problem) {
  const std::optional<std::string> rows = rowsOf(reader, session, problem);
  if (!rows) return std::nullopt;
  std::vector<StoredPayload> events;
  const bool isRead = eachRow(
      reader,
      "SELECT id, category, type, coalesce(source, ''), at, json_remove(payload, "
      "'$.twreporting_timestamp') FROM event WHERE " +
          *rows + " ORDER BY id",
      {}, problem, [&](const ViewRow& row) {
        events.push_back({row.integer(0).value_or(0), row.text(1).value_or(""), row.text(2).value_or(""),
                          row.text(3).value_or(""), row.number(4).value_or(0.0), row.text(5).value_or("")});
      });
  return isRead ? std::optional(std::move(events)) : std::nullopt;
}

std::optional<std::map<std::int64_t, std::string>> readCycles(SqlReader& reader, std::int64_t session,
                                                              std::string& problem) {
  std::map<std::int64_t, std::string> cycles;
  if (!hasGlitches(reader)) return cycles;
  const std::optional<std::string> rows = rowsOf(reader, session, problem);
  if (!rows) return std::nullopt;
  const bool isRead = eachRow(
      reader,
      "SELECT id, cycles FROM glitch WHERE " + *rows +
          " AND length(cycles) <= 65536 ORDER BY id DESC LIMIT " + std::to_string(kMostGlitches),
      {}, problem,
      [&](const ViewRow& row) { cycles.emplace(row.integer(0).value_or(0), row.text(1).value_or("")); });
  return isRead ? std::optional(std::move(cycles)) : std::nullopt;
}

std::optional<StoredEventRow> readEvent(SqlReader& reader, std::int64_t id, std::string& problem) {
  std::optional<StoredEventRow> event;
  const bool isRead = eachRow(
      reader,
      "SELECT id, at, session, category, type, coalesce(source, ''), payload ->> 'msgidx' FROM event WHERE "
      "id = " +
          std::to_string(id),
      {}, problem, [&](const ViewRow& row) {
        event = {
            row.integer(0).value_or(0), row.number(1).value_or(0.0), row.integer(2), row.text(3).value_or(""),
            row.text(4).value_or(""),   row.text(5).value_or(""),    row.integer(6)};
      });
  if (!isRead || event) return event;
  problem = "the store has no event " + std::to_string(id);
  std::string ignored;
  (void)eachRow(reader, "SELECT min(id), max(id) FROM event", {}, ignored, [&](const ViewRow& row) {
    if (row.integer(0))
      problem += "; it has events from " + std::to_string(*row.integer(0)) + " to " +
                 std::to_string(row.integer(1).value_or(0));
  });
  problem += "; `twctl sql \"SELECT id, at, session, category, type FROM event\"` lists them";
  return std::nullopt;
}

}  // namespace tonewerk
