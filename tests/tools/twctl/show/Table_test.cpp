// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/Table.h"

#include <gtest/gtest.h>
#include <sstream>
#include <string>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ScopedTimeZone.h"
#include "support/ScopedVariable.h"
#include "tools/twctl/TestTerminal.h"
#include "tools/twctl/Tool.h"

namespace tonewerk {
namespace {

TEST(TableTest, AlignsColumnsForPeople) {
  std::ostringstream out;
  {
    Table table(out, false, {"id", "name"});
    table.add({Value(5), Value("a")});
    table.add({Value(-123), Value("Lautst\xC3\xA4rke")});
  }
  EXPECT_EQ(out.str(),
            "id    name\n"
            "5     a\n"
            "-123  Lautst\xC3\xA4rke\n");
}

TEST(TableTest, CountsCharactersNotBytes) {
  std::ostringstream out;
  {
    Table table(out, false, {"a", "b"});
    table.add({Value("\xC3\xA4\xC3\xA4"), Value(1)});
    table.add({Value("ab"), Value(2)});
  }
  EXPECT_EQ(out.str(), "a   b\n\xC3\xA4\xC3\xA4  1\nab  2\n");
}

TEST(TableTest, PrintsTheHeadOnceHoweverManyPortions) {
  std::ostringstream out;
  Table table(out, false, {"a", "b"});
  table.add({Value("long"), Value(1)});
  table.print();
  table.add({Value("x"), Value(2)});
  table.print();
  EXPECT_EQ(out.str(), "a     b\nlong  1\nx     2\n");
}

TEST(TableTest, CutsTheWidestColumnsToTheWidth) {
  std::ostringstream out;
  {
    Table table(out, false, {"id", "application", "payload"});
    table.fit(30);
    table.add(
        {Value(5), Value("com.example.player"), Value("\xC3\xA4\xC3\xA4\xC3\xA4\xC3\xA4 and much more")});
    table.add({Value(6), Value("short"), Value("")});
  }
  EXPECT_EQ(out.str(),
            "id  application   payload\n"
            "5   com.example\u2026  \xC3\xA4\xC3\xA4\xC3\xA4\xC3\xA4 and mu\u2026\n"
            "6   short         \n");
}

TEST(TableTest, LeavesOutColumnsBeforeItCuts) {
  const auto tableOf = [](std::size_t width) {
    std::ostringstream out;
    Table table(out, false, {"id", "process", "application", "user"});
    table.fit(width);
    table.dropWhenNarrow({"user", "process"});
    table.add({Value(5), Value("player"), Value("com.example.player"), Value(1000)});
    table.print();
    return out.str();
  };
  EXPECT_EQ(tableOf(37),
            "id  process  application         user\n"
            "5   player   com.example.player  1000\n");
  EXPECT_EQ(tableOf(36),
            "id  process  application\n"
            "5   player   com.example.player\n");
  EXPECT_EQ(tableOf(30),
            "id  application\n"
            "5   com.example.player\n");
  EXPECT_EQ(tableOf(20),
            "id  application\n"
            "5   com.example.pla\u2026\n");
}

TEST(TableTest, CutsOtherColumnsThanTimes) {
  const ScopedTimeZone zone("CET-1");
  std::ostringstream out;
  {
    Table table(out, false, {"time", "payload"});
    table.fit(32);
    table.add({Table::Cell::time(1'763'633'880.0), Value("{\"key\":\"value\"}")});
  }
  EXPECT_EQ(out.str(), "time                 payload\n2025-11-20 11:18:00  {\"key\":\"va\u2026\n");
}

TEST(TableTest, DoesNotCutWhatFits) {
  std::ostringstream out;
  {
    Table table(out, false, {"a", "b"});
    table.fit(8);
    table.add({Value("abc"), Value("def")});
  }
  EXPECT_EQ(out.str(), "a    b\nabc  def\n");
}

TEST(TableTest, PrintsARowAsABlockWhereItsColumnsWouldHaveTooLittle) {
  std::ostringstream out;
  {
    Table table(out, false, {"id", "application", "payload"});
    table.fit(20);
    table.add({Value(5), Value("com.example.player"), Value("{\"key\":\"value\"}")});
    table.print();
    table.add({Value(6), Value(""), Value("x")});
  }
  EXPECT_EQ(out.str(),
            "id           5\n"
            "application  com.example.player\n"
            "payload      {\"key\":\"value\"}\n"
            "\n"
            "id           6\n"
            "application\n"
            "payload      x\n"
            "\n");
}

TEST(TableTest, StaysATableWhenLaterRowsAreWide) {
  std::ostringstream out;
  {
    Table table(out, false, {"a", "b"});
    table.fit(12);
    table.add({Value(1), Value(2)});
    table.print();
    table.add({Value("0123456789"), Value("abcdefghij")});
  }
  EXPECT_EQ(out.str(), "a  b\n1  2\n0123456\u2026  abcdefg\u2026\n");
}

TEST(TableTest, PrintsLargeRowsBeforeThereAreMany) {
  std::ostringstream out;
  Table table(out, false, {"a"});
  table.add({Value("small")});
  EXPECT_EQ(out.str(), "");
  table.add({Value(std::string(1 << 20, 'x'))});
  EXPECT_EQ(out.str().size(), std::string("a\nsmall\n").size() + (1 << 20) + 1);
}

TEST(TableTest, PrintsNothingWithoutRows) {
  std::ostringstream out;
  { const Table table(out, false, {"a"}); }
  EXPECT_EQ(out.str(), "");
}

TEST(TableTest, GivesProgramsAnObjectALine) {
  std::ostringstream out;
  Table table(out, true, {"id", "text", "list"});
  table.add({Value(1), Value("a\"\n"), Value(ValueArray{true, 2.0})});
  EXPECT_EQ(out.str(), "{\"id\":1,\"text\":\"a\\\"\\n\",\"list\":[true,2.0]}\n");
}

TEST(TableTest, EscapesWhatControlsATerminalAndStaysAligned) {
  std::ostringstream out;
  {
    Table table(out, false, {"a", "b"});
    table.add({Value("x\n\x1b[2J\x7F"), {"\xC2\x9B", "null"}});
    table.add({Value("\xE2\x80\xAE"), Value(1)});
  }
  EXPECT_EQ(out.str(),
            "a                   b\n"
            "x\\n\\u001b[2J\\u007f  \\u009b\n"
            "\\u202e              1\n");
}

TEST(TableTest, GivesProgramsTheSameValuesWithoutWhatControlsATerminal) {
  std::ostringstream out;
  Table table(out, true, {"a", "b"});
  table.add({Value("\x7F\xE2\x80\xAE"), {"", "{\"\xC2\x9B\":\"\xC3\xBC\"}"}});
  EXPECT_EQ(out.str(), "{\"a\":\"\\u007f\\u202e\",\"b\":{\"\\u009b\":\"\xC3\xBC\"}}\n");
}

TEST(TableTest, ShowsPeopleAndProgramsDifferentThingsWhereAsked) {
  std::ostringstream out;
  Table table(out, true, {"at"});
  table.add({{"yesterday", "5.0"}});
  EXPECT_EQ(out.str(), "{\"at\":5.0}\n");
}

TEST(TableTest, AlignsWideAndCombiningCharacters) {
  std::ostringstream out;
  {
    Table table(out, false, {"a", "b"});
    table.add({Value("\u65e5\u672c"), Value(1)});
    table.add({Value("e\u0301"), Value(2)});
    table.add({Value("abcd"), Value(3)});
  }
  EXPECT_EQ(out.str(), "a     b\n\u65e5\u672c  1\ne\u0301     2\nabcd  3\n");
}

TEST(TableTest, DoesNotEscapeAgainWhatIsEscaped) {
  std::ostringstream out;
  {
    Table table(out, false, {"a", "b"});
    table.add({Value("\x1b"), Value("C:\\x20\\dir \ue000")});
  }
  EXPECT_EQ(out.str(), "a       b\n\\u001b  C:\\x20\\dir \ue000\n");
}

TEST(TableTest, ANameOfAColumnControlsNoTerminal) {
  std::ostringstream out;
  {
    Table table(out, false, {"a\x1b[2J", "b"});
    table.add({Value(1), Value(2)});
  }
  EXPECT_EQ(out.str(), "a\\u001b[2J  b\n1           2\n");
}

// Runs a table for a terminal of 30 columns.
class ToolTableTest : public testing::Test {
 protected:
  std::string printed() {
    std::ostringstream out;
    Tool tool{.out = out, .err = out, .json = json_};
    tool.outIsTerminal = true;
    tool.outDescriptor = terminal_.descriptor();
    Table table(tool, {"what", "text"});
    table.add({Table::Cell(Value("bad")).in(Table::Style::kError), Value("0123456789012345678901234567890")});
    table.add({Value("good"), Table::Cell(Value("dim")).in(Table::Style::kDim)});
    table.print();
    return out.str();
  }

  const ScopedVariable term_{"TERM", "xterm"};
  const ScopedVariable colour_{"NO_COLOR", nullptr};
  TestTerminal terminal_{30, 24};
  NlohmannJsonService json_;
};

TEST_F(ToolTableTest, FitsTheTerminalAndColoursWhatStandsOut) {
  EXPECT_EQ(printed(),
            "what  text\n"
            "\x1b[31mbad \x1b[0m  01234567890123456789012\u2026\n"
            "good  \x1b[2mdim\x1b[0m\n");
}

TEST_F(ToolTableTest, HasNoColoursWhereTheyAreNotWanted) {
  {
    const ScopedVariable none("NO_COLOR", "1");
    EXPECT_EQ(printed().find('\x1b'), std::string::npos);
  }
  const ScopedVariable dumb("TERM", "dumb");
  EXPECT_EQ(printed().find('\x1b'), std::string::npos);
}

}  // namespace
}  // namespace tonewerk
