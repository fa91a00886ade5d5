// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/ReportData.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <map>
#include <utility>
#include <vector>

#include "tools/twctl/report/LocalHours.h"
#include "tools/twctl/report/ReportTables.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr double kDaySeconds = 86'400.0;

std::string limit(int most) { return " LIMIT " + std::to_string(most); }

double rounded(double number) { return std::round(number * 1000.0) / 1000.0; }

// The first and the last time of which the store says something; without one, `now` twice.
struct Span {
  double from;
  double until;
};

Span spanOf(ReportTables& tables, const ReportScope& scope, double now) {
  const ValueMap times = tables.first(
      "from:d until:d",
      "SELECT min(t), max(t) FROM (SELECT started_at AS t FROM shown UNION ALL SELECT ended_at FROM shown "
      "UNION ALL SELECT started FROM played UNION ALL SELECT ended FROM played UNION ALL SELECT started FROM "
      "heard UNION ALL SELECT ended FROM heard UNION ALL SELECT at FROM trouble UNION ALL SELECT at FROM "
      "felt)");
  const double from = times.number("from");
  const double until = times.number("until");
  Span span{from > 0.0 ? from : now, until > 0.0 ? until : now};
  const bool isRunning =
      scope.daemonAnswers &&
      tables.first("running:i", "SELECT count(*) FROM shown WHERE ending IS NULL").integer("running") > 0;
  if (scope.since || isRunning) span.until = std::max(span.until, now);
  if (scope.since) span.from = *scope.since;
  if (scope.until) span.until = std::min(*scope.until, std::max(span.until, now));
  span.until = std::max(span.until, span.from);
  return span;
}

ValueArray changesOf(const LocalOffsets& offsets) {
  std::vector<Value> changes;
  for (const LocalOffsets::Change& change : offsets.changes()) {
    changes.emplace_back(ValueArray{change.from, change.seconds});
  }
  return ValueArray(std::move(changes));
}

ValueMap totals(ReportTables& tables) {
  ValueMap totals = tables.first(
      "sessions:i running:i interrupted:i disconnected:i messages:i redundantMessages:i applications:i",
      "SELECT count(*), count(*) FILTER (WHERE ending IS NULL), count(*) FILTER (WHERE ending = "
      "'interrupted'), count(*) FILTER (WHERE ending = 'disconnected'), coalesce(sum(messages), 0), "
      "coalesce(sum(redundant_messages), 0), count(DISTINCT application) FROM shown");
  totals.merge(tables.first("playSeconds:d averageVolume:d devices:i",
                            "SELECT coalesce(sum(seconds), 0.0), sum(seconds * volume) / nullif(sum(seconds) "
                            "FILTER (WHERE volume IS NOT NULL), 0), count(DISTINCT device) FROM played"));
  // How long anything played at all, and how long other stretches played beside it.
  totals.merge(tables.first(
      "playingSeconds:d overlapSeconds:d",
      "SELECT total(max(0.0, ended - max(started, coalesce(before, started)))), total(max(0.0, min(ended, "
      "before) - started)) FROM (SELECT started, ended, max(ended) OVER (ORDER BY started ROWS BETWEEN "
      "UNBOUNDED PRECEDING AND 1 PRECEDING) AS before FROM played WHERE started IS NOT NULL)"));
  totals.merge(tables.first("inputSeconds:d", "SELECT coalesce(sum(seconds), 0.0) FROM heard"));
  totals.merge(
      tables.first("overloads:i otherIssues:i overloadedSessions:i",
                   "SELECT count(*) FILTER (WHERE kind = 'overload'), count(*) FILTER (WHERE kind IS "
                   "NOT 'overload'), count(DISTINCT session) FILTER (WHERE kind = 'overload') FROM "
                   "trouble"));
  totals.merge(tables.first("hapticsEvents:i hapticsSeconds:d hapticsLeaks:i leakedSeconds:d",
                            "SELECT count(*) FILTER (WHERE NOT leaked), total(seconds) FILTER (WHERE NOT "
                            "leaked), count(*) FILTER (WHERE leaked), total(seconds) FILTER (WHERE leaked) "
                            "FROM felt"));
  return totals;
}

