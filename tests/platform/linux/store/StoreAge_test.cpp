// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreAge.h"

#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

#include "platform/linux/store/EarlierFile.h"
#include "platform/linux/store/RowsOf.h"
#include "platform/linux/store/StoreDatabase.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::Not;

constexpr double kHour = 3600.0;
constexpr double kDay = 24 * kHour;

// A store that keeps rows for thirty days. Each row has its wall-clock time, and is named by a number.
class StoreAgeTest : public testing::Test {
 protected:
  StoreAgeTest() { start(); }

  void start() {
    store_ = std::make_unique<StoreDatabase>(directory_.path(), json_, *clock_);
    store_->setBounds({.seconds = 30 * kDay});
    trim();
  }
  void restart() {
    store_.reset();
    start();
  }
  // The device is off for a while. The wall clock is then wrong by `error` seconds.
  void reboot(double off, double error = 0.0) {
    store_.reset();
    clock_ = std::make_unique<ManualClock>(clock_->now() + off + error);
    clock_->advance(20.0);
    start();
  }
  void jump(double seconds) { clock_->setNow(clock_->now() + seconds); }

  void record(int number) {
    StoreBatch batch;
    const AnalyticsRow event{clock_->now(), "event", {{"n", number}}};
    batch.add(event, StoreRowText(event));
    const PowerRow power{clock_->now(), 28, "power", {{"n", number}}};
    batch.add(power, StoreRowText(power));
    ASSERT_EQ(store_->write(batch), StoreDatabase::Result::kDone) << store_->problem();
  }
  // Some time passes in which something is recorded every so often.
  void run(double seconds) {
    const double step = seconds > kDay ? kHour : kHour / 4;
    for (double passed = 0.0; passed < seconds; passed += step) {
      clock_->advance(step);
      record(0);
    }
    trim();
  }
  void trim() {
    ASSERT_EQ(store_->write({}), StoreDatabase::Result::kDone) << store_->problem();
    for (bool moreToDo = true; moreToDo;) {
      moreToDo = false;
      ASSERT_EQ(store_->trimAge(moreToDo), StoreDatabase::Result::kDone) << store_->problem();
    }
  }
  // The numbers of the rows that are there, but 0.
  std::vector<std::string> rows(const std::string& table = "analytics_row") {
    SqliteDatabase file;
    EXPECT_TRUE(file.open(store_->path(), SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(30)));
    return rowsOf(file, "SELECT payload ->> 'n' AS n FROM " + table + " WHERE n > 0 ORDER BY id");
  }
  void runSql(const std::string& sql) {
    SqliteDatabase file;
    ASSERT_TRUE(file.open(store_->path(), SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(30)));
    ASSERT_TRUE(file.run(sql)) << file.problem();
  }
  std::int64_t number(const std::string& sql) {
    SqliteDatabase file;
    EXPECT_TRUE(file.open(store_->path(), SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(30)));
    return file.number(sql).value_or(-1);
  }

  TemporaryDirectory directory_;
  MemoryJsonService json_;
  std::unique_ptr<ManualClock> clock_ = std::make_unique<ManualClock>();
  std::unique_ptr<StoreDatabase> store_;
};

TEST_F(StoreAgeTest, ARowOfEachTableGoesAfterItsDaysAndAtMostAnHour) {
  record(1);
  run(2 * kHour);
  record(2);
  run(30 * kDay - 2 * kHour);
  EXPECT_THAT(rows(), ElementsAre("1", "2"));
  run(kHour);
  EXPECT_THAT(rows(), ElementsAre("2"));
  EXPECT_THAT(rows("power_event"), ElementsAre("2"));
  run(2 * kHour);
  EXPECT_THAT(rows(), ElementsAre());
}

TEST_F(StoreAgeTest, RowsGrowOldWhileNothingIsRecorded) {
  record(1);
  clock_->advance(kHour / 2);
  record(2);
  clock_->advance(20 * kDay);
  record(3);
  clock_->advance(10 * kDay + kHour);
  record(4);
  trim();
  EXPECT_THAT(rows(), ElementsAre("3", "4"));
  clock_->advance(20 * kDay + kHour);
  record(5);
  trim();
  EXPECT_THAT(rows(), ElementsAre("4", "5"));
}

TEST_F(StoreAgeTest, AWallClockThatJumpsFortyDaysForwardErasesNothing) {
  record(1);
  run(2 * kDay);
  jump(40 * kDay);
  record(2);
  run(2 * kDay);
  restart();
  EXPECT_THAT(rows(), ElementsAre("1", "2"));
  run(26 * kDay + kHour);
  EXPECT_THAT(rows(), ElementsAre("2"));
}

