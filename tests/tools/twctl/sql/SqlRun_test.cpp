// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/SqlRun.h"

#include <gtest/gtest.h>
#include <sstream>

#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

class SqlRunTest : public testing::Test {
 protected:
  SqlRunTest() {
    fixture.run(
        "CREATE TABLE session (id INTEGER, application TEXT); INSERT INTO session VALUES (1, 'player');"
        "CREATE VIEW session_name AS SELECT application FROM session;");
    EXPECT_EQ(reader.open(fixture.file()), "");
  }
  SqlOutcome run(const std::string& sql, RowFormat::Kind kind = RowFormat::Kind::kTable) {
    out.str({});
    return runSql(reader, sql, {kind, {}, false}, out);
  }
  std::string problemOf(const std::string& sql) {
    const SqlOutcome outcome = run(sql);
    return outcome.problem ? describe(*outcome.problem, sql) : "";
  }

  StoreFixture fixture;
  SqlReader reader;
  std::ostringstream out;
};

TEST_F(SqlRunTest, SeparatesTheTablesOfSeveralStatements) {
  const SqlOutcome outcome = run("SELECT id FROM session; SELECT application FROM session;");
  EXPECT_EQ(outcome.statements, 2U);
  EXPECT_EQ(outcome.rows, 2U);
  EXPECT_EQ(out.str(), "id\n1\n\napplication\nplayer\n");
  (void)run("SELECT id FROM session; SELECT application FROM session;", RowFormat::Kind::kJson);
  EXPECT_EQ(out.str(), "{\"id\":1}\n{\"application\":\"player\"}\n");
}

TEST_F(SqlRunTest, StopsAtTheFirstProblem) {
  EXPECT_EQ(problemOf("SELECT 1;\nSELECT 2 FROM;\nSELECT 3"),
            "line 2, column 14: near \";\": syntax error\n  SELECT 2 FROM;\n               ^");
  EXPECT_EQ(out.str(), "1\n1\n");
}

TEST_F(SqlRunTest, StopsWhenTheOutputFails) {
  out.setstate(std::ios::badbit);
  EXPECT_EQ(runSql(reader, "SELECT 1; SELECT 2", {}, out).statements, 0U);
}

TEST_F(SqlRunTest, SuggestsTheTableOrColumnThatWasMeant) {
  EXPECT_EQ(problemOf("SELECT * FROM sesion"),
            "line 1, column 1: no such table: sesion; did you mean 'session'?\n  SELECT * FROM sesion\n  ^");
  EXPECT_EQ(problemOf("SELECT s.aplication FROM session AS s"),
            "line 1, column 8: no such column: s.aplication; did you mean 'application'?\n"
            "  SELECT s.aplication FROM session AS s\n         ^");
  EXPECT_EQ(problemOf("SELECT volume FROM session"),
            "line 1, column 8: no such column: volume\n  SELECT volume FROM session\n         ^");
}

TEST_F(SqlRunTest, MarksThePlaceInALongLineOfManyCharacters) {
  const std::string dots(100, '.');
  std::string umlauts;
  for (int at = 0; at < 30; ++at) umlauts += "\xC3\xA4";
  // What is shown would begin inside of a character.
  EXPECT_EQ(problemOf("SELECT '" + umlauts + "' FORM '" + dots + "'"),
            "line 1, column 46: near \"'" + dots + "'\": syntax error\n  " + umlauts.substr(0, 32) +
                "' FORM '" + dots.substr(0, 29) + "\n  " + std::string(16 + 7, ' ') + "^");
}

TEST_F(SqlRunTest, RepeatsNothingThatControlsATerminal) {
  EXPECT_EQ(problemOf("SELECT \x1b"),
            "line 1, column 8: unrecognized token: \"\\u001b\"\n  SELECT \\u001b\n         ^");
}

}  // namespace
}  // namespace tonewerk
