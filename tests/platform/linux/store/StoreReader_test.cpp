// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreReader.h"

#include <chrono>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreFile.h"
#include "platform/linux/store/StoreSchema.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class StoreReaderTest : public testing::Test {
 protected:
  void openStore() {
    store_ =
        std::make_unique<ReportStore>(directory_.path(), json_, preferences_, clock_, accounts_, category_);
  }
  // Records an event ten seconds after the one before.
  void record(const std::string& name) {
    clock_.advance(10.0);
    store_->recordEvent(clock_.now(), name, {{"n", ++recorded_}});
    EXPECT_TRUE(store_->flush(std::chrono::seconds(30)));
  }
  std::vector<std::string> payloads(const EventFilter& filter = {}) {
    std::vector<std::string> found;
    EXPECT_TRUE(reader_.readEvents(filter, [&](const StoredEvent& event) {
      found.push_back(event.payload);
      lastId_ = event.id;
    })) << reader_.problem();
    return found;
  }
  StoreReader::Outcome open() { return reader_.open(directory_.path()); }

  TemporaryDirectory directory_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  MemoryJsonService json_;
  MemoryPreferenceStore preferences_;
  ManualClock clock_;
  Accounts accounts_{990, clock_};
  std::unique_ptr<ReportStore> store_;
  StoreReader reader_;
  int recorded_ = 0;
  std::int64_t lastId_ = 0;
};

TEST_F(StoreReaderTest, ReportsThatThereIsNoStore) {
  EXPECT_EQ(open(), StoreReader::Outcome::kNoStore);
  EXPECT_THAT(reader_.problem(), HasSubstr("no such file"));
}

TEST_F(StoreReaderTest, ReportsThatAnEmptyFileHoldsNothingYet) {
  { const std::ofstream empty(directory_.path("reports.db")); }
  EXPECT_EQ(open(), StoreReader::Outcome::kNoStore);
}

TEST_F(StoreReaderTest, FailsWithAFileThatIsNoDatabase) {
  std::ofstream(directory_.path("reports.db")) << std::string(10'000, 'x');
  EXPECT_EQ(open(), StoreReader::Outcome::kFailed);
  EXPECT_THAT(reader_.problem(), HasSubstr("not a database"));
}

TEST_F(StoreReaderTest, ReadsWhileTheStoreWrites) {
  openStore();
  record("a");
  ASSERT_EQ(open(), StoreReader::Outcome::kDone);
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":1})"));
  record("b");
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":1})", R"({"n":2})"));
}

TEST_F(StoreReaderTest, ReadsWithoutAWriterAndItsSideFiles) {
  openStore();
  record("a");
  store_.reset();
  ASSERT_FALSE(std::filesystem::exists(directory_.path("reports.db-wal")));
  ASSERT_EQ(open(), StoreReader::Outcome::kDone);
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":1})"));
}

// SQLite stores any bytes as text, and a store may be older than the rule that only valid text is stored.
TEST_F(StoreReaderTest, ReturnsValidTextForAnyBytesInTheFile) {
  openStore();
  store_->recordEvent(clock_.now(), "x.a", {{"processName", "lecteur-musiqu\xC3"}});
  ASSERT_TRUE(store_->flush(std::chrono::seconds(30)));
  ASSERT_EQ(open(), StoreReader::Outcome::kDone);
  EXPECT_THAT(payloads(), ElementsAre("{\"processName\":\"lecteur-musiqu\uFFFD\"}"));
}

TEST_F(StoreReaderTest, ReadsTheEventsThatPassTheFilter) {
  openStore();
  for (const char* name : {"x.a", "x.b", "y.a", "y.b"}) record(name);
  ASSERT_EQ(open(), StoreReader::Outcome::kDone);
  EventFilter names;
  names.name = "x.*";
  EXPECT_THAT(payloads(names), ElementsAre(R"({"n":1})", R"({"n":2})"));
  EventFilter times;
  times.since = ManualClock::kStart + 20.0;
  times.until = ManualClock::kStart + 30.0;
  EXPECT_THAT(payloads(times), ElementsAre(R"({"n":2})", R"({"n":3})"));
  EventFilter newest;
  newest.name = "*.a";
  newest.limit = 1;
  EXPECT_THAT(payloads(newest), ElementsAre(R"({"n":3})"));
}

TEST_F(StoreReaderTest, ContinuesAfterTheLastEvent) {
  openStore();
  record("a");
  ASSERT_EQ(open(), StoreReader::Outcome::kDone);
  payloads();
  EventFilter next;
  next.afterId = lastId_;
  EXPECT_THAT(payloads(next), IsEmpty());
  record("b");
  EXPECT_THAT(payloads(next), ElementsAre(R"({"n":2})"));
}

