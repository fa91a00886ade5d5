// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "platform/linux/store/SqliteDatabase.h"
#include "tools/twctl/report/ReportScope.h"
#include "values/Value.h"

namespace tonewerk {

// Reads the views of a report store for a report. Used by one thread.
//
// Each view is read once. What is in the scope goes into temporary tables, which SQLite writes to a temporary
// file when they are large. So a report sees one state of the store, and needs little memory.
//
//   shown    the sessions, with the columns of the view
//   played   the volume stretches: session, application, device, volume (null unless 0 to 1), ringer,
//            sample_rate, channels, format, started, ended, seconds, misplaced (0, 1)
//   heard    the input stretches: session, device, mode, started, ended, seconds, misplaced
//   trouble  the issues: at, session, application, kind, node, duration_seconds, buffer_frames
//   crackled the glitches, each once for all its sessions: id (of an event), at (when it happened), cause (of
//            the first in the chain), culprit (an application, a process, or "the device"), process, heard
//            (an application), sessions, reason, over_ms, lost_ms, times, judged (0, 1). Texts are cut.
//            Empty for a store without that view
//   felt     the haptics: at, application, leaked (0, 1), seconds
//
// Stretches that are only partly in the scope's time are cut, and have this part of their seconds. Programs
// choose the times of stretches. Those more than a day before the oldest record, or after now and the newest
// one, cannot be: such a stretch is misplaced and has no times.
class ReportTables {
 public:
  // `scope` outlives it.
  explicit ReportTables(const ReportScope& scope) : scope_(scope) {}

  // Opens the store in `directory` and makes the tables. `now` in seconds since 1970. False on failure, with
  // the reason in problem().
  [[nodiscard]] bool open(const std::string& directory, double now);

  // Runs `sql`, in which ?1 to ?4 are the scope's since, until, application and session, or null. Calls
  // `take` for each row. After a failure this and later calls do nothing.
  void each(const std::string& sql, const std::function<void(const SqliteStatement& row)>& take);
  void run(const std::string& sql);

  // The rows of a query as {"columns": [names], "rows": [[values]]}. `columns` describes each column by its
  // name and its kind: "application:t seconds:d", where t is a text, i an integer and d a double. A null
  // becomes NaN, which is null in JSON. Doubles are rounded to a ten-thousandth.
  [[nodiscard]] ValueMap list(std::string_view columns, const std::string& sql);
  // The first row of the query as a map with the columns as its keys; empty without a row.
  [[nodiscard]] ValueMap first(std::string_view columns, const std::string& sql);

  // Empty when nothing has failed.
  const std::string& problem() const { return problem_; }
  const std::string& path() const { return path_; }

  // The conditions on a row's time and on its session, for queries of other views.
  static constexpr const char* kInTime = " (?1 IS NULL OR at >= ?1) AND (?2 IS NULL OR at <= ?2) ";
  static constexpr const char* kInSessions =
      " (?4 IS NULL OR session = ?4) AND (?3 IS NULL OR session IN (SELECT id FROM shown)) ";

 private:
  [[nodiscard]] bool openFile(const std::string& directory);
  [[nodiscard]] bool hasViews();
  [[nodiscard]] bool hasGlitches();
  // The condition on a stretch whose times cannot be.
  std::string misplacedBefore(double now);
  bool fail(const std::string& problem);

  const ReportScope& scope_;
  std::string path_;
  SqliteDatabase database_;
  std::string problem_;
};

}  // namespace tonewerk
