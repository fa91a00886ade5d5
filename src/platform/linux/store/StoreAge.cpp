// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreAge.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "platform/Clock.h"

namespace tonewerk {
namespace {

constexpr double kMarkSeconds = std::chrono::duration<double>(StoreAge::kMarkInterval).count();
constexpr double kDaySeconds = 86'400.0;
// The clocks of two starts agree so far when no reboot and no jump is between them.
constexpr double kSameBootSeconds = 10.0;
// At one start rows become older by at most this part of the bound because of the wall clock alone.
constexpr double kTimeOffPart = 0.25;

double secondsOf(std::chrono::nanoseconds time) { return std::chrono::duration<double>(time).count(); }

// The columns of a mark that name rows.
std::string rowColumns() {
  std::string sql;
  for (const StoreTable& table : kStoreTables) sql.append(sql.empty() ? "" : ", ").append(table.name);
  return sql;
}

}  // namespace

// The two clocks cannot be read at once. A thread that was stopped between the reads must not find a jump.
StoreAge::Moment StoreAge::readClocks() const {
  constexpr int kTries = 5;
  Moment now;
  for (int tries = 0; tries < kTries; ++tries) {
    const double before = secondsOf(clock_.monotonic());
    now.wall = clock_.now();
    now.uptime = secondsOf(clock_.monotonic());
    if (now.uptime - before < 1.0) break;
  }
  return now;
}

void StoreAge::noteJump(const Moment& now) {
  const double offset = now.wall - now.uptime;
  if (!offset_) offset_ = offset;
  const double jump = offset - *offset_;
  if (std::fabs(jump) <= kJumpSeconds) return;
  offset_ = offset;
  jump_ += jump;
  jumpToFollow_ += jump;
}

bool StoreAge::open(bool isKnownFile) {
  const Moment now = readClocks();
  noteJump(now);
  jumpToFollow_ = 0.0;  // the start takes the wall clock as it is
  return database_.run("BEGIN IMMEDIATE") && openInTransaction(now, isKnownFile) && database_.run("COMMIT");
}

bool StoreAge::openInTransaction(const Moment& now, bool isKnownFile) {
  bool failed = false;
  std::optional<LastTime> last = readLastTime(failed);
  if (failed) return false;
  const std::optional<double> newestRow = newestRowTime(failed);
  if (failed) return false;
  if (!last) {
    if (newestRow && !markFromRowTimes(*newestRow)) return false;
    last = LastTime{0.0, newestRow.value_or(now.wall), std::nullopt};
  }
  // What has passed for certain. After a reboot that is the time since the boot.
  double passed = 0.0;
  if (last->uptime) passed = now.uptime >= *last->uptime ? now.uptime - *last->uptime : now.uptime;
  const bool isSameBoot = last->uptime && now.uptime >= *last->uptime &&
                          std::fabs(now.wall - last->wall - passed) <= kSameBootSeconds;
  const bool isCertain = isSameBoot || (isKnownFile && last->uptime);
  ageAtBase_ = last->age + passed;
  uptimeAtBase_ = now.uptime;
  SqliteStatement newestMark = database_.prepare("SELECT coalesce(max(age), 0.0) FROM age_mark");
  if (newestMark.step() != SqliteStatement::Step::kRow) return false;
  lastMark_ = newestMark.number(0);
  newestMark.reset();
  if (!isCertain || ageAtBase_ - lastMark_ > kMarkSeconds) {
    // An earlier daemon, which makes no marks, may have inserted rows for longer than an hour.
    const double byRows = last->age + newestRow.value_or(last->wall) - last->wall;
    const double rowsAge = std::min(std::max(lastMark_ + kMarkSeconds, byRows), ageAtBase_);
    double timeOff = isCertain ? 0.0 : now.wall - last->wall - passed;
    if (!last->uptime) timeOff = std::max(0.0, timeOff);  // only rows have said what time it was
    if (!addMark(rowsAge, 0.0) || !addMark(ageAtBase_, timeOff)) return false;
  }
  startMark_.reset();
  if (!isCertain) {
    startMark_ = database_.number("SELECT max(id) FROM age_mark");
    if (!startMark_) return false;
  }
  const auto withTimeOff = database_.number("SELECT count(*) FROM age_mark WHERE time_off > 0");
  if (!withTimeOff) return false;
  timeOffDue_.reset();
  if (startMark_ || *withTimeOff > 0) timeOffDue_ = now.uptime + kMarkSeconds;
  return writeClock(now);
}

bool StoreAge::follow(double bound) {
  const Moment now = readClocks();
  noteJump(now);
  const bool isDue = ageAt(now) - lastMark_ >= kMarkSeconds || (timeOffDue_ && now.uptime >= *timeOffDue_);
  if (!isDue && jumpToFollow_ == 0.0) return true;
  return database_.run("BEGIN IMMEDIATE") && followInTransaction(now, bound) && database_.run("COMMIT");
}

bool StoreAge::followInTransaction(const Moment& now, double bound) {
  const double age = ageAt(now);
  if (jumpToFollow_ != 0.0 && !followJump(jumpToFollow_)) return false;
  jumpToFollow_ = 0.0;
  const bool countsTimeOff = timeOffDue_ && now.uptime >= *timeOffDue_;
  if (countsTimeOff) {
    if (!countTimeOff(bound)) return false;
    timeOffDue_.reset();
    startMark_.reset();
  }
  if (countsTimeOff || age - lastMark_ >= kMarkSeconds) {
    // No row was inserted since an hour after the last mark, or that would have made one.
    const double rowsAge = std::min(lastMark_ + kMarkSeconds, age);
    if (!addMark(rowsAge, 0.0) || (rowsAge < age && !addMark(age, 0.0))) return false;
    if (!removeOldMarks(age - bound)) return false;
  }
  return writeClock(now);
}

// Soon after a boot a jump may be the first setting of the clock. Later it only makes up for a time off that
// is below 0.
bool StoreAge::followJump(double seconds) {
  SqliteStatement update = database_.prepare(
      startMark_ ? "UPDATE age_mark SET time_off = time_off + ?1 WHERE id = ?2"
                 : "UPDATE age_mark SET time_off = min(0.0, time_off + ?1) WHERE time_off < 0");
  update.bind(1, seconds);
  if (startMark_) update.bind(2, *startMark_);
  return update.run();
}

std::optional<StoreRowIds> StoreAge::olderThan(double seconds) {
  std::string sql = "SELECT ";
  for (const StoreTable& table : kStoreTables) {
    if (&table != kStoreTables.data()) sql += ", ";
    sql.append("coalesce(max(").append(table.name).append("), 0)");
  }
  SqliteStatement select = database_.prepare(sql + " FROM age_mark WHERE age <= ?1");
  select.bind(1, ageAt(readClocks()) - seconds);
  if (select.step() != SqliteStatement::Step::kRow) return std::nullopt;
  StoreRowIds rows{};
  for (std::size_t table = 0; table < rows.size(); ++table) {
    rows[table] = select.integer(static_cast<int>(table));
  }
  return rows;
}

std::optional<StoreAge::LastTime> StoreAge::readLastTime(bool& failed) {
  SqliteStatement select = database_.prepare("SELECT age, wall, uptime FROM age_clock");
  const SqliteStatement::Step step = select.step();
  failed = step == SqliteStatement::Step::kFailed;
  if (step != SqliteStatement::Step::kRow) return std::nullopt;
  return LastTime{select.number(0), select.number(1), select.number(2)};
}

// The time of the newest row of all tables.
std::optional<double> StoreAge::newestRowTime(bool& failed) {
  std::optional<double> newest;
  for (const StoreTable& table : kStoreTables) {
    std::string sql = "SELECT ";
    sql.append(table.time).append(" FROM ").append(table.name);
    SqliteStatement select = database_.prepare(sql + " ORDER BY id DESC LIMIT 1");
    const SqliteStatement::Step step = select.step();
    failed = step == SqliteStatement::Step::kFailed;
    if (failed) return std::nullopt;
    if (step == SqliteStatement::Step::kRow) newest = std::max(newest.value_or(0.0), select.number(0));
  }
  return newest;
}

// Makes a mark for each day before the newest row. The highest time up to a row stands for its time: a row
// that was recorded while the clock was behind does not make the rows before it older.
bool StoreAge::markFromRowTimes(double newest) {
  std::map<std::int64_t, StoreRowIds, std::greater<>> rowsByDays;
  for (std::size_t at = 0; at < kStoreTables.size(); ++at) {
    std::string sql = "SELECT days, max(id) FROM (SELECT id, CAST((?1 - max(";
    sql.append(kStoreTables[at].time).append(") OVER (ORDER BY id)) / ?2 AS INTEGER) AS days FROM ");
    sql.append(kStoreTables[at].name).append(") WHERE days >= 1 GROUP BY days");
    SqliteStatement select = database_.prepare(sql);
    select.bind(1, newest);
    select.bind(2, kDaySeconds);
    SqliteStatement::Step step = SqliteStatement::Step::kDone;
    while ((step = select.step()) == SqliteStatement::Step::kRow) {
      rowsByDays[select.integer(0)][at] = select.integer(1);
    }
    if (step == SqliteStatement::Step::kFailed) return false;
  }
  StoreRowIds rows{};
  for (const auto& [days, newestRows] : rowsByDays) {
    for (std::size_t at = 0; at < rows.size(); ++at) rows[at] = std::max(rows[at], newestRows[at]);
    if (!addMark(-kDaySeconds * static_cast<double>(days), rows)) return false;
  }
  return true;
}

// The newest rows that are there have this age.
bool StoreAge::addMark(double age, double timeOff) {
  std::string sql = "INSERT INTO age_mark (age, time_off, " + rowColumns() + ") VALUES (?1, ?2";
  for (const StoreTable& table : kStoreTables) {
    sql.append(", (SELECT coalesce(max(id), 0) FROM ").append(table.name).append(")");
  }
  SqliteStatement insert = database_.prepare(sql + ")");
  insert.bind(1, age);
  insert.bind(2, timeOff);
  if (!insert.run()) return false;
  lastMark_ = age;
  return true;
}

bool StoreAge::addMark(double age, const StoreRowIds& rows) {
  std::string sql = "INSERT INTO age_mark (age, time_off, " + rowColumns() + ") VALUES (?1, 0.0";
  for (const std::int64_t row : rows) sql += ", " + std::to_string(row);
  SqliteStatement insert = database_.prepare(sql + ")");
  insert.bind(1, age);
  return insert.run();
}

// The rows that were there before a time off become older by it. The others keep their age. A time off below
// 0 says that the clock was ahead before, or is behind now: then one above 0, before it or after it, is wrong
// by as much.
bool StoreAge::countTimeOff(double bound) {
  std::vector<std::pair<std::int64_t, double>> timesOff;
  double behind = 0.0;
  SqliteStatement select =
      database_.prepare("SELECT id, time_off FROM age_mark WHERE time_off <> 0 ORDER BY id");
  SqliteStatement::Step step = SqliteStatement::Step::kDone;
  while ((step = select.step()) == SqliteStatement::Step::kRow) {
    timesOff.emplace_back(select.integer(0), std::max(0.0, select.number(1)));
    behind += std::max(0.0, -select.number(1));
    for (auto at = timesOff.rbegin(); at != timesOff.rend() && behind > 0.0; ++at) {
      const double part = std::min(at->second, behind);
      at->second -= part;
      behind -= part;
    }
  }
  if (step == SqliteStatement::Step::kFailed) return false;
  SqliteStatement update = database_.prepare("UPDATE age_mark SET age = age - ?1 WHERE id <= ?2");
  for (const auto& [mark, timeOff] : timesOff) {
    update.bind(1, std::min(timeOff, bound * kTimeOffPart));
    update.bind(2, mark);
    if (!update.run()) return false;
  }
  SqliteStatement keep = database_.prepare(
      "UPDATE age_mark SET time_off = CASE WHEN id = (SELECT max(id) FROM age_mark) THEN -?1 ELSE 0.0 END"
      " WHERE time_off <> 0 OR id = (SELECT max(id) FROM age_mark)");
  keep.bind(1, behind);
  return keep.run();
}

// All marks up to this age say less than the last one of them.
bool StoreAge::removeOldMarks(double age) {
  SqliteStatement remove = database_.prepare(
      "DELETE FROM age_mark WHERE time_off = 0 AND id < (SELECT max(id) FROM age_mark WHERE age <= ?1)");
  remove.bind(1, age);
  return remove.run();
}

bool StoreAge::writeClock(const Moment& now) {
  SqliteStatement replace =
      database_.prepare("INSERT OR REPLACE INTO age_clock (id, age, wall, uptime) VALUES (1, ?1, ?2, ?3)");
  replace.bind(1, ageAt(now));
  replace.bind(2, now.wall);
  replace.bind(3, now.uptime);
  return replace.run();
}

}  // namespace tonewerk