TEST_F(StoreReaderTest, SplitsTheTwoNamesOfARowBetweenTwoReads) {
  openStore();
  clock_.advance(1.0);
  store_->recordEvent(clock_.now(), {"first", "second"}, {{"n", 1}});
  ASSERT_TRUE(store_->flush(std::chrono::seconds(30)));
  ASSERT_EQ(open(), StoreReader::Outcome::kDone);
  std::vector<StoredEvent> all;
  ASSERT_TRUE(reader_.readEvents({}, [&](const StoredEvent& event) { all.push_back(event); }));
  ASSERT_EQ(all.size(), 2U);
  EventFilter next;
  next.afterId = all[0].id;
  std::vector<std::string> names;
  ASSERT_TRUE(reader_.readEvents(next, [&](const StoredEvent& event) { names.push_back(event.name); }));
  EXPECT_THAT(names, ElementsAre("second"));
}

// docs/store.md recommends this query to programs that follow the events.
TEST_F(StoreReaderTest, TheEventsAfterAnIdentifierAreFoundByKeyAndNotSorted) {
  openStore();
  for (int n = 0; n < 20; ++n) {
    clock_.advance(1.0);
    store_->recordEvent(clock_.now(), n % 3 == 0 ? EventNames("x") : EventNames("first", "second"),
                        {{"n", n}});
  }
  ASSERT_TRUE(store_->flush(std::chrono::seconds(30)));
  SqliteDatabase database;
  ASSERT_TRUE(database.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadOnly,
                            std::chrono::seconds(30)));
  const auto rows = [&](const std::string& sql, std::int64_t after, int column) {
    SqliteStatement select = database.prepare(sql);
    select.bind(1, after);
    std::vector<std::string> found;
    while (select.step() == SqliteStatement::Step::kRow) found.push_back(select.text(column));
    return found;
  };
  const std::string query =
      "SELECT r.id * 2 + n.position AS event, r.recorded_at, n.name, r.payload"
      " FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set"
      " WHERE r.id >= ?1 / 2 AND event > ?1 ORDER BY r.id, n.position LIMIT 10";
  for (std::int64_t after = 0; after < 45; ++after) {
    const std::string view = "FROM analytics_event WHERE id > ?1 ORDER BY id LIMIT 10";
    EXPECT_EQ(rows(query, after, 0), rows("SELECT id " + view, after, 0)) << after;
    EXPECT_EQ(rows(query, after, 2), rows("SELECT name " + view, after, 0)) << after;
  }
  EXPECT_THAT(rows("EXPLAIN QUERY PLAN " + query, 0, 3),
              ElementsAre(HasSubstr("SEARCH r USING INTEGER PRIMARY KEY (rowid>?)"),
                          HasSubstr("SEARCH n USING PRIMARY KEY (name_set=?)")));
}

TEST_F(StoreReaderTest, SumsDurationsOfEveryKind) {
  openStore();
  record("a");
  for (const Value& duration : {Value(2), Value(0.5), Value("1.5 s"), Value(true), Value(ValueArray{9}),
                                Value(std::nan(""))}) {  // the last is stored as null, so it is not counted
    store_->record(PowerRow{clock_.now(), 28, "x", {{"EngineOnDuration", duration}, {"ApplicationName", 7}}});
  }
  store_->record(PowerRow{clock_.now(), 28, "x", {{"ApplicationName", "nobody"}}});
  ASSERT_TRUE(store_->flush(std::chrono::seconds(30)));
  ASSERT_EQ(open(), StoreReader::Outcome::kDone);
  std::vector<EngineOnTotal> totals;
  ASSERT_TRUE(reader_.readEngineOnTotals({}, [&](const EngineOnTotal& total) { totals.push_back(total); }))
      << reader_.problem();
  ASSERT_EQ(totals.size(), 1U);
  EXPECT_EQ(totals[0].application, "7");
  EXPECT_EQ(totals[0].duration, 5.0);
  EXPECT_EQ(totals[0].events, 5);
}

TEST_F(StoreReaderTest, NoticesThatTheFileWasMoved) {
  openStore();
  record("a");
  ASSERT_EQ(open(), StoreReader::Outcome::kDone);
  EXPECT_FALSE(reader_.hasMoved());
  std::filesystem::rename(directory_.path("reports.db"), directory_.path("reports.db.corrupt"));
  EXPECT_TRUE(reader_.hasMoved());
}

