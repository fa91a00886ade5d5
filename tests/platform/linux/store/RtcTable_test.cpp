// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/RtcTable.h"

#include <filesystem>
#include <gmock/gmock.h>

#include "platform/linux/store/StoreDatabase.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;

using Result = StoreDatabase::Result;

std::shared_ptr<RtcSessionRecord> makeSession(int number) {
  auto session = std::make_shared<RtcSessionRecord>();
  session->startedAt = number;
  session->sessionInfo = {{"number", number}};
  session->userInfo = {{"client", "c"}};
  return session;
}

class RtcTableTest : public testing::Test {
 protected:
  // Writes the rows in one transaction.
  template <typename... Rows>
  Result write(const Rows&... rows) {
    StoreBatch batch;
    (batch.add(rows, StoreRowText(rows)), ...);
    return store_.write(batch);
  }
  static RtcMessageRow messageOf(const std::shared_ptr<RtcSessionRecord>& session, int number) {
    return {0.5, session, 4, 65535, {{"n", number}}};
  }

  // The columns of each row, joined by spaces.
  std::vector<std::string> rows(const std::string& sql, int columns) {
    SqliteDatabase database;
    EXPECT_TRUE(database.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadOnly,
                              std::chrono::seconds(30)));
    SqliteStatement select = database.prepare(sql);
    std::vector<std::string> found;
    while (select.step() == SqliteStatement::Step::kRow) {
      std::string row;
      for (int column = 0; column < columns; ++column) row += (column > 0 ? " " : "") + select.text(column);
      found.push_back(row);
    }
    return found;
  }
  std::vector<std::string> sessions() {
    return rows("SELECT id, started_at, session_info, user_info FROM rtc_session ORDER BY id", 4);
  }
  std::vector<std::string> messages() {
    return rows("SELECT rtc_session, payload FROM rtc_message ORDER BY id", 2);
  }

  TemporaryDirectory directory_;
  MemoryJsonService json_;
  ManualClock clock_;
  StoreDatabase store_{directory_.path(), json_, clock_};
};

TEST_F(RtcTableTest, AMessageNamesItsSession) {
  const auto first = makeSession(1);
  const auto second = makeSession(2);
  EXPECT_EQ(write(RtcSessionRow{first}, RtcSessionRow{second}, messageOf(second, 1), messageOf(first, 2)),
            Result::kDone);
  EXPECT_EQ(write(messageOf(second, 3)), Result::kDone);
  EXPECT_THAT(sessions(),
              ElementsAre(R"(1 1.0 {"number":1} {"client":"c"})", R"(2 2.0 {"number":2} {"client":"c"})"));
  EXPECT_THAT(messages(), ElementsAre(R"(2 {"n":1})", R"(1 {"n":2})", R"(2 {"n":3})"));
  EXPECT_THAT(rows("SELECT sent_at, category, type FROM rtc_message LIMIT 1", 3), ElementsAre("0.5 4 65535"));
}

TEST_F(RtcTableTest, AMessageWritesTheDroppedRowOfItsSession) {
  const auto session = makeSession(1);
  EXPECT_EQ(write(messageOf(session, 1)), Result::kDone);
  EXPECT_EQ(write(messageOf(session, 2)), Result::kDone);
  EXPECT_THAT(sessions(), ElementsAre(R"(1 1.0 {"number":1} {"client":"c"})"));
  EXPECT_THAT(messages(), ElementsAre(R"(1 {"n":1})", R"(1 {"n":2})"));
}

TEST_F(RtcTableTest, ANewFileGetsTheSessionAgain) {
  const auto earlier = makeSession(1);
  const auto session = makeSession(2);
  EXPECT_EQ(write(RtcSessionRow{earlier}, RtcSessionRow{session}, messageOf(session, 1)), Result::kDone);
  std::filesystem::remove(directory_.path("reports.db"));
  std::filesystem::remove(directory_.path("reports.db-wal"));
  std::filesystem::remove(directory_.path("reports.db-shm"));
  EXPECT_EQ(write(messageOf(session, 2)), Result::kDone);
  EXPECT_THAT(sessions(), ElementsAre(R"(1 2.0 {"number":2} {"client":"c"})"));
  EXPECT_THAT(messages(), ElementsAre(R"(1 {"n":2})"));
}

TEST_F(RtcTableTest, AnUndoneTransactionHasNoEffect) {
  const auto kept = makeSession(1);
  const auto undone = makeSession(2);
  ASSERT_EQ(write(RtcSessionRow{kept}), Result::kDone);
  {
    SqliteDatabase otherWriter;
    ASSERT_TRUE(otherWriter.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadWrite,
                                 std::chrono::seconds(30)));
    ASSERT_TRUE(
        otherWriter.run("CREATE TRIGGER refuse BEFORE INSERT ON rtc_row"
                        " BEGIN SELECT RAISE(ABORT, 'no'); END"));
  }
  EXPECT_EQ(write(RtcSessionRow{undone}, messageOf(undone, 1)), Result::kFailed);
  EXPECT_EQ(undone->place.file, 0U);
  {
    SqliteDatabase otherWriter;
    ASSERT_TRUE(otherWriter.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadWrite,
                                 std::chrono::seconds(30)));
    ASSERT_TRUE(otherWriter.run("DROP TRIGGER refuse"));
  }
  EXPECT_EQ(write(RtcSessionRow{undone}, messageOf(undone, 1), messageOf(kept, 2)), Result::kDone);
  EXPECT_THAT(rows("SELECT started_at FROM rtc_session ORDER BY id", 1), ElementsAre("1.0", "2.0"));
  EXPECT_THAT(messages(), ElementsAre(R"(2 {"n":1})", R"(1 {"n":2})"));
}

}  // namespace
}  // namespace tonewerk
