// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <utility>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {

class Clock;

// Knows how old the rows of a report store are, although the wall clock may jump. For the writer's thread.
//
// The store has an age, in seconds: it grows with the monotonic clock while the store is open. Once an hour a
// mark says which rows were the newest at an age. So a row is as old as the first mark that covers it, or up
// to an hour older, whatever times the rows have.
//
//   age      0h        1h        2h                    3h
//   marks    |---------|---------|      time off       |---------|
//   rows       1 2 3 4   5 6   7                         8   9
//
// Across starts: after a restart within one boot the monotonic clock tells the time between. After a reboot
// only the wall clock does, and it may be wrong. What it says is the mark's time off, and makes the rows
// before it older an hour after the start, by a quarter of the bound at most. Until then jumps of the wall
// clock change it, because they may be its first setting after the boot. It is below 0 when the clock went
// back: that is kept, and makes up for a later time off, because the clock will be set forward some day.
class StoreAge {
 public:
  static constexpr std::chrono::hours kMarkInterval{1};
  // The wall clock is said to have jumped when it moves so far against the monotonic clock.
  static constexpr double kJumpSeconds = 5.0;

  // Both outlive it. The clock's monotonic time goes on while the device sleeps.
  StoreAge(SqliteDatabase& database, const Clock& clock) : database_(database), clock_(clock) {}

  // Reads the marks of the file that was opened, or makes the first ones from the times of its rows.
  // `isKnownFile` says that this object had it open before. False on failure, as the other functions; the
  // database then has the problem, and the next open() begins again.
  [[nodiscard]] bool open(bool isKnownFile);
  // To be called before rows are inserted, outside transactions. It costs two looks at clocks, and once an
  // hour a transaction. `bound` is the age in seconds that rows may reach.
  [[nodiscard]] bool follow(double bound);
  // The newest rows of each table that are older than `seconds`; 0 for a table without any. None on failure.
  [[nodiscard]] std::optional<StoreRowIds> olderThan(double seconds);

  // By how many seconds the wall clock has jumped since the last call; mostly 0.
  double takeJump() { return std::exchange(jump_, 0.0); }

 private:
  // Both in seconds.
  struct Moment {
    double wall = 0.0;
    double uptime = 0.0;
  };
  struct LastTime {
    double age = 0.0;
    double wall = 0.0;
    std::optional<double> uptime;  // none if it is not known
  };

  Moment readClocks() const;
  void noteJump(const Moment& now);
  double ageAt(const Moment& now) const { return ageAtBase_ + now.uptime - uptimeAtBase_; }

  [[nodiscard]] bool openInTransaction(const Moment& now, bool isKnownFile);
  [[nodiscard]] bool followInTransaction(const Moment& now, double bound);
  [[nodiscard]] std::optional<LastTime> readLastTime(bool& failed);
  [[nodiscard]] std::optional<double> newestRowTime(bool& failed);
  [[nodiscard]] bool markFromRowTimes(double newest);
  [[nodiscard]] bool addMark(double age, double timeOff);
  [[nodiscard]] bool addMark(double age, const StoreRowIds& rows);
  [[nodiscard]] bool followJump(double seconds);
  [[nodiscard]] bool countTimeOff(double bound);
  [[nodiscard]] bool removeOldMarks(double age);
  [[nodiscard]] bool writeClock(const Moment& now);

  SqliteDatabase& database_;
  const Clock& clock_;
  double ageAtBase_ = 0.0;
  double uptimeAtBase_ = 0.0;
  double lastMark_ = 0.0;  // rows after it were inserted at most kMarkInterval later
  // While the wall clock may still be set after a boot: the mark of the start.
  std::optional<std::int64_t> startMark_;
  std::optional<double> timeOffDue_;  // when it counts, in uptime
  std::optional<double> offset_;      // of the wall clock from the monotonic clock
  double jump_ = 0.0;
  double jumpToFollow_ = 0.0;
};

}  // namespace tonewerk
