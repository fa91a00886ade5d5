// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/glitches/StoredGlitches.h"

#include <algorithm>
#include <utility>

#include "tools/twctl/sessions/ViewRows.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

// An overload that nobody has judged has no name of its own, and is then named after its event.
constexpr const char* kName = "coalesce(glitch_id, 'event ' || id)";
// The worst session of a glitch comes first.
constexpr const char* kWorstFirst = "coalesce(over_ms, -1) DESC, coalesce(lost_ms, -1) DESC, id";

// A view that an earlier daemon has not made.
bool hasView(SqlReader& reader, std::string& problem) {
  bool isThere = false;
  if (!eachRow(reader, "SELECT 1 FROM sqlite_master WHERE name = 'glitch'", {}, problem,
               [&](const ViewRow&) { isThere = true; })) {
    return false;
  }
  if (!isThere) {
    problem =
        "the store does not know glitches yet; a daemon of this version adds them when it opens the file";
  }
  return isThere;
}

// The parameters ?1 to ?3.
std::vector<std::optional<std::string>> patternsOf(const GlitchFilter& filter) {
  return {filter.application, filter.device, filter.service};
}

// `chosen`: the rows of the filter, without their cycles, which are long.
std::string chosen(const GlitchFilter& filter) {
  std::string sql = std::string("chosen AS MATERIALIZED (SELECT ") + kName +
                    " AS name, id, at, began_at, coalesce(began_at, at) AS happened, glitch_id, session, "
                    "application, cause, first_cause, confidence, culprit_application, culprit_process, "
                    "culprit_pid, culprit_node, node, device, chain, over_ms, period_ms, quantum, rate, "
                    "lost_ms, overloads, reason FROM glitch WHERE 1";
  if (filter.since) sql += " AND coalesce(began_at, at) >= " + textOf(*filter.since);
  if (filter.until) sql += " AND coalesce(began_at, at) <= " + textOf(*filter.until);
  if (filter.session) sql += " AND session = " + std::to_string(*filter.session);
  if (filter.application) sql += " AND (application GLOB ?1 OR culprit_application GLOB ?1)";
  if (filter.device) sql += " AND device GLOB ?2";
  if (filter.service) sql += " AND coalesce(service, 'unknown') GLOB ?3";
  return sql + ")";
}

// `one`: a row for each glitch, that of its worst session, with what its sessions have together.
std::string grouped(const GlitchFilter& filter) {
  return "WITH " + chosen(filter) +
         ", sums AS (SELECT name AS sum_of, min(happened) AS first_at, count(DISTINCT session) AS sessions, "
         "count(DISTINCT application) AS applications, min(application) AS heard_by, max(overloads) AS "
         "times, "
         "max(lost_ms) AS lost FROM chosen GROUP BY name), one AS (SELECT * FROM (SELECT *, row_number() "
         "OVER "
         "(PARTITION BY name ORDER BY " +
         kWorstFirst + ") AS place FROM chosen) JOIN sums ON sum_of = name WHERE place = 1)";
}

StoredGlitch glitchOf(const ViewRow& row) {
  constexpr int kAfterVerdict = 22;
  StoredGlitch glitch;
  glitch.verdict = GlitchVerdict::of(row);
  glitch.sessions = row.integer(kAfterVerdict).value_or(0);
  glitch.applications = row.integer(kAfterVerdict + 1).value_or(0);
  glitch.heardBy = row.text(kAfterVerdict + 2);
  glitch.overloads = row.integer(kAfterVerdict + 3).value_or(1);
  glitch.lostMs = row.number(kAfterVerdict + 4);
  return glitch;
}

// What the glitches are added up by. What has caused a glitch may be no application.
const char* expressionOf(GlitchKey key) {
  switch (key) {
    case GlitchKey::kApplication:
      return "coalesce(culprit_application, CASE coalesce(first_cause, cause) WHEN 'device' THEN 'the "
             "device' "
             "WHEN 'graph changed' THEN 'a change of the graph' WHEN 'system slept' THEN 'the system''s "
             "sleep' "
             "END, culprit_process, culprit_node)";
    case GlitchKey::kCause:
      return "coalesce(first_cause, cause)";
    case GlitchKey::kDevice:
      return "device";
    case GlitchKey::kHour:
      break;
  }
  return "strftime('%Y-%m-%d %H:00', happened, 'unixepoch', 'localtime')";
}

// The glitches that a person may have meant: the nearest in time where the text begins with one, as
// identifiers do, else the newest.
std::string nearest(SqlReader& reader, const std::string& id) {
  constexpr std::size_t kLeastDigits = 12;  // of milliseconds since 1970
  constexpr std::size_t kMostDigits = 15;
  const std::size_t digits = std::min(id.find_first_not_of("0123456789"), id.size());
  const bool hasTime = digits >= kLeastDigits && digits <= kMostDigits;
  const std::string order = hasTime ? "abs(min(coalesce(began_at, at)) * 1000 - " + id.substr(0, digits) + ")"
                                    : "min(coalesce(began_at, at)) DESC";
  std::string found;
  std::string ignored;
  (void)eachRow(reader,
                std::string("SELECT min(id), glitch_id FROM glitch GROUP BY ") + kName + " ORDER BY " +
                    order + " LIMIT 3",
                {}, ignored, [&](const ViewRow& row) {
                  found += found.empty() ? "" : ", ";
                  found += row.text(1).value_or(std::to_string(row.integer(0).value_or(0)));
                });
  if (found.empty()) return "; it has no glitches";
  return (hasTime ? "; the nearest ones are: " : "; the newest ones are: ") + found;
}

