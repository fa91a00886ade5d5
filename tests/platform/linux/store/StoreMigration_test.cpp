// SPDX-License-Identifier: Apache-2.0
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "platform/linux/store/FullDisk.h"
#include "platform/linux/store/RowsOf.h"
#include "platform/linux/store/StoreDatabase.h"
#include "platform/linux/store/StoreReader.h"
#include "platform/linux/store/StoreSchema.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::SizeIs;

constexpr std::chrono::seconds kLongEnough{30};

constexpr const char* kFolder = TONEWERK_SOURCE_DIR "/tests/platform/linux/store/";

// A file as daemons before version 2 made it, with some rows.
std::string version1() {
  std::ifstream file(std::string(kFolder) + "version1.sql");
  return {std::istreambuf_iterator<char>(file), {}};
}

// A file as daemons made it before they recorded the users of rows, with some rows.
constexpr const char* kWithoutUsers = R"(
  PRAGMA page_size = 8192; PRAGMA auto_vacuum = INCREMENTAL; PRAGMA journal_mode = WAL;
  BEGIN;
  CREATE TABLE analytics_row (
    id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, name_set INTEGER NOT NULL, payload TEXT NOT NULL,
    rtc_session INTEGER, rtc_bits INTEGER);
  CREATE TABLE analytics_name (
    name_set INTEGER NOT NULL, position INTEGER NOT NULL, name TEXT NOT NULL,
    PRIMARY KEY (name_set, position)) WITHOUT ROWID;
  CREATE INDEX analytics_name_by_name ON analytics_name (name);
  CREATE TABLE metric (
    id INTEGER PRIMARY KEY, posted_at REAL NOT NULL, identifier INTEGER NOT NULL, record BLOB NOT NULL);
  CREATE TABLE power_event (
    id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, event_group INTEGER NOT NULL, name TEXT NOT NULL,
    payload TEXT NOT NULL);
  CREATE TABLE rtc_session (
    id INTEGER PRIMARY KEY, started_at REAL NOT NULL, session_info TEXT NOT NULL,
    user_info TEXT NOT NULL);
  CREATE TABLE rtc_row (
    id INTEGER PRIMARY KEY, sent_at REAL NOT NULL, rtc_session INTEGER NOT NULL,
    category INTEGER NOT NULL, type INTEGER NOT NULL, payload TEXT NOT NULL);
  CREATE VIEW analytics_event (id, recorded_at, name, payload) AS
    SELECT r.id * 2 + n.position, r.recorded_at, n.name, r.payload
      FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set;
  CREATE VIEW rtc_message (id, sent_at, rtc_session, category, type, payload) AS
    SELECT id, sent_at, rtc_session, category, type, payload FROM rtc_row
    UNION ALL
    SELECT id, recorded_at, rtc_session, CAST(rtc_bits >> 16 & 65535 AS INTEGER),
           CAST(rtc_bits & 65535 AS INTEGER),
           CAST(CASE WHEN rtc_bits >> 32 = 0 THEN payload
                     ELSE substr(CAST(payload AS BLOB), 1, rtc_bits >> 40) ||
                          substr(CAST(payload AS BLOB), (rtc_bits >> 40) + (rtc_bits >> 32 & 255) + 1)
                     END AS TEXT)
      FROM analytics_row WHERE rtc_session IS NOT NULL;
  INSERT INTO analytics_name VALUES (1, 0, 'first'), (1, 1, 'second'), (2, 0, 'single');
  INSERT INTO analytics_row VALUES
    (10, 1.5, 1, '{"n":1}', NULL, NULL), (12, 2.5, 2, '{"n":2}', 5, 4 << 16 | 1);
  INSERT INTO metric VALUES (3, 1.5, 7, x'00ff');
  INSERT INTO power_event VALUES (4, 1.5, 28, 'power', '{"p":1}');
  INSERT INTO rtc_session VALUES (5, 1.5, '{"s":1}', '{"kLinkReportUserInfoServiceName":"telephony_session"}');
  INSERT INTO rtc_row VALUES (11, 1.5, 5, 4, 1, '{"m":1}');
  PRAGMA user_version = 2;
  COMMIT;
)";

