// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/TopView.h"

#include <gmock/gmock.h>

#include "values/Utf8.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;
using testing::SizeIs;
using testing::StartsWith;

SessionRow session(std::int64_t reporterID, const std::string& application, double rate,
                   std::int64_t overloads = 0) {
  return {{{"reporterID", reporterID},
           {"serviceName", "telephony"},
           {"application", application},
           {"processIdentifier", 11},
           {"processName", "phone"},
           {"messages", 8},
           {"redundant", 2},
           {"overloads", overloads},
           {"seconds", 187.9}},
          rate,
          0.25};
}

class TopViewTest : public testing::Test {
 protected:
  TopViewTest() {
    show({session(1, "b.example", 5), session(2, "a.example", 7, 3), session(3, "c.example", 6)});
  }

  void show(std::vector<SessionRow> sessions) { view.update(std::move(sessions), health); }
  void press(std::u32string_view keys) {
    for (const char32_t key : keys) EXPECT_TRUE(view.press(key));
  }
  std::vector<std::string> page(std::size_t columns = 100, std::size_t rows = 24) const {
    std::vector<std::string> lines;
    for (const TopLine& line : view.page({columns, rows})) lines.push_back(line.text);
    return lines;
  }
  // The identifiers of the sessions, from the top.
  std::string order() const {
    std::string identifiers;
    for (const std::string& line : page()) {
      if (line.size() > 4 && line[0] >= '1' && line[0] <= '9' && line.substr(1, 3) == "   ")
        identifiers += line[0];
    }
    return identifiers;
  }

  AudioHealth health{{{"speaker", false, 0.34, 0.5, 2}},
                     {{"player", 0.125, 0.9, 3, 4711}, {"filter", 0.5, 0.6, 0, 12}}};
  TopView view;
};

TEST_F(TopViewTest, ShowsSumsHealthAndTheBusiestSessionFirst) {
  EXPECT_THAT(
      page(),
      ElementsAre("3 sessions, 18.0 messages a second, 3 overloads",
                  "speaker: 34 % of the period, less than 50 % at worst, 2 xruns",
                  "session  service    application  client    msg/s\u2193  redundant  overloads  running",
                  "2        telephony  a.example    phone 11  7.0     25.0 %     3          3:07",
                  "3        telephony  c.example    phone 11  6.0     25.0 %     0          3:07",
                  "1        telephony  b.example    phone 11  5.0     25.0 %     0          3:07",
                  "sessions   h help  / filter  n nodes  q quit"));
}

TEST_F(TopViewTest, KeysMoveTheSortingAndReverseIt) {
  EXPECT_EQ(order(), "231");
  press(U"r");
  EXPECT_EQ(order(), "132");
  press(U"<<");  // client, application
  EXPECT_EQ(order(), "213");
  press(U"r");
  EXPECT_EQ(order(), "312");
  press(U">>>>");  // overloads
  EXPECT_EQ(order().front(), '2');
  press(U"><");
  EXPECT_EQ(order().front(), '2');
  const char32_t arrows[] = {kKeyLeft, kKeyLeft, 0};
  press(arrows);  // msg/s
  EXPECT_EQ(order(), "231");
}

TEST_F(TopViewTest, TheFilterShowsOnlyRowsWithItsText) {
  press(U"/A.EX");
  EXPECT_EQ(page().back(), "only rows with: A.EX_");
  EXPECT_EQ(order(), "2");
  press(U"\r");
  EXPECT_THAT(page().back(), StartsWith("sessions with \"A.EX\""));
  press(
      U"/\x7f\x7f\x7f\x7f"
      U"c.ex\r");
  EXPECT_EQ(order(), "3");
  press(U"\x1b");
  EXPECT_EQ(order(), "231");
}

TEST_F(TopViewTest, KeysThatAreTypedIntoTheFilterDoNothingElse) {
  press(U"/qpn?\u00fc\x7f");
  EXPECT_EQ(page().back(), "only rows with: qpn?_");
  EXPECT_FALSE(view.isPaused());
  for (int at = 0; at < 500; ++at) press(U"x");
  EXPECT_LT(page().back().size(), 120U);
  EXPECT_FALSE(view.press(kKeyControlC));
}

TEST_F(TopViewTest, ColumnsAreSwitchedWithTheirDigits) {
  press(U"14");
  EXPECT_THAT(page().at(2), StartsWith("service    application  msg/s"));
  press(U"1");
  EXPECT_THAT(page().at(2), StartsWith("session  service    application  msg/s"));
  press(U"9");  // there is none
  EXPECT_THAT(page().at(2), StartsWith("session  service    application  msg/s"));
}

