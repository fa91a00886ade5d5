// SPDX-License-Identifier: Apache-2.0
#include <csignal>
#include <filesystem>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "tools/twctl/CommandLineTest.h"
#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;

// Runs twctl with a store that has two sessions.
class SqlCommandTest : public CommandLineTest {
 protected:
  SqlCommandTest() {
    setenv("STATE_DIRECTORY", fixture.state().c_str(), 1);
    fixture.run(
        "CREATE TABLE session (id INTEGER, application TEXT, ended_at REAL);"
        "INSERT INTO session VALUES (1, 'player', 5.5), (2, 'x, \"y\"', NULL);");
  }
  int pipe(const std::string& query, std::vector<const char*> arguments = {}) {
    arguments.insert(arguments.begin(), {"twctl", "sql"});
    out_.str({});
    err_.str({});
    std::istringstream in(query);
    Tool tool{out_, err_, json_};
    tool.in = &in;
    return runCommandLine(static_cast<int>(arguments.size()), arguments.data(), tool);
  }

  StoreFixture fixture;
};

TEST_F(SqlCommandTest, PrintsTheRowsOfAQuery) {
  EXPECT_EQ(run({"sql", "SELECT * FROM session"}), kDone);
  EXPECT_EQ(output(), "id  application  ended_at\n1   player       5.5\n2   x, \"y\"       \n");
  EXPECT_EQ(errors(), "");
}

TEST_F(SqlCommandTest, PrintsJsonAndCsvForPrograms) {
  EXPECT_EQ(run({"sql", "--json", "SELECT * FROM session WHERE id = 2"}), kDone);
  EXPECT_EQ(output(), "{\"id\":2,\"application\":\"x, \\\"y\\\"\",\"ended_at\":null}\n");
  EXPECT_EQ(run({"sql", "--csv", "SELECT * FROM session WHERE id = 2"}), kDone);
  EXPECT_EQ(output(), "id,application,ended_at\r\n2,\"x, \"\"y\"\"\",\r\n");
  EXPECT_EQ(run({"sql", "--csv", "--json", "SELECT 1"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: --csv excludes --json\n");
}

TEST_F(SqlCommandTest, ReadsTheQueryFromStandardInput) {
  EXPECT_EQ(pipe("SELECT count(*) AS sessions\nFROM session;\n"), kDone);
  EXPECT_EQ(output(), "sessions\n2\n");
  EXPECT_EQ(pipe(std::string(1'000'001, ' ')), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: the query has more than 1000000 bytes\n");
  EXPECT_EQ(pipe(" -- nothing"), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: the query is empty\n");
}

TEST_F(SqlCommandTest, SaysWhereAQueryIsWrong) {
  EXPECT_EQ(run({"sql", "SELECT *\nFORM session"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: line 2, column 1: near \"FORM\": syntax error\n  FORM session\n  ^\n");
  EXPECT_EQ(run({"sql", "DELETE FROM session"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("only reading is possible"));
  EXPECT_EQ(run({"sql", "SELECT count(*) FROM session"}), kDone);
  EXPECT_THAT(output(), HasSubstr("\n2\n"));
}

TEST_F(SqlCommandTest, ControlCEndsALongQuery) {
  // The signal comes with the first row, when the command listens to it.
  struct RaisesOnFirstRow final : std::stringbuf {
    std::streamsize xsputn(const char* text, std::streamsize count) override {
      if (!std::exchange(isRaised, true)) std::raise(SIGINT);
      return std::stringbuf::xsputn(text, count);
    }
    bool isRaised = false;
  } buffer;
  std::ostream out(&buffer);
  Tool tool{out, err_, json_};
  const std::vector<const char*> arguments{
      "twctl", "sql", "--json",
      "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n) SELECT i FROM n WHERE i = 1 OR i < 0"};
  EXPECT_EQ(runCommandLine(static_cast<int>(arguments.size()), arguments.data(), tool), kRefused);
  EXPECT_EQ(errors(), "twctl: interrupted\n");
  EXPECT_EQ(buffer.str(), "{\"i\":1}\n");
}

TEST_F(SqlCommandTest, NeedsAStoreThatItKnows) {
  fixture.run("PRAGMA user_version = 0");
  EXPECT_EQ(run({"sql", "SELECT 1"}), kRefused);
  EXPECT_EQ(errors(), "twctl: " + fixture.file() + ": nothing has been stored yet\n");
  std::filesystem::remove(fixture.file());
  EXPECT_EQ(run({"sql", "SELECT 1"}), kRefused);
  EXPECT_EQ(errors(), "twctl: " + fixture.file() + ": there is no such file\n");
}

}  // namespace
}  // namespace tonewerk
