// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/SqlPrompt.h"

#include <deque>
#include <gmock/gmock.h>
#include <sstream>
#include <string>
#include <vector>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ScopedTimeZone.h"
#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

using Kind = LineReader::Line::Kind;

// Types lines, and then ends.
class TypedLines final : public LineReader {
 public:
  Line read(const std::string& prompt) override {
    prompts.push_back(prompt);
    if (lines.empty()) return {};
    Line line = lines.front();
    lines.pop_front();
    return line;
  }

  std::deque<Line> lines;
  std::vector<std::string> prompts;
};

class SqlPromptTest : public testing::Test {
 protected:
  const ScopedTimeZone zone_{"UTC0"};
  SqlPromptTest() {
    fixture.run(
        "CREATE TABLE event_row (id INTEGER PRIMARY KEY, at REAL);"
        "CREATE VIEW event AS SELECT id, at FROM event_row;");
  }
  void type(const std::vector<std::string>& texts) {
    for (const std::string& text : texts) lines.lines.push_back({Kind::kText, text});
  }
  void run() {
    SqlReader reader;
    ASSERT_EQ(reader.open(fixture.file()), "");
    SqlPrompt(tool, reader, lines, "/state/reports.db")
        .run([] { return RowFormat(); },
             [&](const std::string& statement, const RowFormat& /*format*/) {
               statements.push_back(statement);
             });
  }

  StoreFixture fixture;
  TypedLines lines;
  NlohmannJsonService json;
  std::ostringstream out;
  std::ostringstream err;
  Tool tool{out, err, json};
  std::vector<std::string> statements;
};

TEST_F(SqlPromptTest, SaysWhichFileItReadsAndWhichTimesItHolds) {
  fixture.run("INSERT INTO event_row VALUES (1, 1763633880), (2, 1763720280.5)");
  run();
  EXPECT_THAT(
      out.str(),
      StartsWith("/state/reports.db, from 2025-11-20 10:18:00Z to 2025-11-21 10:18:00.500Z\nOnly reading"));
  EXPECT_EQ(err.str(), "");
}

TEST_F(SqlPromptTest, SaysThatNothingIsRecorded) {
  run();
  EXPECT_THAT(out.str(), StartsWith("/state/reports.db, nothing recorded yet\n"));
}

TEST_F(SqlPromptTest, AStatementEndsWithASemicolonOrAnEmptyLine) {
  type({"SELECT 1;", "SELECT", "  2;", "", "SELECT 3", "", "SELECT ';", "';"});
  run();
  EXPECT_THAT(statements, ElementsAre("SELECT 1;\n", "SELECT\n  2;\n", "SELECT 3\n\n", "SELECT ';\n';\n"));
  EXPECT_THAT(lines.prompts,
              ElementsAre("sql> ", "sql> ", "...> ", "sql> ", "sql> ", "...> ", "sql> ", "...> ", "sql> "));
}

TEST_F(SqlPromptTest, ControlCDropsWhatWasTyped) {
  type({"SELECT 1"});
  lines.lines.push_back({Kind::kCancelled, ""});
  type({"SELECT 2;"});
  run();
  EXPECT_THAT(statements, ElementsAre("SELECT 2;\n"));
}

TEST_F(SqlPromptTest, QuitsWhenAsked) {
  for (const char* word : {".quit", "  .exit ", "quit", "exit"}) {
    type({word, "SELECT 1;"});
    run();
    EXPECT_THAT(statements, IsEmpty()) << word;
    lines.lines.clear();
  }
}

TEST_F(SqlPromptTest, EndsWhenTheOutputFails) {
  type({"SELECT 1;"});
  out.setstate(std::ios::badbit);
  run();
  EXPECT_THAT(statements, IsEmpty());
}

TEST_F(SqlPromptTest, ListsViewsBeforeTables) {
  type({".tables"});
  run();
  EXPECT_THAT(out.str(),
              HasSubstr("view   columns\nevent  id, at\n\ntable      columns\nevent_row  id, at\n"));
}

TEST_F(SqlPromptTest, ShowsTheColumnsAndTheSqlOfAView) {
  type({".schema EVENT;"});
  run();
  EXPECT_THAT(out.str(), HasSubstr("column  type\nid      INTEGER\nat      REAL\n\n"
                                   "CREATE VIEW event AS SELECT id, at FROM event_row;\n"));
}

TEST_F(SqlPromptTest, ExplainsItself) {
  type({".help"});
  run();
  EXPECT_THAT(out.str(), AllOf(HasSubstr(".tables "), HasSubstr(".schema VIEW"), HasSubstr(".quit")));
}

TEST_F(SqlPromptTest, SuggestsWhatWasMeant) {
  type({".tabels", ".schema evnt", ".schema", "SELECT", ".tables"});
  run();
  EXPECT_EQ(err.str(),
            "twctl: there is no .tabels; did you mean '.tables'?\n"
            "twctl: there is no view or table 'evnt'; did you mean 'event'?\n"
            "twctl: .schema needs the name of a view or table; there are event\n");
}

}  // namespace
}  // namespace tonewerk