// Runs on a store that has three sessions with messages, and a message without one.
class StoreReaderSessionsTest : public testing::Test {
 protected:
  StoreReaderSessionsTest() {
    SqliteDatabase database;
    EXPECT_TRUE(database.open(storeFileIn(directory_.path()).path, SqliteDatabase::Mode::kReadWrite,
                              std::chrono::seconds(5)));
    EXPECT_TRUE(database.run(storeSchema()));
    EXPECT_TRUE(database.run(
        "INSERT INTO session_row (id, started_at, reporter_id, service, application) VALUES"
        " (1, 10, 7, 'telephony', 'Phone'), (2, 10, 8, 'longformaudio', 'Melody'), (3, 10, 9, NULL, NULL);"
        "INSERT INTO analytics_name (name_set, position, name, source) VALUES"
        " (1, 0, 'tonewerk.Start', 'client'), (1, 1, 'service.Start', 'client'),"
        " (2, 0, 'tonewerk.Summary', 'derived'), (3, 0, 'alone', 'client');"
        "INSERT INTO analytics_row (id, recorded_at, name_set, payload, session, began_at, ended_at) VALUES"
        " (1, 11, 1, '{}', 1, NULL, NULL), (2, 12, 1, '{}', 2, NULL, NULL), (3, 13, 3, '{}', NULL, NULL, "
        "NULL),"
        " (4, 14, 2, '{\"active_devices\":\"Speaker\"}', 2, 12, 14), (5, 15, 1, '{}', 3, NULL, NULL);"));
  }

  std::string idsOf(const EventFilter& filter) {
    std::string ids;
    StoreReader reader;
    EXPECT_EQ(reader.open(directory_.path()), StoreReader::Outcome::kDone) << reader.problem();
    EXPECT_TRUE(reader.readMessages(filter, [&](const StoredMessage& message) {
      ids += std::to_string(message.id) + " ";
    })) << reader.problem();
    return ids;
  }

  TemporaryDirectory directory_;
};

TEST_F(StoreReaderSessionsTest, HasEachMessageOnceWithItsNamesAndSession) {
  StoreReader reader;
  ASSERT_EQ(reader.open(directory_.path()), StoreReader::Outcome::kDone);
  std::vector<StoredMessage> messages;
  EXPECT_TRUE(reader.readMessages({}, [&](const StoredMessage& message) { messages.push_back(message); }));
  ASSERT_EQ(messages.size(), 5U);
  EXPECT_EQ(messages[0].name, "tonewerk.Start");
  EXPECT_EQ(messages[0].secondName, "service.Start");
  EXPECT_EQ(messages[0].session, 1);
  EXPECT_EQ(messages[0].application, "Phone");
  EXPECT_FALSE(messages[0].isDerived);
  EXPECT_EQ(messages[2].secondName, std::nullopt);
  EXPECT_EQ(messages[2].session, std::nullopt);
  EXPECT_EQ(messages[3].recordedAt, 14.0);
  EXPECT_TRUE(messages[3].isDerived);
}

TEST_F(StoreReaderSessionsTest, ChoosesMessagesByTheirSessions) {
  EXPECT_EQ(idsOf({}), "1 2 3 4 5 ");
  EXPECT_EQ(idsOf({.session = 2}), "2 4 ");
  EXPECT_EQ(idsOf({.application = "Mel*"}), "2 4 ");
  EXPECT_EQ(idsOf({.service = "tele*"}), "1 ");
  EXPECT_EQ(idsOf({.service = "unknown"}), "5 ");
  EXPECT_EQ(idsOf({.device = "Sp*"}), "2 4 ");
  EXPECT_EQ(idsOf({.application = "Phone", .device = "Sp*"}), "");
  EXPECT_EQ(idsOf({.name = "service.*"}), "1 2 5 ");
  EXPECT_EQ(idsOf({.name = "*.Start", .limit = 2}), "2 5 ");
  EXPECT_EQ(idsOf({.afterId = 3}), "4 5 ");
  EXPECT_EQ(idsOf({.since = 12.0, .until = 14.0}), "2 3 4 ");
}

TEST_F(StoreReaderSessionsTest, ChoosesEventsLikewise) {
  StoreReader reader;
  ASSERT_EQ(reader.open(directory_.path()), StoreReader::Outcome::kDone);
  std::vector<std::string> names;
  EXPECT_TRUE(reader.readEvents({.application = "Melody"},
                                [&](const StoredEvent& event) { names.push_back(event.name); }));
  EXPECT_THAT(names, ElementsAre("tonewerk.Start", "service.Start", "tonewerk.Summary"));
}

// Its rows do not have the column.
TEST_F(StoreReaderSessionsTest, ReadsTheMessagesOfAnEarlierVersionWithoutTheirSessions) {
  {
    SqliteDatabase database;
    ASSERT_TRUE(database.open(storeFileIn(directory_.path()).path, SqliteDatabase::Mode::kReadWrite,
                              std::chrono::seconds(5)));
    ASSERT_TRUE(
        database.run("DROP VIEW event; DROP VIEW session; DROP TABLE session_row; PRAGMA user_version = 2"));
  }
  EXPECT_EQ(idsOf({.limit = 2}), "4 5 ");
  StoreReader reader;
  ASSERT_EQ(reader.open(directory_.path()), StoreReader::Outcome::kDone);
  EXPECT_FALSE(reader.readMessages({.application = "Melody"}, [](const StoredMessage&) {}));
  EXPECT_THAT(reader.problem(), HasSubstr("an earlier version made it"));
}

}  // namespace
}  // namespace tonewerk
