// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/ReportTables.h"

#include <chrono>
#include <cmath>
#include <cstddef>
#include <filesystem>
#include <iomanip>
#include <limits>
#include <sstream>
#include <system_error>
#include <utility>
#include <vector>

#include "platform/linux/store/StoreFile.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kPatience{5};
constexpr std::int64_t kViews = 9;

constexpr const char* kShown =
    "CREATE TEMP TABLE shown AS SELECT id, reporter_id, service, application, process, user_id, started_at, "
    "ended_at, ending, messages, unique_messages, redundant_messages, active_seconds, overloads FROM "
    "main.session WHERE (?4 IS NULL OR id = ?4) AND (?1 IS NULL OR coalesce(ended_at, 1e18) >= ?1) AND "
    "(?2 IS NULL OR started_at <= ?2) AND (?3 IS NULL OR application GLOB ?3)";

// A stretch without both times is not cut. Without either, as those that an earlier version has stored, the
// time of its recording says whether it is in the scope's time. `misplaced`: whether its times cannot be.
std::string stretches(const char* table, const char* columns, const char* view,
                      const std::string& misplaced) {
  constexpr const char* kRecorded = "(SELECT at FROM main.event WHERE event.id = stretch.id)";
  return std::string("CREATE TEMP TABLE ") + table + " AS SELECT " + columns +
         ", misplaced, max(began, coalesce(?1, began)) AS started, min(finished, coalesce(?2, finished)) AS "
         "ended, max(0.0, seconds) * coalesce((min(finished, coalesce(?2, finished)) - max(began, "
         "coalesce(?1, began))) / nullif(finished - began, 0), 1.0) AS seconds FROM (SELECT *, CASE WHEN NOT "
         "misplaced THEN started_at END AS began, CASE WHEN NOT misplaced THEN ended_at END AS finished FROM "
         "(SELECT *, " +
         misplaced + " AS misplaced FROM main." + view +
         ")) AS stretch WHERE (?4 IS NULL OR session = ?4) AND (?1 IS NULL OR coalesce(finished, began, " +
         kRecorded + ") >= ?1) AND (?2 IS NULL OR coalesce(began, finished, " + kRecorded +
         ") <= ?2) AND (?3 IS NULL OR application GLOB ?3)";
}

std::string trouble() {
  return std::string(
             "CREATE TEMP TABLE trouble AS SELECT at, session, application, kind, node, duration_seconds, "
             "buffer_frames FROM main.issue WHERE (?4 IS NULL OR session = ?4) AND (?3 IS NULL OR "
             "application GLOB ?3) AND ") +
         ReportTables::kInTime;
}

// Only what says for how long the engine was on. A power event has no session: one of a session's application
// during its life counts for the session.
std::string felt() {
  return std::string(
             "CREATE TEMP TABLE felt AS SELECT at, application, name IS 'LeakedHapticsSessionInfo' AS "
             "leaked, "
             "seconds FROM main.haptics WHERE seconds IS NOT NULL AND (?3 IS NULL OR application GLOB ?3) "
             "AND (?4 IS NULL OR EXISTS (SELECT 1 FROM shown WHERE "
             "shown.application = haptics.application AND at >= shown.started_at AND "
             "(shown.ended_at IS NULL OR at <= shown.ended_at))) AND ") +
         ReportTables::kInTime;
}