// Chooses the sessions that the timeline has: those that played longest, and those that overloaded most.
void chooseLanes(ReportTables& tables) {
  tables.run(
      "CREATE TEMP TABLE lane AS WITH sums AS (SELECT s.id, coalesce((SELECT sum(seconds) FROM played AS p "
      "WHERE p.session = s.id), 0) AS seconds, (SELECT count(*) FROM trouble AS t WHERE t.session = s.id AND "
      "t.kind = 'overload') AS overloads FROM shown AS s), longest AS (SELECT id FROM sums ORDER BY seconds "
      "DESC, id DESC" +
      limit(ReportData::kLongestSessions) +
      ") SELECT id FROM longest UNION ALL SELECT id FROM (SELECT id FROM sums WHERE overloads > 0 AND id NOT "
      "IN (SELECT id FROM longest) ORDER BY overloads DESC, id DESC" +
      limit(ReportData::kMostSessions - ReportData::kLongestSessions) + ")");
}

// The rows of a table that belong to these sessions. When there are too many, each session keeps those with
// the greatest `weight`.
struct LaneQuery {
  const char* names;
  const char* table;
  const char* weight;
  const char* time;
  int most;
};

ValueMap ofLanes(ReportTables& tables, const char* columns, const LaneQuery& query) {
  return tables.list(columns, std::string("SELECT ") + query.names +
                                  " FROM (SELECT *, row_number() OVER (PARTITION BY session ORDER BY " +
                                  query.weight + " DESC) AS place FROM " + query.table +
                                  " WHERE session IN (SELECT id FROM lane) AND " + query.time +
                                  " IS NOT NULL ORDER BY place" + limit(query.most) + ") ORDER BY session, " +
                                  query.time);
}

ValueMap timeline(ReportTables& tables) {
  // The counts for each session are looked up.
  tables.run("CREATE INDEX temp.played_of ON played (session)");
  tables.run("CREATE INDEX temp.trouble_of ON trouble (session)");
  chooseLanes(tables);
  ValueMap timeline;
  timeline.set(
      "lanes",
      tables.list("id:i reporter:i service:t application:t process:t started:d ended:d ending:t "
                  "messages:i redundant:i activeSeconds:d playSeconds:d overloads:i stretches:i",
                  "SELECT id, reporter_id, service, application, process, started_at, ended_at, "
                  "ending, messages, redundant_messages, active_seconds, coalesce((SELECT "
                  "sum(seconds) FROM played WHERE session = id), 0.0), (SELECT count(*) FROM trouble "
                  "WHERE session = id AND kind = 'overload'), (SELECT count(*) FROM played WHERE "
                  "session = id) FROM shown WHERE id IN (SELECT id FROM lane) ORDER BY started_at, "
                  "id"));
  timeline.set("played", ofLanes(tables, "session:i started:d ended:d volume:d device:t ringer:i",
                                 {"session, started, ended, volume, device, ringer", "played", "seconds",
                                  "started", ReportData::kMostStretches}));
  timeline.set("heard", ofLanes(tables, "session:i started:d ended:d device:t mode:t",
                                {"session, started, ended, device, mode", "heard", "seconds", "started",
                                 ReportData::kMostMarks}));
  timeline.set("issues", ofLanes(tables, "session:i at:d kind:t seconds:d",
                                 {"session, at, kind, duration_seconds", "trouble",
                                  "coalesce(duration_seconds, 0)", "at", ReportData::kMostMarks}));
  timeline.set("glitches",
               tables.list("at:d cause:t culprit:t over:d lost:d times:i heard:t",
                           "SELECT at, cause, culprit, over_ms, lost_ms, times, heard FROM (SELECT * FROM "
                           "crackled ORDER BY coalesce(over_ms, -1) DESC, id DESC" +
                               limit(ReportData::kMostGlitches) + ") ORDER BY at"));
  timeline.set(
      "haptics",
      tables.list(
          "at:d application:t seconds:d",
          "SELECT at, application, seconds FROM (SELECT * FROM felt WHERE NOT leaked ORDER BY seconds DESC" +
              limit(ReportData::kMostHaptics) + ") ORDER BY at"));
  timeline.set(
      "leftOut",
      tables.first("sessions:i stretches:i issues:i inputs:i glitches:i haptics:i misplaced:i",
                   "SELECT (SELECT count(*) FROM shown) - (SELECT count(*) FROM lane), max(0, (SELECT "
                   "count(*) FROM played WHERE started IS NOT NULL AND session IN (SELECT id FROM lane)) - " +
                       std::to_string(ReportData::kMostStretches) +
                       "), max(0, (SELECT count(*) FROM trouble WHERE session IN (SELECT id FROM "
                       "lane)) - " +
                       std::to_string(ReportData::kMostMarks) +
                       "), max(0, (SELECT count(*) FROM heard WHERE started IS NOT NULL AND session IN "
                       "(SELECT id FROM lane)) - " +
                       std::to_string(ReportData::kMostMarks) +
                       "), max(0, (SELECT count(*) FROM crackled) - " +
                       std::to_string(ReportData::kMostGlitches) +
                       "), max(0, (SELECT count(*) FROM felt WHERE NOT leaked) - " +
                       std::to_string(ReportData::kMostHaptics) +
                       "), (SELECT count(*) FROM played WHERE misplaced) + (SELECT count(*) FROM heard WHERE "
                       "misplaced)"));
  return timeline;
}

