// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/SqliteRows.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "platform/linux/store/SqliteDatabase.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

// Rows of a number, a fraction, a text and bytes; a fifth column is never set.
class Texts final : public SqliteRows {
 public:
  std::size_t rowCount() const override { return texts.size(); }
  void read(std::size_t row, int column, SqliteCell& cell) const override {
    switch (column) {
      case 0:
        return cell.set(static_cast<std::int64_t>(row));
      case 1:
        return cell.set(static_cast<double>(row) / 2);
      case 2:
        return cell.set(std::string_view(texts[row]));
      case 3:
        return cell.setBytes(texts[row]);
      default:
        return;
    }
  }
  std::vector<std::string> texts;
};

class SqliteRowsTest : public testing::Test {
 protected:
  SqliteRowsTest() {
    EXPECT_TRUE(
        database_.open(directory_.path("a.db"), SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(30)));
    database_.addRows("source", 5, rows_);
  }
  std::vector<std::string> texts(const std::string& sql) {
    SqliteStatement select = database_.prepare(sql);
    std::vector<std::string> found;
    while (select.step() == SqliteStatement::Step::kRow) found.push_back(select.text(0));
    return found;
  }

  TemporaryDirectory directory_;
  Texts rows_;
  SqliteDatabase database_;
};

TEST_F(SqliteRowsTest, AreReadInTheirOrder) {
  rows_.texts = {"z", "", "a"};
  EXPECT_THAT(texts("SELECT c2 FROM source"), ElementsAre("z", "", "a"));
  EXPECT_THAT(texts("SELECT c0 || '|' || c1 FROM source"), ElementsAre("0|0.0", "1|0.5", "2|1.0"));
}

TEST_F(SqliteRowsTest, HaveTheTypesOfTheirCells) {
  rows_.texts = {""};
  EXPECT_THAT(
      texts("SELECT typeof(c0) || ' ' || typeof(c1) || ' ' || typeof(c2) || ' ' || typeof(c3) || ' ' ||"
            " typeof(c4) FROM source"),
      ElementsAre("integer real text blob null"));
}

TEST_F(SqliteRowsTest, AStatementIsPreparedOnceForAllRowsThatFollow) {
  ASSERT_TRUE(database_.run("CREATE TABLE target (id INTEGER PRIMARY KEY, text TEXT NOT NULL)"));
  SqliteStatement insert = database_.prepare("INSERT INTO target (text) SELECT c2 FROM source");
  EXPECT_TRUE(insert.run());
  EXPECT_THAT(texts("SELECT text FROM target"), IsEmpty());
  rows_.texts = {"b", "a"};
  EXPECT_TRUE(insert.run());
  rows_.texts = {std::string("nul\0inside", 10), std::string(100'000, 'x')};
  EXPECT_TRUE(insert.run());
  EXPECT_THAT(texts("SELECT text FROM target ORDER BY id"),
              ElementsAre("b", "a", std::string("nul\0inside", 10), std::string(100'000, 'x')));
}

TEST_F(SqliteRowsTest, TwoCursorsReadIndependently) {
  rows_.texts = {"a", "b"};
  EXPECT_THAT(texts("SELECT x.c2 || y.c2 FROM source AS x CROSS JOIN source AS y"),
              ElementsAre("aa", "ab", "ba", "bb"));
}

TEST_F(SqliteRowsTest, ARowThatTheTableRefusesFailsTheStatement) {
  ASSERT_TRUE(database_.run("CREATE TABLE target (text TEXT NOT NULL CHECK (text <> 'b'))"));
  SqliteStatement insert = database_.prepare("INSERT INTO target SELECT c2 FROM source");
  rows_.texts = {"a", "b", "c"};
  EXPECT_FALSE(insert.run());
  EXPECT_THAT(database_.problem(), testing::HasSubstr("CHECK"));
}

TEST_F(SqliteRowsTest, CannotBeCreatedByName) {
  EXPECT_FALSE(database_.run("CREATE VIRTUAL TABLE other USING source"));
  EXPECT_FALSE(database_.run("DELETE FROM source"));
}

}  // namespace
}  // namespace tonewerk
