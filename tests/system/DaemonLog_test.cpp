// SPDX-License-Identifier: Apache-2.0
//
// Tests the lines that the daemon writes to standard error.
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <sys/prctl.h>
#include <vector>

#include "system/support/DaemonTest.h"

namespace tonewerk {
namespace {

using ::testing::AllOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsSubsetOf;
using ::testing::IsSupersetOf;
using ::testing::Not;

class DaemonLogTest : public DaemonTest {
 protected:
  // Starts the daemon, connects and disconnects a client, and stops the daemon.
  void runWith(const std::string& threshold) {
    daemon.setEnvironment("TONEWERK_LOG", threshold);
    ASSERT_TRUE(daemon.start());
    {
      DaemonClient client = connect();
      client.create(77, 7);
      client.start(77);
      client.call("reporterIDValid", {Value(77)});
      client.stop(77);
    }
    EXPECT_EQ(daemon.stop(), 0);
  }

  std::set<std::string> levels() const {
    std::set<std::string> found;
    std::istringstream lines(daemon.log());
    for (std::string line; std::getline(lines, line);) {
      std::smatch parts;
      if (std::regex_match(line, parts, kLine)) found.insert(parts[1]);
    }
    return found;
  }

  static std::vector<std::string> linesIn(const std::string& text) {
    std::vector<std::string> found;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) found.push_back(line);
    return found;
  }

  static inline const std::regex kLine{
      R"(\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{6}Z (debug|info|default|error) (tw\w{2}) +\S+:\d+ +(.*))"};
};

TEST_F(DaemonLogTest, EveryLineHasTimeLevelCategoryAndPlace) {
  runWith("debug");
  std::istringstream lines(daemon.log());
  std::size_t count = 0;
  for (std::string line; std::getline(lines, line); ++count) {
    EXPECT_TRUE(std::regex_match(line, kLine)) << line;
  }
  EXPECT_GT(count, 20U);
}

TEST_F(DaemonLogTest, TheNameOfAClientsProcessBeginsNoLine) {
  char before[16] = {};
  ::prctl(PR_GET_NAME, before);
  ::prctl(PR_SET_NAME, "a\nforged\x1b[2J");
  runWith("debug");
  ::prctl(PR_SET_NAME, before);
  EXPECT_GT(logLinesWith("a\\nforged\\u001b[2J"), 0U);
  for (const std::string& line : linesIn(daemon.log())) EXPECT_TRUE(std::regex_match(line, kLine)) << line;
}

TEST_F(DaemonLogTest, TheThresholdIsChosenByTheVariable) {
  runWith("info");
  EXPECT_THAT(levels(), IsSupersetOf({"info", "default"}));
  EXPECT_THAT(levels(), Not(Contains("debug")));
}

TEST_F(DaemonLogTest, NothingBelowDefaultIsWrittenUnlessAskedFor) {
  runWith("");
  EXPECT_THAT(levels(), Contains("default"));
  EXPECT_THAT(levels(), Not(Contains("info")));
  EXPECT_THAT(levels(), Not(Contains("debug")));
}

TEST_F(DaemonLogTest, ErrorsAloneAreWrittenWhenAskedFor) {
  runWith("error");
  EXPECT_THAT(levels(), IsSubsetOf({"error"}));
}

TEST_F(DaemonLogTest, OneCategoryCanBeWatchedAlone) {
  runWith("twrr=debug,error");
  EXPECT_GT(logLinesWith("Z debug twrr "), 0U);
  EXPECT_EQ(logLinesWith("Z debug twrs "), 0U);
  EXPECT_EQ(logLinesWith("Z info twrs "), 0U);
}

// The two lines say where the reports go and that they were written.
TEST_F(DaemonLogTest, ASessionsLifeTakesTwoLinesAndNoneIsAnError) {
  daemon.setEnvironment("TONEWERK_LOG", "");
  ASSERT_TRUE(daemon.start());
  std::size_t before = 0;
  {
    DaemonClient client = connect();
    client.allReporters();  // answered after all log lines of the start
    before = daemon.log().size();
    client.create(77, 7);
    client.setConfiguration(77, {{"HostApplicationDisplayID", "com.example.player"}});
    client.start(77);
    for (int n = 0; n < 3; ++n) {
      client.send({{"a", n}}, 4, kTypeStart, {77});
      client.send({{"b", n}}, 4, kTypeStop, {});
    }
    client.stop(77);
    client.destroy(77);
  }
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(
      linesIn(daemon.log().substr(before)),
      ElementsAre(AllOf(HasSubstr(" default twri "), HasSubstr("list of backends")),
                  AllOf(HasSubstr(" default twri "), HasSubstr("sending rtc summary event. reporterID=77"))));
}

TEST_F(DaemonLogTest, AProbeThatComesAndGoesIsNoError) {
  ASSERT_TRUE(daemon.start());
  for (int n = 0; n < 50; ++n) EXPECT_TRUE(daemon.accepts());
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(levels(), Not(Contains("error"))) << daemon.log();
}

TEST_F(DaemonLogTest, AThresholdThatIsNoneIsSaidAndNotUsed) {
  runWith("loud");
  EXPECT_EQ(logLinesWith("TONEWERK_LOG is not understood"), 1U);
  EXPECT_GT(logLinesWith(" default twrs "), 0U);
  EXPECT_EQ(logLinesWith(" info "), 0U);
}

}  // namespace
}  // namespace tonewerk