// The tables and views with their columns.
constexpr const char* kColumns =
    "SELECT m.type, m.name, c.name, c.type, c.\"notnull\", c.pk FROM sqlite_master AS m"
    " JOIN pragma_table_info(m.name) AS c ORDER BY m.name, c.cid";

class OldFileTest : public testing::Test {
 protected:
  explicit OldFileTest(const std::string& contents) {
    EXPECT_TRUE(file_.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
    EXPECT_TRUE(file_.run(contents)) << file_.problem();
  }
  std::string path() const { return directory_.path("reports.db"); }

  template <typename... Rows>
  StoreDatabase::Result write(const Rows&... rows) {
    StoreBatch batch;
    (batch.add(rows, StoreRowText(rows)), ...);
    return store_.write(batch);
  }
  // The columns of each row, joined by spaces.
  std::vector<std::string> rows(const std::string& sql, int columns = 1) {
    return rowsOf(file_, sql, columns);
  }
  // Everything that a reader finds.
  std::vector<std::string> contents() {
    std::vector<std::string> all;
    for (const auto& [sql, columns] : std::vector<std::pair<std::string, int>>{
             {"SELECT id, recorded_at, name, payload FROM analytics_event ORDER BY id", 4},
             {"SELECT id, posted_at, identifier, hex(record) FROM metric ORDER BY id", 4},
             {"SELECT id, recorded_at, event_group, name, payload FROM power_event ORDER BY id", 5},
             {"SELECT id, started_at, session_info, user_info FROM rtc_session ORDER BY id", 4},
             {"SELECT id, sent_at, rtc_session, category, type, payload FROM rtc_message ORDER BY id", 6}}) {
      for (std::string& row : rows(sql, columns)) all.push_back(std::move(row));
    }
    return all;
  }
  std::int64_t version() { return file_.number("PRAGMA user_version").value_or(-1); }

  TemporaryDirectory directory_;
  MemoryJsonService json_;
  SqliteDatabase file_;
  ManualClock clock_;
  StoreDatabase store_{directory_.path(), json_, clock_};
};

class StoreMigrationTest : public OldFileTest {
 protected:
  StoreMigrationTest() : OldFileTest(version1()) {}
};

class FileWithoutUsersTest : public OldFileTest {
 protected:
  FileWithoutUsersTest() : OldFileTest(kWithoutUsers) {}
};

TEST_F(StoreMigrationTest, KeepsAllRowsAndTheirIdentifiers) {
  const std::vector<std::string> before = contents();
  ASSERT_THAT(before, SizeIs(8));
  EXPECT_EQ(write(), StoreDatabase::Result::kDone);
  EXPECT_EQ(version(), kStoreSchemaVersion);
  EXPECT_EQ(contents(), before);
}

TEST_F(StoreMigrationTest, CategoryAndTypeOfEarlierMessagesAreThoseOfTheFrameworksName) {
  ASSERT_TRUE(
      file_.run("INSERT INTO analytics_name VALUES (8, 0, 'com.orvane.tonewerk.HAL_IO.Error'),"
                " (8, 1, 'com.orvane.telephony.HAL_IO.Error'), (9, 0, 'com.orvane.telephony.IO.Error');"
                "INSERT INTO analytics_row (id, recorded_at, name_set, payload) VALUES"
                " (50, 1.5, 8, '{\"issue_type\":\"overload\"}'), (51, 1.5, 9, '{}')"));
  EXPECT_EQ(write(), StoreDatabase::Result::kDone);
  EXPECT_THAT(rows("SELECT id, category, type, session IS NULL, source IS NULL FROM event", 5),
              ElementsAre("50 HAL_IO Error 1 1"));
  EXPECT_THAT(rows("SELECT id, kind FROM issue", 2), ElementsAre("50 overload"));
}

// The bytes that an earlier SQLite has written, whatever this one would write.
TEST_F(StoreMigrationTest, AFileOfVersionOneThatIsKeptShowsTheSameInAllViews) {
  const std::vector<std::string> before = contents();
  const TemporaryDirectory kept;
  std::filesystem::copy_file(std::string(kFolder) + "version1.db", kept.path("reports.db"));
  ASSERT_TRUE(file_.open(kept.path("reports.db"), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  EXPECT_EQ(version(), 1);
  EXPECT_EQ(contents(), before);
  StoreDatabase store(kept.path(), json_, clock_);
  EXPECT_EQ(store.write({}), StoreDatabase::Result::kDone) << store.problem();
  EXPECT_EQ(version(), kStoreSchemaVersion);
  EXPECT_THAT(contents(),
              ElementsAre(R"(20 1.5 first {"n":1})", R"(21 1.5 second {"n":1})", R"(24 2.5 single {"n":2})",
                          R"(3 1.5 7 00FF)", R"(4 1.5 28 power {"p":1})",
                          R"(5 1.5 {"s":1} {"kLinkReportUserInfoServiceName":"telephony_session"})",
                          R"(10 1.5 5 4 1 {"m":1})", R"(20 2.5 5 4 2 {"m":2})"));
  EXPECT_THAT(rows("PRAGMA integrity_check"), ElementsAre("ok"));
}

TEST_F(StoreMigrationTest, NewRowsFollowTheOldOnes) {
  const auto session = std::make_shared<RtcSessionRecord>();
  const ValueMap payload{{"n", 3}};
  StoreBatch batch;
  const AnalyticsRow event{3.5, {"first", "second"}, payload};
  batch.add(event, StoreRowText(event));
  ASSERT_TRUE(batch.share({3.5, session, 4, 3, payload}));
  EXPECT_EQ(store_.write(batch), StoreDatabase::Result::kDone);
  EXPECT_EQ(write(RtcMessageRow{4.5, session, 4, 4, {{"m", 4}}}, AnalyticsRow{4.5, "single", {{"n", 4}}}),
            StoreDatabase::Result::kDone);
  EXPECT_THAT(rows("SELECT id, payload FROM analytics_event ORDER BY id", 2),
              ElementsAre(R"(20 {"n":1})", R"(21 {"n":1})", R"(24 {"n":2})", R"(42 {"n":3})", R"(43 {"n":3})",
                          R"(44 {"n":4})"));
  EXPECT_THAT(rows("SELECT id, rtc_session, payload FROM rtc_message ORDER BY id", 3),
              ElementsAre(R"(10 5 {"m":1})", R"(20 5 {"m":2})", R"(21 6 {"n":3})", R"(22 6 {"m":4})"));
}

TEST_F(StoreMigrationTest, MakesTheTablesOfANewFile) {
  EXPECT_EQ(write(), StoreDatabase::Result::kDone);
  const TemporaryDirectory directory;
  StoreDatabase made(directory.path(), json_, clock_);
  EXPECT_EQ(made.write({}), StoreDatabase::Result::kDone);
  const std::vector<std::string> migrated = rows(kColumns, 6);
  ASSERT_TRUE(file_.open(directory.path("reports.db"), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(migrated, rows(kColumns, 6));
  EXPECT_THAT(migrated, Contains(HasSubstr("view rtc_message payload")));
}

TEST_F(FileWithoutUsersTest, KeepsItsRowsAndItsViewsAndGetsTheColumnsOfANewFile) {
  const std::vector<std::string> before = contents();
  ASSERT_THAT(before, SizeIs(8));
  EXPECT_EQ(write(), StoreDatabase::Result::kDone);
  EXPECT_EQ(contents(), before);
  EXPECT_EQ(version(), kStoreSchemaVersion);
  const std::vector<std::string> columns = rows(kColumns, 6);
  EXPECT_THAT(columns, Contains("table analytics_row user_id INTEGER 0 0"));
  const TemporaryDirectory directory;
  StoreDatabase made(directory.path(), json_, clock_);
  EXPECT_EQ(made.write({}), StoreDatabase::Result::kDone);
  ASSERT_TRUE(file_.open(directory.path("reports.db"), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(columns, rows(kColumns, 6));
}

TEST_F(FileWithoutUsersTest, ItsRowsHaveNoUserAndNewOnesHave) {
  const MetricRow row{4.5, 7, "m"};
  StoreBatch batch;
  batch.add(row, StoreRowText(row), {.user = 1001});
  EXPECT_EQ(store_.write(batch), StoreDatabase::Result::kDone);
  EXPECT_THAT(rows("SELECT id, coalesce(user_id, 'none') FROM metric ORDER BY id", 2),
              ElementsAre("3 none", "4 1001"));
  EXPECT_THAT(rows("SELECT count(user_id) FROM analytics_row"), ElementsAre("0"));
}

TEST_F(FileWithoutUsersTest, AFailureInTheMiddleLeavesItWithoutUsers) {
  ASSERT_TRUE(file_.run("ALTER TABLE rtc_row ADD COLUMN user_id INTEGER"));
  EXPECT_EQ(write(), StoreDatabase::Result::kFailed);
  EXPECT_EQ(file_.number("SELECT count(*) FROM pragma_table_info('analytics_row')"), 6);

  ASSERT_TRUE(file_.run("ALTER TABLE rtc_row DROP COLUMN user_id"));
  EXPECT_EQ(write(), StoreDatabase::Result::kDone);
  EXPECT_EQ(file_.number("SELECT count(*) FROM pragma_table_info('analytics_row')"), 10);
}

// A crash leaves a transaction without its end, as a failure does.
TEST_F(StoreMigrationTest, AFailureInTheMiddleLeavesTheOldVersion) {
  const std::vector<std::string> before = contents();
  ASSERT_TRUE(file_.run("CREATE TABLE rtc_row (in_the_way)"));
  EXPECT_EQ(write(), StoreDatabase::Result::kFailed);
  EXPECT_THAT(store_.problem(), HasSubstr("rtc_row"));
  EXPECT_EQ(version(), 1);
  EXPECT_EQ(contents(), before);
  EXPECT_EQ(file_.number("SELECT count(*) FROM pragma_table_info('analytics_row')"), 4);

  ASSERT_TRUE(file_.run("DROP TABLE rtc_row"));
  EXPECT_EQ(write(), StoreDatabase::Result::kDone);
  EXPECT_EQ(contents(), before);
}

// The disk has room for ever more pages, until it has room for all.
TEST_F(StoreMigrationTest, AFullDiskLeavesTheOldVersionUntilThereIsRoom) {
  const std::vector<std::string> before = contents();
  ASSERT_THAT(before, SizeIs(8));
  const std::uintmax_t logBytes = std::filesystem::file_size(path() + "-wal");
  ASSERT_GT(logBytes, 0U);
  int failures = 0;
  for (std::uintmax_t room = 0; version() == 1; room += 4096) {
    ASSERT_LT(room, 1U << 20);
    StoreDatabase::Result result;
    {
      const FullDisk full(logBytes + room);
      result = write();
    }
    if (result == StoreDatabase::Result::kDone) break;
    ++failures;
    EXPECT_EQ(result, StoreDatabase::Result::kFailed);
    EXPECT_EQ(store_.problem(), "disk I/O error");
    ASSERT_EQ(contents(), before);
    // What follows the migration may have failed.
    const int columns = version() == 1 ? 4 : 10;
    ASSERT_EQ(file_.number("SELECT count(*) FROM pragma_table_info('analytics_row')"), columns);
    ASSERT_THAT(rows("PRAGMA integrity_check"), ElementsAre("ok"));
  }
  EXPECT_GT(failures, 1);
  EXPECT_EQ(write(), StoreDatabase::Result::kDone);
  EXPECT_EQ(version(), kStoreSchemaVersion);
  EXPECT_EQ(contents(), before);
  EXPECT_THAT(rows("PRAGMA integrity_check"), ElementsAre("ok"));
}

TEST_F(StoreMigrationTest, TheReaderReadsAFileThatNoDaemonHasMigratedYet) {
  StoreReader reader;
  ASSERT_EQ(reader.open(directory_.path()), StoreReader::Outcome::kDone);
  std::vector<std::string> found;
  EventFilter filter;
  filter.name = "telephony*";
  EXPECT_TRUE(reader.readRtcMessages(
      filter, [&](const StoredRtcMessage& message) { found.push_back(message.payload); }));
  EXPECT_TRUE(reader.readEvents({}, [&](const StoredEvent& event) { found.push_back(event.payload); }));
  EXPECT_THAT(found, ElementsAre(R"({"m":1})", R"({"m":2})", R"({"n":1})", R"({"n":1})", R"({"n":2})"));
  EXPECT_EQ(version(), 1);
}

}  // namespace
}  // namespace tonewerk