ValueArray hoursOf(ReportTables& tables, const LocalOffsets& offsets, const Span& span) {
  LocalHours hours(offsets, std::max(span.from, span.until - ReportData::kMostDays * kDaySeconds));
  tables.each("SELECT started, ended, seconds, volume FROM played WHERE started IS NOT NULL",
              [&](const SqliteStatement& row) {
                const double started = row.number(0);
                hours.add(started, row.isNull(1) ? started : row.number(1), row.number(2),
                          row.isNull(3) ? std::numeric_limits<double>::quiet_NaN() : row.number(3));
              });
  std::vector<Value> rows;
  for (const auto& [begins, hour] : hours.hours()) {
    const double volume = hour.withVolume > 0.0 ? hour.volumeSeconds / hour.withVolume
                                                : std::numeric_limits<double>::quiet_NaN();
    rows.emplace_back(ValueArray{begins, rounded(hour.seconds), rounded(volume), hour.until});
  }
  return ValueArray(std::move(rows));
}

// Seconds by application or device. The rest has no name of its own.
ValueMap playedBy(ReportTables& tables, const char* what) {
  const std::string sums = std::string("WITH sums AS (SELECT ") + what +
                           " AS name, sum(seconds) AS seconds, sum(seconds * volume) AS loud, sum(seconds) "
                           "FILTER (WHERE volume IS "
                           "NOT NULL) AS known, count(DISTINCT session) AS sessions FROM played GROUP BY 1), "
                           "top AS (SELECT * FROM "
                           "sums ORDER BY seconds DESC, name" +
                           limit(ReportData::kMostNames) + ") ";
  ValueMap played;
  played.set("top", tables.list("name:t seconds:d averageVolume:d sessions:i",
                                sums + "SELECT name, seconds, loud / nullif(known, 0), sessions FROM top "
                                       "ORDER BY seconds DESC, name"));
  played.set("rest",
             tables.first("names:i seconds:d", sums + "SELECT (SELECT count(*) FROM sums) - (SELECT count(*) "
                                                      "FROM top), (SELECT total(seconds) FROM sums) - "
                                                      "(SELECT total(seconds) FROM top)"));
  return played;
}

ValueMap playing(ReportTables& tables) {
  ValueMap playing;
  playing.set("byApplication", playedBy(tables, "application"));
  playing.set("byDevice", playedBy(tables, "device"));
  playing.set("byVolume",
              tables.list("sixteenths:i seconds:d",
                          "SELECT CAST(round(min(max(volume, 0), 1) * 16) AS INTEGER), sum(seconds) FROM "
                          "played WHERE volume IS NOT NULL GROUP BY 1 ORDER BY 1"));
  playing.set("onDevices",
              tables.list("application:t device:t seconds:d",
                          "SELECT application, device, sum(seconds) FROM played GROUP BY 1, 2 ORDER BY 3 "
                          "DESC" +
                              limit(ReportData::kMostNames * ReportData::kMostNames)));
  playing.set("formats", tables.list("device:t sampleRate:i channels:i format:t seconds:d",
                                     "SELECT device, sample_rate, channels, format, sum(seconds) FROM played "
                                     "WHERE coalesce(sample_rate, channels, format) IS NOT NULL GROUP BY 1, "
                                     "2, 3, 4 ORDER BY 5 DESC" +
                                         limit(ReportData::kMostNames)));
  return playing;
}

// Hours of the clock where there are few of them, else its days or weeks.
std::int64_t stepOf(const Span& span) {
  const double seconds = span.until - span.from;
  if (seconds <= 3 * kDaySeconds) return LocalOffsets::kHour;
  return seconds <= (ReportData::kMostSteps - 1) * kDaySeconds ? LocalOffsets::kDay : LocalOffsets::kWeek;
}

