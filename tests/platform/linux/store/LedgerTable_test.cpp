// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/LedgerTable.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "platform/linux/store/RowsOf.h"
#include "platform/linux/store/StoreDatabase.h"
#include "platform/linux/store/StoreSalvage.h"
#include "platform/linux/store/StoreSchema.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using Result = StoreDatabase::Result;
using Sent = SendingFacts::Outcome;

SendingRow sendingAt(double time) {
  return {{.sentAt = time, .signal = "logs", .records = 2, .bytes = 300, .status = 200, .rejected = 0},
          "http://fleet/v1/logs",
          ""};
}

class LedgerTableTest : public testing::Test {
 protected:
  template <typename... Rows>
  void write(const Rows&... rows) {
    StoreBatch batch;
    (batch.add(rows, StoreRowText(rows)), ...);
    ASSERT_EQ(store_.write(batch), Result::kDone) << store_.problem();
  }
  void trimAge() {
    bool moreToDo = true;
    while (std::exchange(moreToDo, false)) ASSERT_EQ(store_.trimAge(moreToDo), Result::kDone);
  }
  std::vector<std::string> rows(const std::string& sql, int columns = 1, const std::string& file = {}) {
    SqliteDatabase database;
    EXPECT_TRUE(database.open(file.empty() ? path() : file, SqliteDatabase::Mode::kReadOnly, kLongEnough));
    return rowsOf(database, sql, columns);
  }
  void change(const std::string& sql) {
    SqliteDatabase database;
    ASSERT_TRUE(database.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
    ASSERT_TRUE(database.run(sql)) << database.problem();
  }
  std::string path() const { return directory_.path("reports.db"); }

  static constexpr std::chrono::seconds kLongEnough{30};
  // The columns of every table and view.
  static constexpr const char* kColumns =
      "SELECT m.type, m.name, c.name, c.type, c.\"notnull\", c.dflt_value FROM sqlite_master AS m"
      " JOIN pragma_table_info(m.name) AS c ORDER BY m.name, c.cid";
  // The table and what belongs to it, as a file has them not that an earlier daemon made.
  static constexpr const char* kRemove =
      "DROP VIEW ledger; DROP TABLE sending_row; ALTER TABLE age_mark DROP COLUMN sending_row";

  TemporaryDirectory directory_;
  MemoryJsonService json_;
  ManualClock clock_;
  StoreDatabase store_{directory_.path(), json_, clock_};
};

TEST_F(LedgerTableTest, ASendingIsARowOfTheLedger) {
  SendingRow refused = sendingAt(2.5);
  refused.facts.status = 400;
  refused.facts.outcome = Sent::kDropped;
  refused.facts.rejected.reset();
  SendingRow unanswered = sendingAt(3.5);
  unanswered.facts.status.reset();
  unanswered.facts.outcome = Sent::kKept;
  unanswered.facts.rejected.reset();
  unanswered.problem = "no route";
  SendingRow large = sendingAt(4.5);
  large.facts.status = 413;
  large.facts.outcome = Sent::kSplit;
  large.facts.rejected.reset();
  write(sendingAt(1.5), refused, unanswered, large);
  EXPECT_THAT(
      rows("SELECT id, at, endpoint, signal, records, bytes, status, outcome, rejected, problem FROM ledger",
           10),
      ElementsAre("1 1.5 http://fleet/v1/logs logs 2 300 200 delivered 0 ",
                  "2 2.5 http://fleet/v1/logs logs 2 300 400 dropped  ",
                  "3 3.5 http://fleet/v1/logs logs 2 300  kept  no route",
                  "4 4.5 http://fleet/v1/logs logs 2 300 413 split  "));
  EXPECT_THAT(rows("SELECT count(first_event), count(last_event), count(rejected), count(problem),"
                   " count(status) FROM ledger",
                   5),
              ElementsAre("0 0 1 1 3"));
}

TEST_F(LedgerTableTest, LongTextsAreCut) {
  SendingRow row = sendingAt(1.5);
  row.endpoint = "http://fleet/" + std::string(1000, 'x');
  row.problem = std::string(999, 'y') + "\u00e9";
  write(row);
  EXPECT_THAT(rows("SELECT length(endpoint), length(problem) FROM ledger", 2), ElementsAre("256 256"));
}

TEST_F(LedgerTableTest, ASendingBetweenAnEventAndItsMessageLeavesThemOneRow) {
  const ValueMap payload{{"n", 1}};
  const AnalyticsRow event{5.0, "com.orvane.x", payload};
  StoreBatch batch;
  batch.add(event, StoreRowText(event));
  const SendingRow sending = sendingAt(5.0);
  batch.add(sending, StoreRowText(sending));
  EXPECT_TRUE(batch.share({5.0, std::make_shared<RtcSessionRecord>(), 4, 1, payload}));
  ASSERT_EQ(store_.write(batch), Result::kDone);
  EXPECT_THAT(rows("SELECT payload FROM rtc_message"), ElementsAre(R"({"n":1})"));
  EXPECT_THAT(rows("SELECT endpoint FROM ledger"), ElementsAre("http://fleet/v1/logs"));
}

TEST_F(LedgerTableTest, OldSendingsAreDeletedButTheNewest) {
  store_.setBounds({1 << 20, 3 * 3600.0});
  write(sendingAt(1.5), sendingAt(2.5));
  for (int hour = 0; hour < 5; ++hour) {
    clock_.advance(3600.0);
    write(PowerRow{1.0, 28, "power", {}});
  }
  trimAge();
  EXPECT_THAT(rows("SELECT id FROM ledger"), ElementsAre("2"));
}

TEST_F(LedgerTableTest, OfMoreSendingsThanItHasRoomForTheNewestAreKept) {
  const std::int64_t newest = kStoreSendings + 3;
  write(sendingAt(1.5), sendingAt(2.5), sendingAt(3.5), sendingAt(4.5));
  change("UPDATE sending_row SET id = " + std::to_string(newest) + " WHERE id = 4");
  trimAge();
  EXPECT_THAT(rows("SELECT id FROM ledger"), ElementsAre(std::to_string(newest)));
  write(sendingAt(5.5));
  trimAge();
  EXPECT_THAT(rows("SELECT id FROM ledger"), SizeIs(2));
}

TEST_F(LedgerTableTest, AFileOfADaemonWithoutALedgerGetsOneAndKeepsItsRows) {
  write(PowerRow{1.0, 28, "power", {}});
  const std::vector<std::string> columns = rows(kColumns, 6);
  change(kRemove);
  ASSERT_NE(rows(kColumns, 6), columns);
  StoreDatabase next(directory_.path(), json_, clock_);
  ASSERT_EQ(next.write({}), Result::kDone) << next.problem();
  EXPECT_EQ(rows(kColumns, 6), columns);
  EXPECT_THAT(rows("SELECT id, name FROM haptics", 2), ElementsAre("1 power"));
  EXPECT_THAT(rows("SELECT id FROM ledger"), IsEmpty());
  EXPECT_THAT(rows("PRAGMA user_version"), ElementsAre(std::to_string(kStoreSchemaVersion)));
}

TEST_F(LedgerTableTest, AFailureOnTheWayToALedgerLeavesTheFileAsItWas) {
  write(PowerRow{1.0, 28, "power", {}});
  change(std::string(kRemove) + "; ALTER TABLE age_mark RENAME TO away");
  StoreDatabase next(directory_.path(), json_, clock_);
  EXPECT_EQ(next.write({}), Result::kFailed);
  EXPECT_THAT(rows("SELECT name FROM sqlite_master WHERE name = 'sending_row'"), IsEmpty());
  change("ALTER TABLE away RENAME TO age_mark");
  EXPECT_EQ(next.write({}), Result::kDone) << next.problem();
  EXPECT_THAT(rows("SELECT id FROM ledger"), IsEmpty());
}

TEST_F(LedgerTableTest, IsSavedOfADamagedFile) {
  SendingRow unanswered = sendingAt(3.5);
  unanswered.facts.status.reset();
  unanswered.problem = "no route";
  write(sendingAt(1.5), unanswered, sendingAt(4.5));
  change("UPDATE sending_row SET records = 'many' WHERE id = 3");
  const std::string copy = directory_.path("copy.db");
  EXPECT_EQ(StoreSalvage(path(), copy).rows(), 2);
  EXPECT_EQ(rows("SELECT * FROM sending_row", 13, copy), rows("SELECT * FROM sending_row WHERE id < 3", 13));
  EXPECT_THAT(rows("SELECT id, problem FROM ledger", 2, copy), ElementsAre("1 ", "2 no route"));
}

TEST_F(LedgerTableTest, AFileWithoutALedgerIsSaved) {
  write(PowerRow{1.0, 28, "power", {}});
  change(kRemove);
  const std::string copy = directory_.path("copy.db");
  EXPECT_EQ(StoreSalvage(path(), copy).problem(), "");
  EXPECT_THAT(rows("SELECT id FROM haptics", 1, copy), ElementsAre("1"));
  EXPECT_THAT(rows("SELECT id FROM ledger", 1, copy), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