// A glitch is said in the words of the session that it was worst for. One that nobody has judged has no name.
std::string crackled() {
  constexpr const char* kCulprit =
      "coalesce(culprit_application, CASE coalesce(first_cause, cause) WHEN 'device' THEN 'the device' WHEN "
      "'graph changed' THEN 'a change of the graph' WHEN 'system slept' THEN 'the system''s sleep' END, "
      "culprit_process, culprit_node)";
  std::string sql = "CREATE TEMP TABLE crackled AS WITH chosen AS MATERIALIZED (SELECT ";
  sql.append("coalesce(glitch_id, 'event ' || id) AS name, id, coalesce(began_at, at) AS happened, session,");
  sql.append(" substr(application, 1, 100) AS application, substr(coalesce(first_cause, cause), 1, 40) AS");
  sql.append(" cause, substr(").append(kCulprit).append(", 1, 100) AS culprit, substr(culprit_process, 1,");
  sql.append(" 100) AS process, substr(reason, 1, 300) AS reason, over_ms, lost_ms, overloads,");
  sql.append(" coalesce(glitch_id, cause, first_cause) IS NOT NULL AS judged FROM main.glitch");
  sql.append(" WHERE (?4 IS NULL OR session = ?4) AND (?3 IS NULL OR application GLOB ?3) AND ");
  sql.append(ReportTables::kInTime);
  sql.append("), sums AS (SELECT name AS sum_of, min(happened) AS first_at, count(DISTINCT session) AS");
  sql.append(
      " sessions, max(overloads) AS times, max(lost_ms) AS lost FROM chosen GROUP BY name) SELECT id,");
  sql.append(
      " first_at AS at, cause, culprit, process, application AS heard, sessions, reason, over_ms, lost");
  sql.append(" AS lost_ms, times, judged FROM (SELECT *, row_number() OVER (PARTITION BY name ORDER BY");
  return sql.append(
      " coalesce(over_ms, -1) DESC, id) AS place FROM chosen) JOIN sums ON sum_of = name WHERE place = 1");
}

constexpr const char* kNoneCrackled =
    "CREATE TEMP TABLE crackled (id, at, cause, culprit, process, heard, sessions, reason, over_ms, lost_ms, "
    "times, judged)";

struct Column {
  std::string name;
  char kind;
};

std::vector<Column> columnsOf(std::string_view text) {
  std::vector<Column> columns;
  while (!text.empty()) {
    const std::string_view column = text.substr(0, text.find(' '));
    text.remove_prefix(std::min(column.size() + 1, text.size()));
    columns.push_back({std::string(column.substr(0, column.size() - 2)), column.back()});
  }
  return columns;
}

Value cell(const SqliteStatement& row, int column, char kind) {
  constexpr double kPerUnit = 10'000.0;
  if (row.isNull(column)) return std::numeric_limits<double>::quiet_NaN();
  if (kind == 't') return row.text(column);
  if (kind == 'i') return row.integer(column);
  return std::round(row.number(column) * kPerUnit) / kPerUnit;
}

}  // namespace

bool ReportTables::open(const std::string& directory, double now) {
  if (!openFile(directory) || !hasViews()) return false;
  run("BEGIN");
  run(kShown);
  const std::string misplaced = misplacedBefore(now);
  run(stretches("played",
                "session, application, device, CASE WHEN volume BETWEEN 0 AND 1 THEN volume END AS volume, "
                "ringer, sample_rate, channels, format",
                "volume_stretch", misplaced));
  run(stretches("heard", "session, device, mode", "input_stretch", misplaced));
  run(trouble());
  run(hasGlitches() ? crackled() : kNoneCrackled);
  run(felt());
  return problem_.empty();
}

void ReportTables::each(const std::string& sql, const std::function<void(const SqliteStatement& row)>& take) {
  if (!problem_.empty()) return;
  if (scope_.stop.stop_requested()) {
    fail("the reading was stopped");
    return;
  }
  SqliteStatement statement = database_.prepare(sql);
  if (scope_.since) statement.bind(1, *scope_.since);
  if (scope_.until) statement.bind(2, *scope_.until);
  if (scope_.application) statement.bind(3, std::string_view(*scope_.application));
  if (scope_.session) statement.bind(4, *scope_.session);
  for (;;) {
    switch (statement.step()) {
      case SqliteStatement::Step::kRow:
        take(statement);
        break;
      case SqliteStatement::Step::kDone:
        return;
      case SqliteStatement::Step::kFailed:
        fail(database_.problem());
        return;
    }
  }
}

void ReportTables::run(const std::string& sql) {
  each(sql, [](const SqliteStatement&) {});
}