// What name the glitch has that a person calls `id`; none when there is none.
std::optional<std::string> nameOf(SqlReader& reader, const std::string& id, std::string& problem) {
  std::optional<std::string> name;
  const std::string select = std::string("SELECT ") + kName + " FROM glitch ";
  const auto take = [&](const ViewRow& row) { name = row.text(0); };
  if (!eachRow(reader, select + "WHERE glitch_id = ?1 LIMIT 1", {id}, problem, take) || name) return name;
  constexpr std::size_t kMostDigits = 18;
  const bool isNumber =
      !id.empty() && id.size() <= kMostDigits && id.find_first_not_of("0123456789") == std::string::npos;
  if (isNumber) (void)eachRow(reader, select + "WHERE id = " + id, {}, problem, take);
  return name;
}

}  // namespace

bool readGlitches(SqlReader& reader, const GlitchFilter& filter, std::string& problem,
                  const std::function<void(const StoredGlitch& glitch)>& take) {
  if (!hasView(reader, problem)) return false;
  std::string rows = "SELECT * FROM one";
  if (filter.limit) {
    rows += " ORDER BY first_at DESC, id DESC LIMIT " + std::to_string(*filter.limit);
  }
  return eachRow(reader,
                 grouped(filter) + " SELECT " + GlitchVerdict::columns() +
                     ", sessions, applications, substr(heard_by, 1, 100), times, lost FROM (" + rows +
                     ") ORDER BY first_at, id",
                 patternsOf(filter), problem, [&](const ViewRow& row) { take(glitchOf(row)); });
}

std::optional<GlitchSums> sumGlitches(SqlReader& reader, const GlitchFilter& filter, GlitchKey key,
                                      std::string& problem) {
  if (!hasView(reader, problem)) return std::nullopt;
  GlitchSums found;
  const std::string order = key == GlitchKey::kHour ? "min(first_at)" : "2 DESC, 3 DESC, 1";
  const bool isRead = eachRow(reader,
                              grouped(filter) + " SELECT substr(" + expressionOf(key) +
                                  ", 1, 100), sum(times), total(lost), max(over_ms), min(first_at), "
                                  "max(first_at) FROM one GROUP BY 1 "
                                  "ORDER BY " +
                                  order,
                              patternsOf(filter), problem, [&](const ViewRow& row) {
                                GlitchSum sum{.key = row.text(0),
                                              .glitches = row.integer(1).value_or(0),
                                              .lostMs = row.number(2).value_or(0.0),
                                              .worstMs = row.number(3),
                                              .firstAt = row.number(4).value_or(0.0),
                                              .lastAt = row.number(5).value_or(0.0)};
                                found.glitches += sum.glitches;
                                found.sums.push_back(std::move(sum));
                              });
  if (!isRead) return std::nullopt;
  std::vector<GlitchSum>& sums = found.sums;
  for (GlitchSum& sum : sums) {
    sum.share = static_cast<double>(sum.glitches) / static_cast<double>(found.glitches);
  }
  if (filter.limit && static_cast<std::size_t>(*filter.limit) < sums.size()) {
    const auto most = static_cast<std::ptrdiff_t>(*filter.limit);
    // Of hours the newest ones.
    key == GlitchKey::kHour ? sums.erase(sums.begin(), sums.end() - most)
                            : sums.erase(sums.begin() + most, sums.end());
  }
  return found;
}

std::optional<GlitchInSessions> readGlitch(SqlReader& reader, const std::string& id, std::string& problem) {
  if (!hasView(reader, problem)) return std::nullopt;
  const std::optional<std::string> name = nameOf(reader, id, problem);
  if (!problem.empty()) return std::nullopt;
  if (!name) {
    problem = "the store has no glitch \"" + id + "\"" + nearest(reader, id);
    return std::nullopt;
  }
  GlitchInSessions glitch;
  const std::string where = std::string(" FROM glitch WHERE ") + kName + " = ?1";
  const bool isRead =
      eachRow(reader,
              std::string("SELECT ") + GlitchVerdict::columns() + where + " ORDER BY " + kWorstFirst +
                  " LIMIT " + std::to_string(GlitchInSessions::kMostSessions),
              {name}, problem,
              [&](const ViewRow& row) { glitch.verdicts.push_back(GlitchVerdict::of(row)); }) &&
      eachRow(reader, "SELECT count(DISTINCT session)" + where, {name}, problem,
              [&](const ViewRow& row) { glitch.sessions = row.integer(0).value_or(0); }) &&
      eachRow(reader,
              "SELECT cycles" + where + " AND length(cycles) <= 65536 ORDER BY " + kWorstFirst + " LIMIT 1",
              {name}, problem, [&](const ViewRow& row) { glitch.cycles = row.text(0).value_or(""); });
  if (!isRead || glitch.verdicts.empty()) return std::nullopt;
  return glitch;
}

}  // namespace tonewerk