// The newest steps in which the audio overloaded, in their order.
ValueArray overloadsOverTime(ReportTables& tables, const LocalOffsets& offsets, std::int64_t step) {
  struct Counted {
    std::int64_t until;
    std::int64_t count = 0;
  };
  std::map<std::int64_t, Counted> steps;
  tables.each("SELECT at FROM trouble WHERE kind = 'overload' AND at BETWEEN 0 AND 253402300799",
              [&](const SqliteStatement& row) {
                const LocalOffsets::Part part = offsets.partAt(row.number(0), step);
                ++steps.try_emplace(part.from, Counted{part.until}).first->second.count;
                if (steps.size() > ReportData::kMostSteps) steps.erase(steps.begin());
              });
  std::vector<Value> rows;
  rows.reserve(steps.size());
  for (const auto& [from, counted] : steps) {
    rows.emplace_back(ValueArray{from, counted.until, counted.count});
  }
  return ValueArray(std::move(rows));
}

ValueMap issues(ReportTables& tables, const LocalOffsets& offsets, const Span& span) {
  ValueMap issues;
  issues.set("byKind", tables.list("kind:t count:i seconds:d",
                                   "SELECT kind, count(*), total(duration_seconds) FROM trouble GROUP BY 1 "
                                   "ORDER BY 2 DESC" +
                                       limit(ReportData::kMostNames)));
  issues.set("byBuffer",
             tables.list("frames:i count:i seconds:d",
                         "SELECT buffer_frames, count(*), total(duration_seconds) FROM trouble WHERE kind = "
                         "'overload' GROUP BY 1 ORDER BY 1" +
                             limit(40)));
  issues.set("byApplication",
             tables.list("application:t count:i seconds:d",
                         "SELECT application, count(*), total(duration_seconds) FROM trouble WHERE kind = "
                         "'overload' GROUP BY 1 ORDER BY 2 DESC" +
                             limit(ReportData::kMostNames)));
  const std::int64_t step = stepOf(span);
  issues.set("stepSeconds", step);
  issues.set("overTime", overloadsOverTime(tables, offsets, step));
  return issues;
}

// Whose the glitches were. Each overload counts, once for all sessions that heard it.
ValueMap glitches(ReportTables& tables) {
  ValueMap glitches =
      tables.first("count:i judged:i known:i lostMs:d",
                   "SELECT total(times), total(times) FILTER (WHERE judged), total(times) FILTER "
                   "(WHERE culprit IS NOT NULL), total(lost_ms) FROM crackled");
  const std::string sums =
      "WITH sums AS (SELECT culprit, group_concat(DISTINCT cause) AS causes, sum(times) AS times, "
      "total(lost_ms) "
      "AS lost, max(over_ms) AS worst FROM crackled GROUP BY 1), top AS (SELECT * FROM sums ORDER BY times "
      "DESC, "
      "lost DESC, culprit" +
      limit(ReportData::kMostNames) + ") ";
  glitches.set("top",
               tables.list("culprit:t causes:t count:i lostMs:d worstMs:d",
                           sums + "SELECT culprit, substr(causes, 1, 200), times, lost, worst FROM top"));
  glitches.set("rest",
               tables.first("names:i count:i lostMs:d",
                            sums + "SELECT (SELECT count(*) FROM sums) - (SELECT count(*) FROM top), "
                                   "(SELECT total(times) FROM sums) - (SELECT total(times) FROM top), "
                                   "(SELECT total(lost) FROM sums) - (SELECT total(lost) FROM top)"));
  glitches.set(
      "newest",
      tables.list("id:i at:d cause:t culprit:t process:t heard:t sessions:i over:d lost:d times:i "
                  "reason:t judged:i",
                  "SELECT id, at, cause, culprit, process, heard, sessions, over_ms, lost_ms, times, "
                  "reason, judged FROM crackled ORDER BY at DESC, id DESC" +
                      limit(ReportData::kMostListedGlitches)));
  return glitches;
}

// What a view of driver channels says for each of `keys`, of the channels that counted most. Of a channel
// with many, the rows with the same `part` are added up, so that the sums are those of all.
struct ChannelQuery {
  const char* view;
  const char* unit;
  const char* keys;
  const char* group;  // the columns' places: five for the channel, then the keys
  const char* sums;
  const char* weight;
  const char* order;    // of a channel's rows, whose numbers `place` count from 0 to `places`
  std::string part;     // an expression
  std::string columns;  // of the rows of a part
};