TEST_F(TopViewTest, FitsSixtyColumnsAndFewerByLeavingOutWhatMattersLeast) {
  show({session(1234567890, "org.example.ratherlongapplication", 5)});
  for (const std::size_t columns : {100U, 80U, 60U, 40U, 30U}) {
    for (const std::string& line : page(columns)) {
      if (line == page(columns).front() || line == page(columns)[1] || line == page(columns).back()) continue;
      EXPECT_LE(utf8Characters(line), columns) << line;
    }
    EXPECT_THAT(page(columns).at(2), HasSubstr("application"));
    EXPECT_THAT(page(columns).at(2), HasSubstr("msg/s"));
  }
  EXPECT_THAT(page(60).at(2), HasSubstr("overloads"));
  EXPECT_THAT(page(60).at(2), Not(HasSubstr("redundant")));
}

TEST_F(TopViewTest, FitsTheHeightAndSaysHowManyMoreThereAre) {
  EXPECT_THAT(page(100, 7), SizeIs(7));
  const auto lines = page(100, 6);
  ASSERT_THAT(lines, SizeIs(6));
  EXPECT_THAT(lines[3], StartsWith("2 "));
  EXPECT_EQ(lines[4], "... and 2 more");
  for (const std::size_t rows : {1U, 2U, 3U, 4U, 5U}) EXPECT_LE(page(10, rows).size(), rows);
}

TEST_F(TopViewTest, ScrollsNoFurtherThanTheRows) {
  const char32_t down[] = {kKeyDown, 0};
  press(down);
  EXPECT_EQ(order(), "31");
  const char32_t far[] = {kKeyPageDown, kKeyPageDown, 0};
  press(far);
  EXPECT_EQ(order(), "1");
  const char32_t up[] = {kKeyPageUp, kKeyUp, 0};
  press(up);
  EXPECT_EQ(order(), "231");
}

TEST_F(TopViewTest, AnotherPaneShowsTheNodes) {
  press(U"n");
  const auto lines = page();
  EXPECT_EQ(lines.at(2), "node    of the period\u2193  worst  glitches  process");
  EXPECT_EQ(lines.at(3), "filter  50 %            60 %   0         12");
  EXPECT_EQ(lines.at(4), "player  12 %            90 %   3         4711");
  press(U">>");  // glitches
  EXPECT_THAT(page().at(3), StartsWith("player"));
  press(U"\t");
  EXPECT_EQ(order(), "231");
}

TEST_F(TopViewTest, SaysWhenNobodyPublishesTheHealth) {
  health = {};
  show({});
  EXPECT_THAT(page().at(1), HasSubstr("tw-pipewire"));
  press(U"n");
  EXPECT_THAT(page().at(3), HasSubstr("no bridge"));
}

TEST_F(TopViewTest, MarksADeviceThatWasLate) {
  health.devices[0].worst = 1.25;
  show({});
  EXPECT_EQ(view.page({80, 24}).at(1).style, TopLine::Style::kWarning);
}

TEST_F(TopViewTest, CountsTheDevicesThatFindNoRoom) {
  health.devices.assign(9, health.devices[0]);
  show({});
  EXPECT_EQ(page(100, 24).at(4), "... and 6 more devices");
  EXPECT_EQ(page(100, 6).at(1), "... and 9 more devices");
}

TEST_F(TopViewTest, HelpNamesTheKeysAndColumnsAndAnyKeyLeavesIt) {
  press(U"?");
  EXPECT_THAT(page(), testing::Contains(HasSubstr("sort by the column")));
  EXPECT_THAT(page(), testing::Contains("3 * application"));
  press(U"x");
  EXPECT_EQ(order(), "231");
  press(U"h");
  EXPECT_FALSE(view.press(U'q'));
}

TEST_F(TopViewTest, QuitsWithQAndControlC) {
  EXPECT_FALSE(view.press(U'q'));
  EXPECT_FALSE(view.press(kKeyControlC));
  EXPECT_TRUE(view.press(U'x'));
}

TEST_F(TopViewTest, PausesAndGoesOn) {
  press(U"p");
  EXPECT_TRUE(view.isPaused());
  EXPECT_THAT(page().back(), HasSubstr("paused"));
  press(U" ");
  EXPECT_FALSE(view.isPaused());
}

TEST_F(TopViewTest, TextsOfOtherUsersCannotControlTheTerminal) {
  health.devices[0].device = "d\x1b[2J";
  health.nodes[0].node = "n\n";
  show({session(1, "a\x1b[2J\xE2\x80\xAE", 1)});
  EXPECT_THAT(page().at(1), StartsWith("d\\u001b[2J: "));
  EXPECT_THAT(page().at(3), HasSubstr("a\\u001b[2J\\u202e"));
  press(U"n");
  EXPECT_THAT(page().at(4), StartsWith("n\\n"));
}

}  // namespace
}  // namespace tonewerk
