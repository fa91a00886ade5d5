// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreSalvage.h"

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/linux/store/EarlierFile.h"
#include "platform/linux/store/FullDisk.h"
#include "platform/linux/store/RowsOf.h"
#include "platform/linux/store/StoreDatabase.h"
#include "platform/linux/store/StoreMarks.h"
#include "platform/linux/store/StoreSchema.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

constexpr std::chrono::seconds kLongEnough{30};
constexpr int kRows = 1000;  // of each kind

class StoreSalvageTest : public testing::Test {
 protected:
  // Makes a store with rows in all tables, of which some have pages of their own.
  StoreSalvageTest() {
    const auto session = std::make_shared<RtcSessionRecord>();
    session->sessionInfo = {{"s", 1}};
    StoreDatabase store(directory_.path(), json_, clock_);
    for (int n = 0; n < kRows;) {
      StoreBatch batch;
      for (const int end = n + 200; n < end; ++n) {
        const std::string text(n % 50 == 49 ? 20'000 : 300, 'x');
        add(batch, AnalyticsRow{clock_.now(), "name " + std::to_string(n % 20), {{"n", n}, {"text", text}}});
        add(batch, PowerRow{clock_.now(), 28, "power", {{"n", n}, {"text", text}}});
        add(batch, MetricRow{clock_.now(), 7, text});
        add(batch, RtcMessageRow{clock_.now(), session, 4, 1, {{"m", n}}});
      }
      EXPECT_EQ(store.write(batch), StoreDatabase::Result::kDone);
    }
  }

  template <typename Row>
  static void add(StoreBatch& batch, const Row& row) {
    batch.add(row, StoreRowText(row), {.user = 1001});
  }
  // Everything in the tables of a file, a text for each row.
  static std::vector<std::string> contentsOf(const std::string& path) {
    SqliteDatabase file;
    EXPECT_TRUE(file.open(path, SqliteDatabase::Mode::kReadOnly, kLongEnough)) << file.problem();
    std::vector<std::string> all;
    for (const auto& [sql, columns] : std::vector<std::pair<std::string, int>>{
             {"SELECT id, recorded_at, name_set, payload, user_id FROM analytics_row", 5},
             {"SELECT id, recorded_at, event_group, name, payload, user_id FROM power_event", 6},
             {"SELECT id, posted_at, identifier, length(record), user_id FROM metric", 5},
             {"SELECT id, started_at, session_info, user_info, user_id FROM rtc_session", 5},
             {"SELECT id, sent_at, rtc_session, category, type, payload, user_id FROM rtc_row", 7}}) {
      for (std::string& row : rowsOf(file, sql, columns)) all.push_back(sql.substr(10, 20) + row);
    }
    std::sort(all.begin(), all.end());
    return all;
  }
  std::int64_t pageOf(const std::string& name) {
    SqliteDatabase file;
    EXPECT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
    return file.number("SELECT rootpage FROM sqlite_master WHERE name = '" + name + "'").value_or(0);
  }
  std::int64_t firstLeafOf(const std::string& name) {
    SqliteDatabase file;
    EXPECT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
    return file
        .number("SELECT pageno FROM dbstat WHERE name = '" + name +
                "' AND pagetype = 'leaf' ORDER BY path LIMIT 1")
        .value_or(0);
  }
  std::int64_t pages() const {
    return static_cast<std::int64_t>(std::filesystem::file_size(path())) / kPageBytes;
  }
  void damagePage(std::int64_t page) {
    std::fstream file(path(), std::ios::in | std::ios::out | std::ios::binary);
    file.seekp((page - 1) * kPageBytes);
    file << std::string(kPageBytes, '\xff');
  }

  static std::string contentsOfFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }

  std::string path() const { return directory_.path("reports.db"); }
  std::string salvaged() const { return directory_.path("salvaged.db"); }

  static constexpr std::int64_t kPageBytes = 8192;
  TemporaryDirectory directory_;
  MemoryJsonService json_;
  ManualClock clock_;
};