ValueMap ofChannels(ReportTables& tables, const char* columns, const ChannelQuery& query) {
  const std::string summed =
      std::string(
          "summed AS (SELECT coalesce(driver, '') AS driver, coalesce(group_name, '') AS grouped, "
          "coalesce(subgroup, '') AS subgroup, coalesce(name, '') AS name, ") +
      query.unit + " AS unit, " + query.keys + ", " + query.sums + " FROM main." + query.view + " WHERE " +
      ReportTables::kInTime + " AND " + ReportTables::kInSessions + " GROUP BY " + query.group + ")";
  const std::string top = std::string("top AS (SELECT driver, grouped, subgroup, name, unit, total(") +
                          query.weight +
                          ") AS weight FROM summed GROUP BY 1, 2, 3, 4, 5 ORDER BY weight DESC" +
                          limit(ReportData::kMostChannels) + ")";
  const std::string placed = std::string(
                                 "placed AS (SELECT summed.*, top.weight AS weight, row_number() OVER "
                                 "(PARTITION BY driver, grouped, subgroup, name, unit ORDER BY ") +
                             query.order +
                             ") - 1 AS place, count(*) OVER (PARTITION BY driver, grouped, subgroup, name, "
                             "unit) AS places FROM summed JOIN top USING (driver, grouped, subgroup, name, "
                             "unit))";
  return tables.list(columns, "WITH " + summed + ", " + top + ", " + placed +
                                  " SELECT driver, grouped, subgroup, name, unit, " + query.columns +
                                  " FROM placed GROUP BY driver, grouped, subgroup, name, unit, " +
                                  query.part + " ORDER BY max(weight) DESC, 1, 2, 3, 4, 5, 6");
}

ValueMap drivers(ReportTables& tables) {
  ValueMap drivers;
  const std::string most = std::to_string(ReportData::kMostParts);
  drivers.set(
      "buckets",
      ofChannels(tables, "driver:t group:t subgroup:t name:t unit:t lower:i upper:i hits:i",
                 {"channel_bucket", "coalesce(unit, '')", "lower, upper", "1, 2, 3, 4, 5, 6, 7",
                  "sum(hits) AS hits", "hits", "lower, upper", "place * min(places, " + most + ") / places",
                  "min(lower), max(upper), sum(hits)"}));
  const std::string state =
      "CASE WHEN places <= " + most + " OR place < " + most + " - 1 THEN state ELSE 'all other states' END";
  drivers.set(
      "states",
      ofChannels(tables, "driver:t group:t subgroup:t name:t unit:t state:t transitions:i residency:i",
                 {"channel_state", "''", "state", "1, 2, 3, 4, 5, 6",
                  "sum(transitions) AS transitions, sum(residency) AS residency", "residency",
                  "residency DESC, state", state, state + ", sum(transitions), sum(residency)"}));
  drivers.set(
      "values",
      tables.list("driver:t group:t subgroup:t name:t unit:t sum:i",
                  std::string("SELECT driver, group_name, subgroup, name, unit, sum(value) FROM "
                              "main.channel_value WHERE ") +
                      ReportTables::kInTime + " AND " + ReportTables::kInSessions +
                      "GROUP BY 1, 2, 3, 4, 5 ORDER BY 1, 2, 3, 4" + limit(5 * ReportData::kMostChannels)));
  return drivers;
}

ValueMap haptics(ReportTables& tables) {
  return tables.list(
      "application:t count:i seconds:d",
      "SELECT application, count(*), total(seconds) FROM felt WHERE NOT leaked GROUP BY 1 ORDER BY 3 DESC" +
          limit(ReportData::kMostNames));
}

// What only the page of one session says.
ValueMap sessionFacts(ReportTables& tables) {
  ValueMap facts = tables.first(
      "id:i reporter:i service:t application:t process:t user:i started:d ended:d ending:t messages:i "
      "uniqueMessages:i redundantMessages:i activeSeconds:d overloads:i",
      "SELECT id, reporter_id, service, application, process, user_id, started_at, ended_at, ending, "
      "messages, "
      "unique_messages, redundant_messages, active_seconds, overloads FROM shown");
  facts.set("kinds",
            tables.list("category:t type:t source:t count:i first:d last:d",
                        std::string("SELECT category, type, source, count(*), min(at), max(at) FROM "
                                    "main.event WHERE session = ?4 AND ") +
                            ReportTables::kInTime + "GROUP BY 1, 2, 3 ORDER BY 4 DESC, 1, 2, 3" + limit(60)));
  facts.set("played", tables.list("started:d ended:d seconds:d device:t volume:d ringer:i",
                                  "SELECT started, ended, seconds, device, volume, ringer FROM played ORDER "
                                  "BY started" +
                                      limit(ReportData::kMostRows)));
  facts.set("heard", tables.list("started:d ended:d seconds:d device:t mode:t",
                                 "SELECT started, ended, seconds, device, mode FROM heard ORDER BY started" +
                                     limit(ReportData::kMostRows)));
  facts.set("issues", tables.list("at:d kind:t node:t seconds:d frames:i",
                                  "SELECT at, kind, node, duration_seconds, buffer_frames FROM trouble ORDER "
                                  "BY at" +
                                      limit(ReportData::kMostRows)));
  return facts;
}