TEST_F(StoreAgeTest, AWallClockThatJumpsToAndFroErasesNothing) {
  record(1);
  for (int times = 0; times < 50; ++times) {
    jump(40 * kDay);
    run(kHour);
    jump(-40 * kDay);
    run(kHour);
  }
  EXPECT_THAT(rows(), ElementsAre("1"));
  EXPECT_LT(number("SELECT count(*) FROM age_mark"), 250);
}

TEST_F(StoreAgeTest, RowsThatWereRecordedWhileTheClockWasAheadGrowOldLikeOthers) {
  jump(400 * kDay);
  record(1);
  jump(-400 * kDay);
  record(2);
  run(30 * kDay + 2 * kHour);
  EXPECT_THAT(rows(), ElementsAre());
}

TEST_F(StoreAgeTest, RowsThatWereRecordedWhileTheClockWasBehindAreKeptAsLongAsOthers) {
  record(1);
  clock_->setNow(1000.0);
  record(2);
  run(kDay);
  clock_->setNow(ManualClock::kStart + kDay);
  record(3);
  run(28 * kDay);
  EXPECT_THAT(rows(), ElementsAre("1", "2", "3"));
  run(kDay + 2 * kHour);
  EXPECT_THAT(rows(), ElementsAre("3"));
}

TEST_F(StoreAgeTest, ARestartCountsTheTimeInBetweenWithinABoot) {
  record(1);
  store_.reset();
  clock_->advance(29 * kDay);
  start();
  EXPECT_THAT(rows(), ElementsAre("1"));
  record(2);
  store_.reset();
  clock_->advance(kDay + kHour);
  start();
  EXPECT_THAT(rows(), ElementsAre("2"));
}

TEST_F(StoreAgeTest, AJumpWhileTheStoreIsClosedErasesNothing) {
  record(1);
  run(2 * kDay);
  store_.reset();
  clock_->advance(kHour);
  jump(40 * kDay);
  start();
  run(2 * kHour);
  EXPECT_THAT(rows(), ElementsAre("1"));
  run(30 * kDay);
  EXPECT_THAT(rows(), ElementsAre());
}

TEST_F(StoreAgeTest, TheTimeThatTheDeviceWasOffCountsAnHourAfterTheBoot) {
  record(1);
  run(24 * kDay);
  record(2);
  reboot(7 * kDay);
  record(3);
  run(kHour / 2);
  EXPECT_THAT(rows(), ElementsAre("1", "2", "3"));
  run(kHour);
  EXPECT_THAT(rows(), ElementsAre("2", "3"));
  run(23 * kDay - 2 * kHour);
  EXPECT_THAT(rows(), ElementsAre("2", "3"));
  run(2 * kHour);
  EXPECT_THAT(rows(), ElementsAre("3"));
  run(7 * kDay - 2 * kHour);
  EXPECT_THAT(rows(), ElementsAre("3"));
  run(2 * kHour);
  EXPECT_THAT(rows(), ElementsAre());
}

TEST_F(StoreAgeTest, ADeviceThatIsMostlyOffKeepsNothingForEver) {
  record(1);
  int boots = 0;
  for (; rows() == std::vector<std::string>{"1"} && boots < 40; ++boots) {
    reboot(kDay);
    run(2 * kHour);
  }
  EXPECT_GE(boots, 27);
  EXPECT_LE(boots, 29);
}

TEST_F(StoreAgeTest, TimesOffBeforeShortRunsCountLater) {
  record(1);
  for (int boots = 0; boots < 6; ++boots) {
    reboot(6 * kDay);
    record(0);
    clock_->advance(kHour / 4);
    record(0);
  }
  EXPECT_THAT(rows(), ElementsAre("1"));
  run(2 * kHour);
  EXPECT_THAT(rows(), ElementsAre());
}

TEST_F(StoreAgeTest, AClockThatIsWrongAtABootErasesNothing) {
  record(1);
  run(2 * kDay);
  reboot(60.0, 400 * kDay);
  run(2 * kDay);
  EXPECT_THAT(rows(), ElementsAre("1"));
  restart();
  EXPECT_THAT(rows(), ElementsAre("1"));
}

TEST_F(StoreAgeTest, AClockThatIsSetBackSoonAfterABootMakesNothingOlder) {
  record(1);
  run(2 * kDay);
  for (int boots = 0; boots < 8; ++boots) {
    reboot(60.0, 40 * kDay);
    run(kHour / 2);
    jump(-40 * kDay);
    run(2 * kHour);
  }
  EXPECT_THAT(rows(), ElementsAre("1"));
  run(27 * kDay);
  EXPECT_THAT(rows(), ElementsAre("1"));
  run(kDay);
  EXPECT_THAT(rows(), ElementsAre());
}