TEST_F(StoreSalvageTest, AWholeFileIsCopiedWhole) {
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_EQ(salvage.problem(), "");
  EXPECT_EQ(salvage.rows(), 4 * kRows + 1);
  EXPECT_EQ(contentsOf(salvaged()), contentsOf(path()));
  SqliteDatabase file;
  ASSERT_TRUE(file.open(salvaged(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(file.number("SELECT count(*) FROM analytics_event"), kRows);
  EXPECT_EQ(file.number("SELECT count(*) FROM age_clock"), 1);
  EXPECT_EQ(file.number("PRAGMA user_version"), kStoreSchemaVersion);
  EXPECT_EQ(file.number("PRAGMA auto_vacuum"), 2);
  EXPECT_THAT(rowsOf(file, "PRAGMA integrity_check"), ElementsAre("ok"));
}

TEST_F(StoreSalvageTest, LivesOfSessionsAndWhatEventsSayOfThemAreCopied) {
  const TemporaryDirectory folder;
  const std::string whole = folder.path("reports.db");
  {
    StoreDatabase store(folder.path(), json_, clock_);
    const auto life =
        std::make_shared<SessionLife>(SessionBeginning{.reporterID = 7, .at = 1.0, .request = 3});
    const LifeRow session{life, "app", "process", SessionEnd{.at = 4.0, .messages = 5}};
    const AnalyticsRow event{2.0,
                             "com.orvane.x",
                             {{"n", 1}},
                             {.category = kCategoryVolume,
                              .type = kTypeSummary,
                              .source = EventSource::kDerived,
                              .life = life,
                              .stretch = TimeStretch{1.0, 2.0}}};
    StoreBatch batch;
    batch.add(session, StoreRowText(session));
    batch.add(event, StoreRowText(event));
    ASSERT_EQ(store.write(batch), StoreDatabase::Result::kDone) << store.problem();
  }
  const std::string copy = folder.path("copy.db");
  const StoreSalvage salvage(whole, copy);
  EXPECT_EQ(salvage.problem(), "");
  const auto read = [](const std::string& path) {
    SqliteDatabase file;
    EXPECT_TRUE(file.open(path, SqliteDatabase::Mode::kReadOnly, kLongEnough));
    std::vector<std::string> found = rowsOf(file, "SELECT * FROM session_row", 14);
    for (const char* sql : {"SELECT session, began_at, ended_at FROM analytics_row",
                            "SELECT category, type, source FROM analytics_name",
                            "SELECT id, session_row, analytics_row FROM age_mark"}) {
      for (std::string& row : rowsOf(file, sql, 3)) found.push_back(std::move(row));
    }
    return found;
  };
  const std::vector<std::string> found = read(copy);
  EXPECT_EQ(found, read(whole));
  EXPECT_THAT(found, testing::Contains("1 1.0 2.0"));
  EXPECT_THAT(found, testing::Contains("Volume Summary derived"));
}

// Every third page in turn. A damaged page loses its own rows, and no row is ever invented.
TEST_F(StoreSalvageTest, OneDamagedPageLosesOnlyWhatIsOnIt) {
  const std::vector<std::string> before = contentsOf(path());
  const std::string whole = directory_.path("whole.db");
  std::filesystem::copy_file(path(), whole);
  std::vector<std::int64_t> inner = {1};  // pages above others
  for (const char* name : {"analytics_row", "power_event", "metric", "rtc_row", "rtc_session"}) {
    inner.push_back(pageOf(name));
  }
  {  // without its list of tables a file has none
    SqliteDatabase file;
    ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
    for (const std::string& page :
         rowsOf(file, "SELECT pageno FROM dbstat WHERE name IN ('sqlite_schema', 'sqlite_master')")) {
      inner.push_back(std::stoll(page));
    }
  }
  ASSERT_GT(pages(), 150);
  constexpr std::size_t kMostOnAPage = 300;  // the smallest rows take more than 28 bytes
  for (std::int64_t page = 2; page <= pages(); page += 3) {
    if (std::find(inner.begin(), inner.end(), page) != inner.end()) continue;
    SCOPED_TRACE("page " + std::to_string(page));
    std::filesystem::copy_file(whole, path(), std::filesystem::copy_options::overwrite_existing);
    damagePage(page);
    std::filesystem::remove(salvaged());
    const StoreSalvage salvage(path(), salvaged());
    ASSERT_EQ(salvage.problem(), "");
    const std::vector<std::string> after = contentsOf(salvaged());
    ASSERT_EQ(after.size(), static_cast<std::size_t>(salvage.rows()));
    ASSERT_TRUE(std::includes(before.begin(), before.end(), after.begin(), after.end()));
    ASSERT_GT(after.size(), before.size() - kMostOnAPage);
  }
}

TEST_F(StoreSalvageTest, ATableWhoseRootIsDamagedIsLostAndTheOthersAreNot) {
  damagePage(pageOf("power_event"));
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_EQ(salvage.rows(), 3 * kRows + 1);
}

TEST_F(StoreSalvageTest, NamesAreReadFromTheirIndexWhenTheirTableIsDamaged) {
  damagePage(pageOf("analytics_name"));
  const StoreSalvage salvage(path(), salvaged());
  SqliteDatabase file;
  ASSERT_TRUE(file.open(salvaged(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(file.number("SELECT count(*) FROM analytics_event WHERE name = 'name 7'"), kRows / 20);
}

TEST_F(StoreSalvageTest, EventsWithoutTheirNamesAreKeptAndNewOnesGetOtherNumbers) {
  damagePage(pageOf("analytics_name"));
  damagePage(pageOf("analytics_name_by_name"));
  std::filesystem::create_directories(directory_.path("new"));
  const StoreSalvage salvage(path(), directory_.path("new/reports.db"));
  EXPECT_EQ(salvage.rows(), 4 * kRows + 1);
  StoreDatabase store(directory_.path("new"), json_, clock_);
  StoreBatch batch;
  add(batch, AnalyticsRow{clock_.now(), "new", {{"n", kRows}}});
  EXPECT_EQ(store.write(batch), StoreDatabase::Result::kDone);
  SqliteDatabase file;
  ASSERT_TRUE(file.open(store.path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(file.number("SELECT count(*) FROM analytics_event WHERE name = 'unknown'"), kRows);
  EXPECT_EQ(file.number("SELECT count(*) FROM analytics_event WHERE name = 'new'"), 1);
}

TEST_F(StoreSalvageTest, AFileThatWasCutOffKeepsTheRowsOfItsFirstPart) {
  std::filesystem::resize_file(path(), static_cast<std::uintmax_t>(pages() / 2 * kPageBytes));
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_GT(salvage.rows(), kRows);
}

// Each row's identifier is a number before its columns, which damage can change to any other.
TEST_F(StoreSalvageTest, AnIdentifierThatNoStoreMakesEndsTheTable) {
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(
      file.run("INSERT INTO power_event (id, recorded_at, event_group, name, payload)"
               " VALUES ((1 << 53) + 1, 1.5, 28, 'power', '{}')"));
  file.close();
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_EQ(salvage.problem(), "");
  EXPECT_EQ(salvage.rows(), 4 * kRows + 1);
}

TEST_F(StoreSalvageTest, IdentifiersThatAreOutOfOrderLoseOnlyTheirRows) {
  const std::int64_t page = firstLeafOf("rtc_row");
  // The cells' places are two bytes each, after a header of eight bytes. The outermost two change places.
  std::fstream file(path(), std::ios::in | std::ios::out | std::ios::binary);
  std::string bytes(kPageBytes, '\0');
  file.seekg((page - 1) * kPageBytes);
  file.read(bytes.data(), kPageBytes);
  ASSERT_EQ(bytes[0], 13);
  const std::size_t cells =
      static_cast<unsigned char>(bytes[3]) * 256U + static_cast<unsigned char>(bytes[4]);
  const std::size_t last = 8 + 2 * (cells - 1);
  std::swap(bytes[8], bytes[last]);
  std::swap(bytes[9], bytes[last + 1]);
  file.seekp((page - 1) * kPageBytes);
  file << bytes;
  file.close();
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_EQ(salvage.problem(), "");
  EXPECT_GE(salvage.rows(), 4 * kRows + 1 - static_cast<std::int64_t>(cells));
}

TEST_F(StoreSalvageTest, RowsWhosePayloadIsNoJsonAreLeftBehind) {
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(file.run("UPDATE power_event SET payload = '{\"n\":' WHERE id <= 10"));
  file.close();
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_EQ(salvage.rows(), 4 * kRows + 1 - 10);
}

TEST_F(StoreSalvageTest, NothingIsSavedOfAFileThatIsNoDatabase) {
  std::ofstream(path()) << std::string(100'000, 'x');
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_TRUE(salvage.isMade());
  EXPECT_EQ(salvage.rows(), 0);
}

TEST_F(StoreSalvageTest, AFullDiskKeepsWhatHadRoomAndSaysSo) {
  const FullDisk full(std::filesystem::file_size(path()) / 2);
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_TRUE(salvage.isMade());
  EXPECT_LT(salvage.rows(), 4 * kRows);
  EXPECT_NE(salvage.problem(), "");
}

// Without its mark, what the journal has of a user would be recorded a second time.
TEST_F(StoreSalvageTest, TheMarksOfTheJournalAreCopiedAndDamagedOnesAreNot) {
  {
    StoreDatabase store(directory_.path(), json_, clock_);
    StoreBatch batch;
    const PowerRow row{clock_.now(), 28, "power", {{"n", kRows}}};
    batch.add(row, StoreRowText(row), {.user = 1001, .position = {9, 3}});
    batch.add(row, StoreRowText(row), {.user = kNoUser, .position = {10, 1}});
    ASSERT_EQ(store.write(batch), StoreDatabase::Result::kDone);
  }
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(file.run(
      "INSERT INTO journal_mark VALUES (-1, 5, 1), (4294967296, 5, 1), (1002, -5, 1), (1003, 'x', 1),"
      " (1004, 5, 4294967296), (1005, 5, -1), (1006, 5, 1.5), (1007, 1 << 60, 1)"));
  file.close();
  damagePage(pageOf("power_event"));
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_EQ(salvage.problem(), "");
  std::string problem;
  EXPECT_THAT(readStoreMarks(salvaged(), problem),
              testing::Optional(StoreMarks{{1001, {9, 3}}, {kNoUser, {10, 1}}}));
}

TEST_F(StoreSalvageTest, AFileOfVersionOneIsSavedAsOneOfThisVersion) {
  std::filesystem::remove(path());
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(file.run(
      "CREATE TABLE analytics_row (id INTEGER PRIMARY KEY, recorded_at REAL, name_set INTEGER, payload TEXT);"
      "CREATE TABLE rtc_message (id INTEGER PRIMARY KEY, sent_at REAL, rtc_session INTEGER,"
      " category INTEGER, type INTEGER, payload TEXT);"
      "INSERT INTO analytics_row VALUES (7, 1.5, 1, '{}');"
      "INSERT INTO rtc_message VALUES (9, 1.5, 1, 4, 1, '{}');"
      "PRAGMA user_version = 1"))
      << file.problem();
  file.close();
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_EQ(salvage.problem(), "");
  EXPECT_EQ(salvage.rows(), 2);
  ASSERT_TRUE(file.open(salvaged(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_THAT(rowsOf(file, "SELECT id FROM rtc_message UNION SELECT id FROM analytics_event ORDER BY id"),
              ElementsAre("9", "14"));
}

// Without category and type a message is no event, and a summary no stretch.
TEST_F(StoreSalvageTest, MessagesOfAFileOfVersionTwoHaveTheCategoryAndTypeOfTheirNames) {
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(file.run(intoVersion2WithoutAges() +
                       "INSERT INTO analytics_name VALUES (50, 0, 'com.orvane.tonewerk.Volume.Summary'),"
                       " (50, 1, 'com.orvane.telephony.Volume.Summary');"
                       "INSERT INTO analytics_row (id, recorded_at, name_set, payload) VALUES"
                       " (5000, 1.5, 50, '{\"play_seconds\":2.5}')"))
      << file.problem();
  file.close();
  damagePage(pageOf("power_event"));
  const StoreSalvage salvage(path(), salvaged());
  EXPECT_EQ(salvage.problem(), "");
  ASSERT_TRUE(file.open(salvaged(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_THAT(rowsOf(file, "SELECT id, category, type, source IS NULL FROM event", 4),
              ElementsAre("5000 Volume Summary 1"));
  EXPECT_THAT(rowsOf(file, "SELECT seconds FROM volume_stretch"), ElementsAre("2.5"));
}

// The index lacks category and type.
TEST_F(StoreSalvageTest, MessagesWhoseNamesAreReadFromTheIndexHaveTheCategoryAndTypeOfTheirNames) {
  {
    StoreDatabase store(directory_.path(), json_, clock_);
    const AnalyticsRow event{clock_.now(),
                             "com.orvane.tonewerk.Volume.Summary",
                             {{"play_seconds", 2.5}},
                             {.category = kCategoryVolume, .type = kTypeSummary}};
    StoreBatch batch;
    add(batch, event);
    ASSERT_EQ(store.write(batch), StoreDatabase::Result::kDone);
  }
  damagePage(pageOf("analytics_name"));
  const StoreSalvage salvage(path(), salvaged());
  SqliteDatabase file;
  ASSERT_TRUE(file.open(salvaged(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_THAT(rowsOf(file, "SELECT category, type FROM event", 2), ElementsAre("Volume Summary"));
}

// --- Identifiers after a salvage ---

// A store of whose tables one has lost rows.
class LostRowsTest : public StoreSalvageTest, public testing::WithParamInterface<std::string> {
 protected:
  StoreBatch batchOfAll() {
    const auto session = std::make_shared<RtcSessionRecord>();
    StoreBatch batch;
    add(batch, AnalyticsRow{clock_.now(), "name", {{"n", kRows}}});
    add(batch, PowerRow{clock_.now(), 28, "power", {{"n", kRows}}});
    add(batch, MetricRow{clock_.now(), 7, "m"});
    add(batch, RtcMessageRow{clock_.now(), session, 4, 1, {{"m", kRows}}});
    return batch;
  }
  static void write(StoreDatabase& store, const StoreBatch& batch) {
    ASSERT_EQ(store.write(batch), StoreDatabase::Result::kDone) << store.problem();
  }
  std::int64_t number(const std::string& sql) {
    SqliteDatabase file;
    EXPECT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
    return file.number(sql).value_or(-1);
  }
  std::int64_t highest() { return number("SELECT coalesce(max(id), 0) FROM " + GetParam()); }
  // The page with the last rows of the table.
  std::int64_t lastPage() {
    return number("SELECT pageno FROM dbstat WHERE name = '" + GetParam() +
                  "' AND pagetype = 'leaf'"
                  " ORDER BY path DESC LIMIT 1");
  }
};

INSTANTIATE_TEST_SUITE_P(Store, LostRowsTest,
                         testing::Values("analytics_row", "metric", "power_event", "rtc_session", "rtc_row"),
                         [](const auto& info) { return info.param; });

// The rows before the damage were two hours old. When they are too old, those after it must not go with them.
TEST_P(LostRowsTest, NewRowsOfATableWhoseRowsAreLostAreNotTakenForOld) {
  {
    StoreDatabase store(directory_.path(), json_, clock_);
    clock_.advance(std::chrono::hours(2));
    write(store, {});
  }
  const std::int64_t before = highest();
  damagePage(pageOf(GetParam()));
  StoreDatabase store(directory_.path(), json_, clock_);
  store.setBounds({.bytes = StoreBounds().bytes, .seconds = 30 * 86'400.0});
  if (store.write(batchOfAll()) == StoreDatabase::Result::kCorrupt) {
    ASSERT_TRUE(store.beginAnew());
  }
  clock_.advance(std::chrono::hours(24));
  write(store, batchOfAll());
  write(store, batchOfAll());
  clock_.advance(std::chrono::hours(29 * 24 + 2));
  write(store, {});
  for (bool moreToDo = true; moreToDo;) {
    moreToDo = false;
    ASSERT_EQ(store.trimAge(moreToDo), StoreDatabase::Result::kDone);
  }
  EXPECT_GE(number("SELECT count(*) FROM " + GetParam()), 2);
  EXPECT_GT(number("SELECT min(id) FROM " + GetParam()), before);
}

TEST_P(LostRowsTest, AnIdentifierThatWasGivenOutIsNotUsedAgain) {
  const std::int64_t before = highest();  // no mark knows it
  damagePage(lastPage());
  const StoreSalvage salvage(path(), salvaged());
  ASSERT_EQ(salvage.problem(), "");
  std::filesystem::rename(salvaged(), path());
  ASSERT_LT(highest(), before);
  StoreDatabase store(directory_.path(), json_, clock_);
  write(store, batchOfAll());
  const std::int64_t first = highest();
  EXPECT_GT(first, before);
  write(store, batchOfAll());
  EXPECT_EQ(highest(), first + 1);
  EXPECT_EQ(number("SELECT count(*) FROM rtc_message WHERE rtc_session NOT IN (SELECT id FROM rtc_session)"),
            GetParam() == "rtc_session" ? number("SELECT count(*) FROM rtc_message") - 2 : 0);
}

TEST_P(LostRowsTest, ASecondSalvageKnowsWhatTheFirstHasLost) {
  const std::int64_t before = highest();
  damagePage(lastPage());
  const StoreSalvage first(path(), salvaged());
  const std::string again = directory_.path("again.db");
  const StoreSalvage second(salvaged(), again);
  std::filesystem::rename(again, path());
  StoreDatabase store(directory_.path(), json_, clock_);
  write(store, batchOfAll());
  EXPECT_GT(highest(), before);
}

TEST_F(StoreSalvageTest, AWholeFileContinuesWithTheNextIdentifiers) {
  const StoreSalvage salvage(path(), salvaged());
  std::filesystem::rename(salvaged(), path());
  StoreDatabase store(directory_.path(), json_, clock_);
  StoreBatch batch;
  add(batch, PowerRow{clock_.now(), 28, "power", {{"n", kRows}}});
  ASSERT_EQ(store.write(batch), StoreDatabase::Result::kDone);
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(file.number("SELECT max(id) FROM power_event"), kRows + 1);
}

// The way of a store's thread: a write that finds the damage, the new file, the same write again.
TEST_F(StoreSalvageTest, ADamagedStoreGoesOnWithItsRowsAndTheDamagedFileIsKept) {
  damagePage(pageOf("power_event"));
  StoreDatabase store(directory_.path(), json_, clock_);
  StoreBatch batch;
  add(batch, PowerRow{clock_.now(), 28, "power", {{"n", kRows}}});
  ASSERT_EQ(store.write(batch), StoreDatabase::Result::kCorrupt);
  ASSERT_TRUE(store.beginAnew());
  EXPECT_EQ(store.salvagedRows(), 3 * kRows + 1);
  EXPECT_EQ(store.write(batch), StoreDatabase::Result::kDone) << store.problem();
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(file.number("SELECT count(*) FROM analytics_event"), kRows);
  EXPECT_EQ(file.number("SELECT count(*) FROM power_event"), 1);
  EXPECT_TRUE(std::filesystem::exists(path() + ".corrupt"));
  EXPECT_FALSE(std::filesystem::exists(path() + ".salvaged"));
}

// The damaged file is the only one with all its rows.
TEST_F(StoreSalvageTest, ADamagedFileWhoseRowsHaveNoRoomStaysUntilTheyHave) {
  damagePage(pageOf("power_event"));
  std::ofstream(path() + ".corrupt") << "earlier";
  StoreDatabase store(directory_.path(), json_, clock_);
  StoreBatch batch;
  add(batch, PowerRow{clock_.now(), 28, "power", {{"n", kRows}}});
  ASSERT_EQ(store.write(batch), StoreDatabase::Result::kCorrupt);
  const std::uintmax_t bytes = std::filesystem::file_size(path());
  {
    const FullDisk full(bytes / 2);
    EXPECT_FALSE(store.beginAnew());
  }
  EXPECT_THAT(store.problem(), HasSubstr("cannot be saved"));
  EXPECT_EQ(std::filesystem::file_size(path()), bytes);
  EXPECT_EQ(std::filesystem::file_size(path() + ".corrupt"), 7U);
  EXPECT_FALSE(std::filesystem::exists(path() + ".salvaged"));

  // Copying everything again at each try would wear the disk out.
  ASSERT_EQ(store.write(batch), StoreDatabase::Result::kCorrupt);
  EXPECT_FALSE(store.beginAnew());
  EXPECT_THAT(store.problem(), HasSubstr("cannot be saved"));
  clock_.advance(StoreDatabase::kSalvageInterval);
  EXPECT_TRUE(store.beginAnew());
  EXPECT_EQ(store.salvagedRows(), 3 * kRows + 1);
  EXPECT_EQ(store.write(batch), StoreDatabase::Result::kDone) << store.problem();
}

// A process that ends while a damaged file is replaced leaves the files of the steps that it has done. Here a
// folder in the way of one step stops it there.
class StoppedSalvageTest : public StoreSalvageTest, public testing::WithParamInterface<std::string> {
 protected:
  void putInTheWay(const std::string& name) { std::filesystem::create_directories(name + "/full"); }
};

INSTANTIATE_TEST_SUITE_P(Store, StoppedSalvageTest, testing::Values("-wal", "-shm", ""),
                         [](const auto& info) { return "At" + (info.param + "-main").substr(1, 3); });

TEST_P(StoppedSalvageTest, LosesNoRowAndTheNextStartGoesOnWithIt) {
  const std::string copy = directory_.path("copy.db");
  {
    // The newest rows are in the write-ahead log alone.
    StoreDatabase writer(directory_.path(), json_, clock_);
    StoreBatch batch;
    add(batch, MetricRow{clock_.now(), 8, "in the log"});
    ASSERT_EQ(writer.write(batch), StoreDatabase::Result::kDone);
    for (const char* suffix : {"", "-wal", "-shm"})
      std::filesystem::copy_file(path() + suffix, copy + suffix);
  }
  for (const char* suffix : {"-wal", "-shm", ""}) {
    std::filesystem::rename(copy + suffix, path() + suffix);
    std::ofstream(path() + ".corrupt" + suffix) << "earlier";
  }
  damagePage(pageOf("power_event"));
  for (const char* suffix : {"-wal", "-shm", ""}) {
    std::filesystem::copy_file(path() + suffix, copy + suffix);
  }
  const std::string inTheWay = path() + ".corrupt" + GetParam();
  {
    StoreDatabase store(directory_.path(), json_, clock_);
    StoreBatch batch;
    add(batch, PowerRow{clock_.now(), 28, "power", {{"n", kRows}}});
    ASSERT_EQ(store.write(batch), StoreDatabase::Result::kCorrupt);
    for (const char* suffix : {"-wal", "-shm", ""}) {  // closing it has emptied its log
      std::filesystem::copy_file(copy + suffix, path() + suffix,
                                 std::filesystem::copy_options::overwrite_existing);
    }
    std::filesystem::remove(inTheWay);
    putInTheWay(inTheWay);
    ASSERT_FALSE(store.beginAnew());
    EXPECT_EQ(store.write(batch), StoreDatabase::Result::kFailed);
  }
  std::filesystem::remove_all(inTheWay);
  StoreDatabase store(directory_.path(), json_, clock_);
  ASSERT_EQ(store.write({}), StoreDatabase::Result::kDone) << store.problem();
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(file.number("SELECT count(*) FROM metric"), kRows + 1);
  EXPECT_EQ(file.number("SELECT count(*) FROM power_event"), 0);
  EXPECT_FALSE(std::filesystem::exists(path() + ".salvaged"));
  for (const char* suffix : {"", "-wal"}) {
    EXPECT_EQ(contentsOfFile(path() + ".corrupt" + suffix), contentsOfFile(copy + suffix)) << suffix;
  }
}

TEST_F(StoreSalvageTest, WhatAnEndedProcessHasNotSavedToTheEndIsNotTaken) {
  std::ofstream(path() + ".salvaging") << "half";
  StoreDatabase store(directory_.path(), json_, clock_);
  EXPECT_EQ(store.write({}), StoreDatabase::Result::kDone);
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(file.number("SELECT count(*) FROM analytics_event"), kRows);
  EXPECT_FALSE(std::filesystem::exists(path() + ".salvaging"));
}

TEST_F(StoreSalvageTest, RowsThatAnEndedProcessHasSavedAreTakenAtTheNextStart) {
  std::filesystem::rename(path(), path() + ".salvaged");
  StoreDatabase store(directory_.path(), json_, clock_);
  EXPECT_EQ(store.write({}), StoreDatabase::Result::kDone);
  SqliteDatabase file;
  ASSERT_TRUE(file.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  EXPECT_EQ(file.number("SELECT count(*) FROM analytics_event"), kRows);
}

}  // namespace
}  // namespace tonewerk
