// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/LifeTable.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

#include "platform/linux/store/RowsOf.h"
#include "platform/linux/store/StoreDatabase.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;

using Result = StoreDatabase::Result;

std::shared_ptr<SessionLife> makeLife(std::uint64_t request, std::int64_t reporter = 7, double at = 1.0) {
  return std::make_shared<SessionLife>(
      SessionBeginning{.reporterID = reporter, .at = at, .request = request, .service = "telephony"});
}

SessionEnd endAt(double time) {
  return {.at = time, .ending = SessionEnding::kStopped, .messages = 5, .redundantMessages = 2};
}

class LifeTableTest : public testing::Test {
 protected:
  template <typename... Rows>
  Result write(const Rows&... rows) {
    StoreBatch batch;
    (batch.add(rows, StoreRowText(rows)), ...);
    return store_->write(batch);
  }
  static AnalyticsRow eventOf(const std::shared_ptr<SessionLife>& life, int number) {
    return {2.5,
            "com.orvane.tonewerk.Volume.Generic",
            {{"n", number}},
            {.category = kCategoryVolume, .type = 0, .source = EventSource::kClient, .life = life}};
  }
  // The daemon ends without a word, and a new one opens the file.
  void crash() {
    store_.reset();
    store_ = std::make_unique<StoreDatabase>(directory_.path(), json_, clock_);
  }

  // Overwrites the first page of a table.
  void damage(const std::string& table) {
    std::int64_t page = 0;
    {
      SqliteDatabase other;
      ASSERT_TRUE(other.open(path(), SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(30)));
      ASSERT_TRUE(other.run("PRAGMA wal_checkpoint(TRUNCATE)"));
      page = other.number("SELECT rootpage FROM sqlite_master WHERE name = '" + table + "'").value_or(0);
    }
    ASSERT_GT(page, 1);
    constexpr std::int64_t kPageBytes = 8192;
    std::fstream file(path(), std::ios::in | std::ios::out | std::ios::binary);
    file.seekp((page - 1) * kPageBytes);
    file << std::string(kPageBytes, '\xff');
  }

  std::vector<std::string> rows(const std::string& sql, int columns) {
    SqliteDatabase database;
    EXPECT_TRUE(database.open(path(), SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(30)));
    return rowsOf(database, sql, columns);
  }
  void trimAge() {
    for (bool moreToDo = true; moreToDo;) {
      moreToDo = false;
      ASSERT_EQ(store_->trimAge(moreToDo), Result::kDone);
    }
  }
  std::vector<std::string> lives() {
    return rows(
        "SELECT id, reporter_id, coalesce(ended_at, 'open'), coalesce(ending, '') FROM session ORDER BY id",
        4);
  }
  std::vector<std::string> events() { return rows("SELECT session, payload FROM event ORDER BY id", 2); }
  std::string path() const { return directory_.path("reports.db"); }

  TemporaryDirectory directory_;
  MemoryJsonService json_;
  ManualClock clock_;
  std::unique_ptr<StoreDatabase> store_ = std::make_unique<StoreDatabase>(directory_.path(), json_, clock_);
};