ValueMap ReportTables::list(std::string_view columns, const std::string& sql) {
  const std::vector<Column> kinds = columnsOf(columns);
  std::vector<Value> names;
  names.reserve(kinds.size());
  for (const Column& column : kinds) names.emplace_back(column.name);
  std::vector<Value> rows;
  each(sql, [&](const SqliteStatement& row) {
    std::vector<Value> cells;
    cells.reserve(kinds.size());
    for (std::size_t i = 0; i < kinds.size(); ++i) {
      cells.push_back(cell(row, static_cast<int>(i), kinds[i].kind));
    }
    rows.emplace_back(ValueArray(std::move(cells)));
  });
  return {{"columns", ValueArray(std::move(names))}, {"rows", ValueArray(std::move(rows))}};
}

ValueMap ReportTables::first(std::string_view columns, const std::string& sql) {
  const std::vector<Column> kinds = columnsOf(columns);
  ValueMap found;
  each(sql, [&](const SqliteStatement& row) {
    if (!found.empty()) return;
    for (std::size_t i = 0; i < kinds.size(); ++i) {
      found.set(kinds[i].name, cell(row, static_cast<int>(i), kinds[i].kind));
    }
  });
  return found;
}

bool ReportTables::openFile(const std::string& directory) {
  path_ = storeFileIn(directory).path;
  std::error_code error;
  if (!std::filesystem::exists(path_, error)) {
    return fail(error ? error.message() : "there is no such file");
  }
  if (database_.open(path_, SqliteDatabase::Mode::kReadOnly, kPatience) &&
      database_.number("PRAGMA user_version")) {
    return true;
  }
  // Reading needs a side file, which a user without write permission for the directory cannot make. Without
  // one the file does not change, so that it can be read as it is.
  const std::string problem = database_.problem();
  database_.close();
  if (std::filesystem::exists(path_ + "-wal", error)) return fail(problem);
  return database_.open(path_, SqliteDatabase::Mode::kImmutable, kPatience) || fail(database_.problem());
}

std::string ReportTables::misplacedBefore(double now) {
  constexpr double kDay = 86'400.0;
  constexpr std::int64_t kDecimals = 3;
  // The daemon dates sessions and events. Events are in the order of their identifiers, so few are read.
  const ValueMap times = first(
      "oldest:d newest:d",
      "SELECT min(t), max(t) FROM (SELECT min(started_at) AS t FROM main.session UNION ALL SELECT "
      "max(coalesce(ended_at, started_at)) FROM main.session UNION ALL SELECT * FROM (SELECT at FROM "
      "main.event ORDER BY id LIMIT 1) UNION ALL SELECT * FROM (SELECT at FROM main.event ORDER BY id DESC "
      "LIMIT 1))");
  const double oldest = times.number("oldest");
  const double newest = times.number("newest");
  const auto text = [](double time) {
    std::ostringstream stream;
    stream << std::fixed << std::setprecision(kDecimals) << time;
    return stream.str();
  };
  const std::string least = text(oldest > 0.0 ? oldest - kDay : 0.0);
  const std::string most = text((newest > now ? newest : now) + kDay);
  return "coalesce(started_at NOT BETWEEN " + least + " AND " + most +
         ", 0) OR coalesce(ended_at NOT BETWEEN " + least + " AND " + most + ", 0)";
}

bool ReportTables::hasViews() {
  const auto views = database_.number(
      "SELECT count(*) FROM sqlite_master WHERE name IN ('session', 'event', 'volume_stretch', "
      "'input_stretch', 'issue', 'haptics', 'channel_value', 'channel_bucket', 'channel_state')");
  if (!views) return fail(database_.problem());
  if (*views == kViews) return true;
  return fail(
      "it has no views for reports; a daemon of this version adds them when it opens the file, and an empty "
      "file gets them with the first report");
}

// A daemon of this version adds this view to older stores. A report needs no glitches.
bool ReportTables::hasGlitches() {
  return database_.number("SELECT count(*) FROM sqlite_master WHERE name = 'glitch'").value_or(0) == 1;
}

bool ReportTables::fail(const std::string& problem) {
  problem_ = path_ + ": " + problem;
  return false;
}

}  // namespace tonewerk
