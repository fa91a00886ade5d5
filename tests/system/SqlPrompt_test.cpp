// SPDX-License-Identifier: Apache-2.0
//
// Tests the prompt of twctl sql on a terminal, as a program.
#include <csignal>
#include <filesystem>
#include <gmock/gmock.h>
#include <string>

#include "support/TemporaryDirectory.h"
#include "system/support/ChildProcess.h"
#include "system/support/PseudoTerminal.h"
#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

using ::testing::HasSubstr;

constexpr char kControlC[] = "\x03";
constexpr char kControlD[] = "\x04";
constexpr char kUp[] = "\x1b[A";

class SqlOnATerminalTest : public testing::Test {
 protected:
  SqlOnATerminalTest() {
    fixture.run(
        "CREATE TABLE session (id INTEGER, application TEXT, started_at REAL);"
        "INSERT INTO session VALUES (1, 'com.example.player', 1763633880), (2, 'com.example.phone', "
        "1763633890)");
    std::filesystem::create_directories(directory.path("home/tonewerk"));
    before = terminal.modes();
  }

  void start(const std::vector<std::string>& arguments = {"sql"}) {
    ChildCommand command{TONEWERK_TWCTL_PATH,
                         arguments,
                         {{"STATE_DIRECTORY", fixture.state()},
                          {"XDG_STATE_HOME", directory.path("home")},
                          {"HOME", directory.path("home")},
                          {"TERM", "xterm"},
                          {"TZ", "UTC0"},
                          {"LC_ALL", "C.UTF-8"}}};
    command.input = terminal.path();
    ASSERT_TRUE(tool.start(command, terminal.path(), directory.path("errors")));
    ASSERT_TRUE(terminal.waitFor("sql> ")) << errors();
  }
  // Presses the keys of a line and the return key, and waits for what is then printed and the next prompt.
  void enter(const std::string& keys, const std::string& answer) {
    terminal.press(keys + "\r");
    ASSERT_TRUE(terminal.waitFor(answer)) << terminal.written() << errors();
    ASSERT_TRUE(terminal.waitFor("sql> ")) << terminal.written();
  }
  void quit() {
    terminal.press(kControlD);
    EXPECT_EQ(tool.wait(), 0) << errors();
    EXPECT_EQ(terminal.modes().c_lflag, before.c_lflag);
  }
  std::string errors() const { return textOfFile(directory.path("errors")); }
  std::string history() const { return directory.path("home/tonewerk/sql-history"); }

  StoreFixture fixture;
  TemporaryDirectory directory;
  PseudoTerminal terminal;
  termios before{};
  ChildProcess tool;
};

TEST_F(SqlOnATerminalTest, SaysWhatItReadsAndRunsQueries) {
  start();
  EXPECT_THAT(terminal.written(),
              HasSubstr(fixture.file() + ", from 2025-11-20 10:18:00Z to 2025-11-20 10:18:10Z"));
  enter("SELECT count(*) AS sessions FROM session;", "sessions\r\n2\r\n");
  enter(".tables", "session  id, application, started_at");
  quit();
  EXPECT_EQ(errors(), "");
}

TEST_F(SqlOnATerminalTest, CompletesNames) {
  start();
  enter("SELECT 'x' || app\t FROM sess\t;", "xcom.example.player\r\n");
  enter(".tab\t", "session  id, application, started_at");
  terminal.press("SELECT id FROM session ORDER BY s\t");
  ASSERT_TRUE(terminal.waitFor("SELECT  SUM  session  started_at"));
  terminal.press(kControlC);
  ASSERT_TRUE(terminal.waitFor("sql> "));
  quit();
}

TEST_F(SqlOnATerminalTest, CutsATableToTheTerminal) {
  terminal.resize(24, 24);
  start();
  enter("SELECT id, application FROM session;", "1   com.example.player\r\n");
  terminal.resize(20, 24);
  enter("SELECT id, application FROM session;", "1   com.example.pla\xE2\x80\xA6\r\n");
  quit();
}

TEST_F(SqlOnATerminalTest, ControlCDropsALineAndEndsAQuery) {
  start();
  terminal.press(std::string("SELECT 'dropped'") + kControlC);
  ASSERT_TRUE(terminal.waitFor("^C"));
  ASSERT_TRUE(terminal.waitFor("sql> "));
  // The first row shows that the query runs.
  terminal.press(
      "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n) SELECT hex(zeroblob(600000)) "
      "FROM n WHERE i < 3 OR i < 0;\r");
  ASSERT_TRUE(terminal.waitFor("0000000000"));
  tool.signal(SIGINT);
  ASSERT_TRUE(terminal.waitFor("sql> "));
  EXPECT_THAT(errors(), HasSubstr("twctl: interrupted\n"));
  enter("SELECT 7 * 6;", "42\r\n");
  quit();
}

TEST_F(SqlOnATerminalTest, AQueryThatIsWrongDoesNotEndIt) {
  start();
  enter("DELETE FROM session;", "\r\n");
  enter("SELECT count(*) FROM session;", "2\r\n");
  EXPECT_THAT(errors(), HasSubstr("only reading is possible"));
  quit();
}

TEST_F(SqlOnATerminalTest, KeepsTheLinesForTheNextTime) {
  start();
  enter("SELECT 6 * 7;", "42\r\n");
  quit();
  EXPECT_EQ(std::filesystem::status(history()).permissions(), std::filesystem::perms{0600});
  start();
  enter(kUp, "42\r\n");
  quit();
}

TEST_F(SqlOnATerminalTest, KeepsNothingWithoutADirectory) {
  std::filesystem::remove_all(directory.path("home"));
  start();
  enter("SELECT 6 * 7;", "42\r\n");
  quit();
  EXPECT_FALSE(std::filesystem::exists(directory.path("home")));
  EXPECT_FALSE(std::filesystem::exists(fixture.state() + "/sql-history"));
}

TEST_F(SqlOnATerminalTest, ASignalThatEndsItRestoresTheTerminal) {
  start();
  tool.signal(SIGTERM);
  EXPECT_EQ(tool.wait(), 128 + SIGTERM);
  EXPECT_EQ(terminal.modes().c_lflag, before.c_lflag);
}

}  // namespace
}  // namespace tonewerk