ValueMap runningPlayback(ReportTables& tables) {
  return tables.list(
      "reporter:i started:d at:d running:i volume:d device:t ringer:i application:t",
      "SELECT s.reporter_id, s.started_at, coalesce(e.payload ->> 'twreporting_timestamp', e.at), e.payload "
      "->> 'session_output_running' AS running, e.payload ->> 'QMSessionVolume' AS volume, e.payload ->> "
      "'active_devices' AS device, e.payload ->> 'ringerstate' AS ringer, s.application FROM (SELECT id, "
      "reporter_id, started_at, application FROM shown WHERE ending IS NULL ORDER BY started_at DESC" +
          limit(ReportData::kMostRunning) +
          ") AS s JOIN main.event AS e ON e.session = s.id WHERE e.source = 'client' AND coalesce(running, "
          "volume, device, ringer) IS NOT NULL ORDER BY e.id DESC" +
          limit(ReportData::kMostSaid));
}

// Why a session that the store has is not in the scope; empty when the store does not have it.
std::string outsideOfScope(ReportTables& tables, const ReportScope& scope) {
  const ValueMap found = tables.first(
      "id:i application:t fits:i",
      "SELECT id, application, ?3 IS NULL OR coalesce(application GLOB ?3, 0) FROM main.session WHERE id = "
      "?4");
  if (found.empty()) return {};
  const std::string session = tables.path() + ": session " + std::to_string(*scope.session);
  if (found.integer("fits") == 1) return session + " was not open in the time of --since and --until";
  return session + " is not of an application that " + *scope.application + " fits";
}

// "session 12 is not in ...", with the sessions that a reader may have meant.
std::string unknownSession(ReportTables& tables, std::int64_t session) {
  std::string similar;
  tables.each("SELECT id FROM main.session WHERE reporter_id = ?4 ORDER BY id DESC LIMIT 5",
              [&](const SqliteStatement& row) {
                similar += (similar.empty() ? "" : ", ") + std::to_string(row.integer(0));
              });
  std::string problem = tables.path() + ": no session has the id " + std::to_string(session);
  if (similar.empty()) return problem + "; the view session lists them";
  return problem + "; the reporter identifier " + std::to_string(session) +
         " is that of these sessions, newest first: " + similar;
}

}  // namespace

ReportData ReportData::read(const std::string& directory, const ReportScope& scope, double now) {
  ReportData report;
  ReportTables tables(scope);
  if (!tables.open(directory, now)) {
    report.problem = tables.problem();
    return report;
  }
  ValueMap& data = report.data;
  data.set("totals", totals(tables));
  if (scope.session && data.find("totals")->asMap()->integer("sessions") == 0) {
    report.problem = outsideOfScope(tables, scope);
    report.isUnknownSession = report.problem.empty();
    if (report.isUnknownSession) report.problem = unknownSession(tables, *scope.session);
    if (!tables.problem().empty()) report.problem = tables.problem();
    return report;
  }
  const Span span = spanOf(tables, scope, now);
  const LocalOffsets offsets(span.from, std::max(span.until, now));
  data.set("from", span.from);
  data.set("until", span.until);
  data.set("generated", now);
  data.set("zone", offsets.zone());
  data.set("offsets", changesOf(offsets));
  data.set("timeline", timeline(tables));
  data.set("hours", hoursOf(tables, offsets, span));
  data.set("playing", playing(tables));
  data.set("issues", issues(tables, offsets, span));
  data.set("glitches", glitches(tables));
  data.set("drivers", drivers(tables));
  data.set("haptics", haptics(tables));
  if (scope.session) data.set("session", sessionFacts(tables));
  if (scope.hasRunning) report.running = runningPlayback(tables);
  report.problem = tables.problem();
  return report;
}

}  // namespace tonewerk