// A device without a clock that runs while it is off begins with the time at which it went off.
TEST_F(StoreAgeTest, AClockThatIsSetSoonAfterABootTellsTheTimeOff) {
  record(1);
  run(24 * kDay);
  record(2);
  reboot(7 * kDay, -7 * kDay);
  run(kHour / 2);
  jump(7 * kDay);
  run(2 * kHour);
  EXPECT_THAT(rows(), ElementsAre("2"));
}

// A device without a battery for its clock begins each time with the day on which it was made.
TEST_F(StoreAgeTest, AClockThatBeginsFarBackAndIsSetSoonAfterEachBootErasesNothing) {
  record(1);
  run(2 * kDay);
  for (int boots = 0; boots < 8; ++boots) {
    reboot(60.0, -400 * kDay);
    run(kHour / 2);
    jump(400 * kDay);
    run(2 * kHour);
  }
  EXPECT_THAT(rows(), ElementsAre("1"));
  run(27 * kDay);
  EXPECT_THAT(rows(), ElementsAre("1"));
  run(kDay);
  EXPECT_THAT(rows(), ElementsAre());
}

TEST_F(StoreAgeTest, AClockThatIsSetOnlyAtTheNextBootErasesNothing) {
  record(1);
  run(2 * kDay);
  for (int boots = 0; boots < 8; ++boots) {
    reboot(60.0, -400 * kDay);
    run(boots % 2 == 0 ? kHour / 2 : 2 * kHour);
    reboot(60.0, 400 * kDay);
    run(2 * kHour);
  }
  EXPECT_THAT(rows(), ElementsAre("1"));
}

TEST_F(StoreAgeTest, AClockThatIsSetLongAfterABootHidesNoLaterTimeOff) {
  record(1);
  run(24 * kDay);
  record(2);
  reboot(60.0, -400 * kDay);
  run(2 * kHour);
  jump(400 * kDay);
  reboot(7 * kDay);
  run(2 * kHour);
  EXPECT_THAT(rows(), ElementsAre("2"));
}

TEST_F(StoreAgeTest, RowsOfAFileWithoutMarksAreAsOldAsTheNewestOnesSay) {
  record(1);
  run(10 * kDay);
  record(2);
  run(18 * kDay);
  store_.reset();
  start();  // with all in the file itself
  runSql(intoVersion2WithoutAges());
  restart();
  EXPECT_THAT(rows(), ElementsAre("1", "2"));
  run(3 * kDay);
  EXPECT_THAT(rows(), ElementsAre("2"));
  run(10 * kDay);
  EXPECT_THAT(rows(), ElementsAre());
}

TEST_F(StoreAgeTest, OneWrongTimeInAFileWithoutMarksMakesNothingOld) {
  record(1);
  clock_->setNow(1000.0);
  record(2);
  clock_->setNow(ManualClock::kStart);
  record(3);
  runSql(intoVersion2WithoutAges());
  restart();
  EXPECT_THAT(rows(), ElementsAre("1", "2", "3"));
}

TEST_F(StoreAgeTest, RowsThatADaemonWithoutMarksHasAddedAreNotTakenForOld) {
  record(1);
  for (int day = 1; day <= 20; ++day) {
    clock_->advance(kDay);
    runSql("INSERT INTO analytics_row (recorded_at, name_set, payload) VALUES (" +
           std::to_string(clock_->now()) + ", 1, '{\"n\":" + std::to_string(day + 100) + "}')");
  }
  restart();
  run(29 * kDay);
  EXPECT_THAT(rows(), Contains("120"));
  run(2 * kDay);
  EXPECT_THAT(rows(), Not(Contains("120")));
}

TEST_F(StoreAgeTest, MarksOfRowsThatAreGoneAreRemoved) {
  run(60 * kDay);
  EXPECT_GE(number("SELECT count(*) FROM age_mark"), 30 * 24);
  EXPECT_LE(number("SELECT count(*) FROM age_mark"), 30 * 24 + 5);
}

TEST_F(StoreAgeTest, AJumpIsTakenOnceAndAnySmallOnesTogether) {
  EXPECT_EQ(store_->takeJump(), 0.0);
  jump(40 * kDay);
  record(1);
  EXPECT_NEAR(store_->takeJump(), 40 * kDay, 0.01);
  EXPECT_EQ(store_->takeJump(), 0.0);
  clock_->advance(kDay);
  record(2);
  EXPECT_EQ(store_->takeJump(), 0.0);
  jump(-3.0);
  record(3);
  EXPECT_EQ(store_->takeJump(), 0.0);
  jump(-3.0);
  record(4);
  EXPECT_NEAR(store_->takeJump(), -6.0, 0.01);
}

}  // namespace
}  // namespace tonewerk
