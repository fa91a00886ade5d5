// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/SqlReader.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <limits>
#include <string>
#include <unistd.h>
#include <vector>

#include "support/OtherUser.h"
#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

class SqlReaderTest : public testing::Test {
 protected:
  SqlReaderTest() {
    fixture.run(
        "CREATE TABLE event (id INTEGER, payload TEXT); INSERT INTO event VALUES (1, '{}'), (2, NULL);");
    EXPECT_EQ(reader.open(fixture.file()), "");
  }

  // The problem of running all rows of a statement.
  std::optional<SqlProblem> problemOf(const std::string& sql) {
    std::optional<SqlProblem> problem;
    std::size_t from = 0;
    const auto query = reader.prepare(sql, from, problem);
    while (query != nullptr && query->next(problem)) {
    }
    return problem;
  }
  static std::string bytesOf(const std::string& file) {
    std::ifstream text(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(text), {}};
  }
  std::vector<std::string> files() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(fixture.state()))
      names.push_back(entry.path().filename());
    return names;
  }

  StoreFixture fixture;
  SqlReader reader;
};

TEST_F(SqlReaderTest, ReadsValuesOfEachKind) {
  EXPECT_THAT(reader.rows("SELECT NULL, 9223372036854775807, 1.5, 'a' || char(0) || 'b', x'00ff'"),
              ElementsAre(ElementsAre(SqlValue(), SqlValue(std::numeric_limits<std::int64_t>::max()),
                                      SqlValue(1.5), SqlValue(std::string("a\0b", 3)),
                                      SqlValue(SqlBytes{std::string("\0\xff", 2)}))));
}

TEST_F(SqlReaderTest, TextThatIsNoUtf8BecomesUtf8) {
  EXPECT_THAT(reader.rows("SELECT CAST(x'61ff' AS TEXT)"),
              ElementsAre(ElementsAre(SqlValue("a\xEF\xBF\xBD"))));
}

TEST_F(SqlReaderTest, NamesEachColumnOnce) {
  std::optional<SqlProblem> problem;
  std::size_t from = 0;
  const auto query = reader.prepare("SELECT 1 AS id, 2 AS id, 3 AS id, 4 AS id_2", from, problem);
  EXPECT_THAT(query->columns(), ElementsAre("id", "id_2", "id_3", "id_2_2"));
}

TEST_F(SqlReaderTest, FindsTheStatementsOneAfterTheOther) {
  const std::string text = "; -- first\nSELECT 1; /* then */ SELECT 2;\n-- end";
  std::optional<SqlProblem> problem;
  std::size_t from = 0;
  std::vector<SqlValue> found;
  for (auto query = reader.prepare(text, from, problem); query != nullptr;
       query = reader.prepare(text, from, problem)) {
    EXPECT_TRUE(query->next(problem));
    found.push_back(query->value(0));
  }
  EXPECT_THAT(found, ElementsAre(SqlValue(std::int64_t{1}), SqlValue(std::int64_t{2})));
  EXPECT_FALSE(problem);
}