TEST_F(LifeTableTest, ALifeIsOneRowThatItsEndCompletes) {
  const auto life = makeLife(3);
  EXPECT_EQ(write(LifeRow{life, "app", ""}), Result::kDone);
  EXPECT_THAT(rows("SELECT application, process IS NULL, started_at, messages IS NULL FROM session", 4),
              ElementsAre("app 1 1.0 1"));
  SessionEnd end = endAt(4.0);
  end.activeSeconds = 1.5;
  end.overloads = 1;
  EXPECT_EQ(write(LifeRow{life, "other", "process", end}), Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 7 4.0 stopped"));
  EXPECT_THAT(rows("SELECT application, process, service, messages, unique_messages, redundant_messages,"
                   " active_seconds, overloads FROM session",
                   8),
              ElementsAre("other process telephony 5 3 2 1.5 1"));
}

TEST_F(LifeTableTest, LivesThatBeginAndEndInOneBatchHaveTheirEnds) {
  const auto first = makeLife(3);
  const auto second = makeLife(4, 8);
  const auto third = makeLife(5, 9);
  EXPECT_EQ(write(LifeRow{first, "", ""}, LifeRow{first, "app", "", endAt(4.0)}, LifeRow{second, "", ""},
                  LifeRow{third, "", ""}, LifeRow{second, "", "", endAt(5.0)}),
            Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 7 4.0 stopped", "2 8 5.0 stopped", "3 9 open "));
  EXPECT_THAT(rows("SELECT application FROM session WHERE id = 1", 1), ElementsAre("app"));
}

TEST_F(LifeTableTest, AnEventNamesItsLifeAlsoWhenTheLifesOwnRowWasDropped) {
  const auto first = makeLife(0);
  const auto second = makeLife(0, 8);
  EXPECT_EQ(write(LifeRow{first, "", ""}, eventOf(second, 1), eventOf(first, 2)), Result::kDone);
  EXPECT_EQ(write(eventOf(second, 3), eventOf(nullptr, 4)), Result::kDone);
  EXPECT_THAT(events(), ElementsAre(R"(2 {"n":1})", R"(1 {"n":2})", R"(2 {"n":3})", R"( {"n":4})"));
  EXPECT_THAT(lives(), ElementsAre("1 7 open ", "2 8 open "));
}

TEST_F(LifeTableTest, ALongNameIsCutBetweenCharacters) {
  std::string name(StoreBatch::kMaxNameBytes - 1, 'x');
  const auto life = makeLife(0);
  EXPECT_EQ(write(LifeRow{life, name + "\xC3\xA9", name + "yz"}), Result::kDone);
  EXPECT_THAT(rows("SELECT application, process FROM session", 2), ElementsAre(name + " " + name + "y"));
}

TEST_F(LifeTableTest, WhatACrashLeftOpenIsInterruptedAtTheTimeOfTheNewestEvent) {
  EXPECT_EQ(write(LifeRow{makeLife(3), "", ""}, LifeRow{makeLife(4, 8, 9.0), "", ""},
                  LifeRow{makeLife(5, 9), "", "", endAt(2.0)}, eventOf(nullptr, 1)),
            Result::kDone);
  crash();
  EXPECT_EQ(write(), Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 7 2.5 interrupted", "2 8 9.0 interrupted", "3 9 2.0 stopped"));
}

TEST_F(LifeTableTest, AfterACrashALifeIsKnownAgainByItsRequestAndItsReporter) {
  EXPECT_EQ(write(LifeRow{makeLife(3), "", ""}, LifeRow{makeLife(4), "", "", endAt(2.0)},
                  LifeRow{makeLife(4, 8), "", ""}),
            Result::kDone);
  crash();
  const auto open = makeLife(3);
  const auto stopped = makeLife(4);
  const auto lost = makeLife(6);
  EXPECT_EQ(write(LifeRow{open, "", ""}, eventOf(open, 1), LifeRow{stopped, "", ""},
                  LifeRow{stopped, "", "", endAt(2.0)}, LifeRow{lost, "", ""}),
            Result::kDone);
  EXPECT_EQ(write(LifeRow{open, "", "", SessionEnd{.at = 5.0, .ending = SessionEnding::kInterrupted}}),
            Result::kDone);
  EXPECT_THAT(lives(),
              ElementsAre("1 7 5.0 interrupted", "2 7 2.0 stopped", "3 8 1.0 interrupted", "4 7 open "));
  EXPECT_THAT(events(), ElementsAre(R"(1 {"n":1})"));
}

TEST_F(LifeTableTest, WithoutAJournalEachLifeIsNew) {
  EXPECT_EQ(write(LifeRow{makeLife(0), "", ""}), Result::kDone);
  crash();
  EXPECT_EQ(write(LifeRow{makeLife(0), "", ""}), Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 7 1.0 interrupted", "2 7 open "));
}

TEST_F(LifeTableTest, ANewFileGetsTheLifeAgain) {
  const auto life = makeLife(3);
  EXPECT_EQ(write(LifeRow{makeLife(2), "", ""}, LifeRow{life, "", ""}), Result::kDone);
  for (const char* suffix : {"", "-wal", "-shm"}) std::filesystem::remove(path() + suffix);
  EXPECT_EQ(write(eventOf(life, 2)), Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 7 open "));
  EXPECT_THAT(events(), ElementsAre(R"(1 {"n":2})"));
}

// The file has rows with the identifiers that the lives had in the one before.
TEST_F(LifeTableTest, AFileThatIsPutInPlaceKeepsItsRowsAndGetsTheLivesThatGoOn) {
  const TemporaryDirectory other;
  {
    StoreDatabase backup(other.path(), json_, clock_);
    StoreBatch batch;
    const LifeRow row{makeLife(0, 8), "", "", endAt(2.0)};
    batch.add(row, StoreRowText(row));
    ASSERT_EQ(backup.write(batch), Result::kDone);
  }
  const auto life = makeLife(0);
  const auto rtc = std::make_shared<RtcSessionRecord>();
  ASSERT_EQ(write(LifeRow{life, "", ""}, RtcMessageRow{1.0, rtc, 4, 1, {{"m", 1}}}), Result::kDone);
  for (const char* suffix : {"", "-wal", "-shm"}) {
    std::filesystem::rename(path() + suffix, directory_.path("old.db") + suffix);
  }
  std::filesystem::copy_file(other.path("reports.db"), path());
  EXPECT_EQ(write(RtcMessageRow{2.0, rtc, 4, 1, {{"m", 2}}}, LifeRow{life, "", "", endAt(4.0)}),
            Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 8 2.0 stopped", "2 7 4.0 stopped"));
  EXPECT_THAT(rows("SELECT m.payload FROM rtc_message AS m JOIN rtc_session AS s ON s.id = m.rtc_session", 1),
              ElementsAre(R"({"m":2})"));
}

TEST_F(LifeTableTest, AnUndoneTransactionHasNoEffect) {
  ASSERT_EQ(write(LifeRow{makeLife(2), "", ""}), Result::kDone);
  const auto life = makeLife(3);
  {
    SqliteDatabase other;
    ASSERT_TRUE(other.open(path(), SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(30)));
    ASSERT_TRUE(
        other.run("CREATE TRIGGER refuse BEFORE INSERT ON power_event BEGIN SELECT RAISE(ABORT, 'no'); END"));
    EXPECT_EQ(write(LifeRow{life, "", ""}, PowerRow{1.0, 28, "power", {}}), Result::kFailed);
    ASSERT_TRUE(other.run("DROP TRIGGER refuse"));
  }
  EXPECT_THAT(rows("SELECT id FROM session_row", 1), ElementsAre("1"));
  EXPECT_EQ(write(eventOf(life, 1)), Result::kDone);
  EXPECT_THAT(events(), ElementsAre(R"(2 {"n":1})"));
  EXPECT_THAT(rows("SELECT ending IS NULL FROM session", 1), ElementsAre("1", "1"));  // it is the same daemon
}

TEST_F(LifeTableTest, AfterDamageTheLivesOfThisDaemonGoOnInTheirRows) {
  const auto life = makeLife(0);  // without a journal it cannot be known again by its request
  ASSERT_EQ(write(LifeRow{life, "app", ""}, eventOf(life, 1)), Result::kDone);
  damage("power_event");
  ASSERT_EQ(write(PowerRow{1.0, 28, "power", {}}), Result::kCorrupt);
  ASSERT_TRUE(store_->beginAnew());
  ASSERT_EQ(write(PowerRow{1.0, 28, "power", {}}), Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 7 open "));
  damage("metric");
  ASSERT_EQ(write(MetricRow{1.0, 7, "m"}), Result::kCorrupt);
  ASSERT_TRUE(store_->beginAnew());
  EXPECT_EQ(write(eventOf(life, 2), LifeRow{life, "app", "", endAt(4.0)}), Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 7 4.0 stopped"));
  EXPECT_THAT(events(), ElementsAre(R"(1 {"n":1})", R"(1 {"n":2})"));
}

TEST_F(LifeTableTest, ALifeWhoseRowIsLostGetsItAgainWithTheSameIdentifier) {
  const auto life = makeLife(0);
  ASSERT_EQ(write(LifeRow{life, "app", ""}, eventOf(life, 1)), Result::kDone);
  damage("session_row");
  ASSERT_EQ(write(LifeRow{makeLife(0, 8), "", ""}), Result::kCorrupt);
  ASSERT_TRUE(store_->beginAnew());
  EXPECT_EQ(write(LifeRow{makeLife(0, 8), "", ""}, eventOf(life, 2)), Result::kDone);
  EXPECT_THAT(rows("SELECT reporter_id, started_at, ending IS NULL FROM session ORDER BY id", 3),
              ElementsAre("7 1.0 1", "8 1.0 1"));
  EXPECT_THAT(events(), ElementsAre(R"(1 {"n":1})", R"(1 {"n":2})"));
}

// Its newest rows were lost without a trace, and their identifiers were given to others.
TEST_F(LifeTableTest, ALifeWhoseIdentifierIsAnothersGetsANewRow) {
  const auto life = makeLife(0);
  ASSERT_EQ(write(LifeRow{life, "app", ""}), Result::kDone);
  SqliteDatabase other;
  ASSERT_TRUE(other.open(path(), SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(30)));
  ASSERT_TRUE(other.run("UPDATE session_row SET reporter_id = 9"));
  other.close();
  damage("power_event");
  ASSERT_EQ(write(PowerRow{1.0, 28, "power", {}}), Result::kCorrupt);
  ASSERT_TRUE(store_->beginAnew());
  EXPECT_EQ(write(LifeRow{life, "app", "", endAt(4.0)}), Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 9 open ", "2 7 4.0 stopped"));
}

TEST_F(LifeTableTest, WhatACrashLeftOpenInADamagedFileIsInterrupted) {
  ASSERT_EQ(write(LifeRow{makeLife(0), "app", ""}), Result::kDone);
  store_.reset();
  damage("age_clock");
  crash();
  ASSERT_EQ(write(), Result::kCorrupt);
  ASSERT_TRUE(store_->beginAnew());
  EXPECT_EQ(write(), Result::kDone);
  EXPECT_THAT(lives(), ElementsAre("1 7 1.0 interrupted"));
}

TEST_F(LifeTableTest, TheEndOfALifeWhoseRowIsGoneMakesItAnew) {
  const auto life = makeLife(3);
  ASSERT_EQ(write(LifeRow{life, "", ""}), Result::kDone);
  SqliteDatabase other;
  ASSERT_TRUE(other.open(path(), SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(30)));
  ASSERT_TRUE(other.run("DELETE FROM session_row"));
  EXPECT_EQ(write(LifeRow{life, "app", "", endAt(4.0)}), Result::kDone);
  EXPECT_THAT(rows("SELECT id, reporter_id, application, started_at, ended_at FROM session", 5),
              ElementsAre("1 7 app 1.0 4.0"));
}

TEST_F(LifeTableTest, TheRowOfASessionThatRunsIsKeptHoweverOldItIs) {
  const auto running = makeLife(0);
  ASSERT_EQ(write(LifeRow{running, "", ""}, LifeRow{makeLife(0, 8), "", "", endAt(2.0)},
                  LifeRow{makeLife(0, 9), "", "", endAt(2.0)}),  // the newest row always stays
            Result::kDone);
  store_->setBounds({.seconds = 1.0});
  clock_.advance(std::chrono::hours(3));
  ASSERT_EQ(write(), Result::kDone);
  trimAge();
  EXPECT_THAT(lives(), ElementsAre("1 7 open ", "3 9 2.0 stopped"));
  ASSERT_EQ(write(LifeRow{running, "", "", endAt(4.0)}), Result::kDone);
  trimAge();
  EXPECT_THAT(lives(), ElementsAre("3 9 2.0 stopped"));
}

TEST_F(LifeTableTest, MoreSessionsThatRunThanARoundLooksAtDoNotKeepTheRowsAfterThem) {
  std::vector<std::shared_ptr<SessionLife>> running;
  StoreBatch batch;
  for (int reporter = 1; reporter <= 1000; ++reporter) {
    const LifeRow row{running.emplace_back(makeLife(0, reporter)), "", ""};
    batch.add(row, StoreRowText(row));
  }
  ASSERT_EQ(store_->write(batch), Result::kDone);
  ASSERT_EQ(write(LifeRow{makeLife(0, 2001), "", "", endAt(2.0)}, LifeRow{makeLife(0, 2002), "", ""}),
            Result::kDone);
  store_->setBounds({.seconds = 1.0});
  clock_.advance(std::chrono::hours(3));
  ASSERT_EQ(write(), Result::kDone);
  trimAge();
  EXPECT_THAT(rows("SELECT count(*), count(ended_at) FROM session", 2), ElementsAre("1001 0"));
}

TEST_F(LifeTableTest, TheRowOfASessionThatRunsIsKeptHoweverFullTheFileIs) {
  ASSERT_EQ(write(LifeRow{makeLife(0), "", ""}, LifeRow{makeLife(0, 8), "", "", endAt(2.0)},
                  LifeRow{makeLife(0, 9), "", "", endAt(2.0)}),
            Result::kDone);
  store_->setBounds({.bytes = 1 << 20});
  const PowerRow row{5.0, 28, "power", {{"text", std::string(20'000, 'x')}}};
  for (int n = 0; n < 100; ++n) ASSERT_EQ(write(row), Result::kDone);
  for (bool moreToDo = true; moreToDo;) {
    moreToDo = false;
    ASSERT_EQ(store_->trimSize(moreToDo), Result::kDone);
  }
  EXPECT_THAT(lives(), ElementsAre("1 7 open ", "3 9 2.0 stopped"));
}

}  // namespace
}  // namespace tonewerk