TEST_F(SqlReaderTest, ManyEmptyStatementsNeedNoStack) { EXPECT_FALSE(problemOf(std::string(500'000, ';'))); }

TEST_F(SqlReaderTest, RefusesWhatIsNotReading) {
  const std::string before = bytesOf(fixture.file());
  const std::string other = fixture.state() + "/other.db";
  const std::vector<std::string> statements{"INSERT INTO event VALUES (3, '')",
                                            "INSERT INTO event VALUES (3, '') RETURNING id",
                                            "WITH a AS (SELECT 1) DELETE FROM event",
                                            "UPDATE event SET id = 5",
                                            "DROP TABLE event",
                                            "ALTER TABLE event ADD COLUMN more",
                                            "CREATE TABLE more (a)",
                                            "CREATE TEMP TABLE more (a)",
                                            "CREATE TEMP VIEW more AS SELECT 1",
                                            "CREATE VIRTUAL TABLE more USING fts5(a)",
                                            "CREATE INDEX more ON event (id)",
                                            "ATTACH '" + other + "' AS other",
                                            "DETACH main",
                                            "VACUUM",
                                            "VACUUM INTO '" + other + "'",
                                            "REINDEX",
                                            "ANALYZE",
                                            "BEGIN",
                                            "SAVEPOINT a",
                                            "PRAGMA user_version = 9",
                                            "PRAGMA query_only = 0",
                                            "PRAGMA journal_mode = delete",
                                            "PRAGMA wal_checkpoint",
                                            "PRAGMA writable_schema = 1",
                                            "PRAGMA temp_store_directory = '/'",
                                            "EXPLAIN DELETE FROM event",
                                            "SELECT load_extension('libm.so.6')",
                                            "SELECT LOAD_EXTENSION('libm.so.6', 'f')"};
  for (const std::string& statement : statements) {
    const std::optional<SqlProblem> problem = problemOf(statement);
    ASSERT_TRUE(problem) << statement;
    EXPECT_EQ(problem->kind, SqlProblem::Kind::kQuery) << statement;
    EXPECT_THAT(problem->text, HasSubstr("only reading is possible")) << statement;
  }
  // SQLite itself refuses this one.
  ASSERT_TRUE(problemOf("UPDATE sqlite_master SET sql = ''"));
  EXPECT_EQ(bytesOf(fixture.file()), before);
  EXPECT_THAT(files(), SizeIs(1));
}

TEST_F(SqlReaderTest, AllowsWhatTells) {
  for (const char* statement :
       {"SELECT * FROM event",
        "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n LIMIT 9) SELECT * FROM n",
        "SELECT value FROM event, json_each(payload)", "SELECT name FROM pragma_table_xinfo('event')",
        "PRAGMA table_info(event)", "PRAGMA USER_VERSION", "EXPLAIN SELECT * FROM event",
        "EXPLAIN QUERY PLAN SELECT * FROM event",
        "SELECT datetime(0, 'unixepoch'), sum(1) OVER () FROM event", "VALUES (1)"}) {
    const std::optional<SqlProblem> problem = problemOf(statement);
    EXPECT_FALSE(problem) << statement << ": " << problem->text;
  }
}

TEST_F(SqlReaderTest, ViewsMayUseTheFunctionsOfJson) {
  fixture.run(
      "CREATE VIEW part AS SELECT payload ->> 'a' AS a, json(payload) AS b FROM event WHERE payload IS NOT "
      "NULL");
  EXPECT_THAT(reader.rows("SELECT * FROM part"), ElementsAre(ElementsAre(SqlValue(), SqlValue("{}"))));
}

TEST_F(SqlReaderTest, TellsWhereAQueryIsWrong) {
  const std::optional<SqlProblem> syntax = problemOf("  SELECT *\nFORM event");
  ASSERT_TRUE(syntax);
  EXPECT_EQ(syntax->text, "near \"FORM\": syntax error");
  EXPECT_EQ(syntax->place, 11U);
  // SQLite names no place for this, so it is the beginning of the statement.
  const std::optional<SqlProblem> table = problemOf("  SELECT * FROM missing");
  ASSERT_TRUE(table);
  EXPECT_EQ(table->text, "no such table: missing");
  EXPECT_EQ(table->place, 2U);
  const std::optional<SqlProblem> later = problemOf(" SELECT json('{')");
  ASSERT_TRUE(later);
  EXPECT_EQ(later->kind, SqlProblem::Kind::kQuery);
  EXPECT_EQ(later->text, "malformed JSON");
  EXPECT_EQ(later->place, 1U);
  const std::optional<SqlProblem> zero = problemOf(std::string("; \0 SELECT 1", 12));
  ASSERT_TRUE(zero);
  EXPECT_EQ(zero->place, 2U);
}

TEST_F(SqlReaderTest, EndsAQueryThatIsInterrupted) {
  int questions = 0;
  reader.interruptWhen([&] { return ++questions == 3; });
  const std::optional<SqlProblem> problem =
      problemOf("WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n) SELECT sum(i) FROM n");
  ASSERT_TRUE(problem);
  EXPECT_EQ(problem->kind, SqlProblem::Kind::kInterrupted);
  EXPECT_EQ(questions, 3);
  reader.interruptWhen(nullptr);
  EXPECT_THAT(reader.rows("SELECT 1"), SizeIs(1));
}

TEST_F(SqlReaderTest, RowsAreNoneOnAFailure) {
  EXPECT_THAT(reader.rows("SELECT nothing"), IsEmpty());
  EXPECT_THAT(reader.rows("SELECT json(payload) FROM (SELECT '{}' AS payload UNION ALL SELECT '{')"),
              IsEmpty());
  EXPECT_THAT(reader.rows("SELECT ?1 || ?2", {"a", "b"}), ElementsAre(ElementsAre(SqlValue("ab"))));
}

TEST_F(SqlReaderTest, CompactsJsonAndKeepsItsNumbersAndOrder) {
  EXPECT_EQ(reader.compactJson("{ \"b\" : 1.50,\n \"a\": [ 1e3 ] }"), "{\"b\":1.50,\"a\":[1e3]}");
  EXPECT_EQ(reader.compactJson("{"), std::nullopt);
  EXPECT_EQ(reader.compactJson("{}"), "{}");
}

TEST_F(SqlReaderTest, ReadsAFileInADirectoryThatItCannotWriteTo) {
  const TemporaryDirectory directory;
  const std::string odd = directory.path("a?b#c%d.db");
  StoreFixture walFixture;
  walFixture.run("PRAGMA journal_mode = wal; CREATE TABLE event (id INTEGER); INSERT INTO event VALUES (7)");
  std::filesystem::copy_file(walFixture.file(), odd);
  std::filesystem::permissions(directory.path(""), std::filesystem::perms{0555});
  const auto read = [&] {
    SqlReader other;
    EXPECT_EQ(other.open(odd), "");
    EXPECT_THAT(other.rows("SELECT id FROM event"), ElementsAre(ElementsAre(SqlValue(std::int64_t{7}))));
  };
  if (geteuid() == 0) {
    runAsOtherUser(read);
  } else {
    read();
  }
  std::filesystem::permissions(directory.path(""), std::filesystem::perms{0700});
}

TEST_F(SqlReaderTest, SaysThatAFileIsNoDatabase) {
  const std::string file = fixture.state() + "/text";
  std::ofstream(file) << std::string(5000, 'x');
  SqlReader other;
  EXPECT_EQ(other.open(file), file + ": file is not a database");
}

TEST(IsWholeStatementTest, EndsWithASemicolonOutsideOfTexts) {
  EXPECT_TRUE(isWholeStatement("SELECT 1;"));
  EXPECT_TRUE(isWholeStatement("SELECT 1; -- end\n"));
  EXPECT_FALSE(isWholeStatement("SELECT 1"));
  EXPECT_FALSE(isWholeStatement("SELECT ';"));
}

}  // namespace
}  // namespace tonewerk
