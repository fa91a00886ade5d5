// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <gmock/gmock.h>
#include <string>

#include "support/reports/ReportViews.h"
#include "tools/twctl/CommandLineTest.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;

class SessionsCommandTest : public CommandLineTest {
 protected:
  SessionsCommandTest() {
    std::filesystem::create_directories(directory_.path("state"));
    ReportViews views(directory_.path("state") + "/reports.db");
    // Not in the order in which they began.
    views.played(1, "Phone", 1'795'136'400.0, 60.0, "Earpiece", 0.5);
    views.played(2, "Melody", 1'795'132'800.0, 3600.0, "Speaker", 0.5);
    views.played(3, "Melody", 1'795'140'000.0, 10.0, "Headphones", 0.5);
    views.run(
        "UPDATE session SET service = 'telephony' WHERE id = 1;"
        "UPDATE session SET ended_at = NULL, ending = NULL, messages = NULL WHERE id = 3;"
        "INSERT INTO input_stretch (session, started_at, device) VALUES (2, 1795132800, 'Microphone')");
  }

  // The ids of the sessions that are printed, in their order.
  std::string idsOf(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "sessions");
    arguments.emplace_back("--json");
    EXPECT_EQ(run(arguments), kDone) << errors();
    std::string ids;
    std::istringstream lines(output());
    for (std::string line; std::getline(lines, line);) {
      constexpr std::size_t kBehindName = 6;
      ids += line.substr(kBehindName, line.find(',') - kBehindName) + " ";
    }
    return ids;
  }
};

TEST_F(SessionsCommandTest, PrintsTheNewestLast) {
  EXPECT_EQ(run({"sessions"}), kDone);
  EXPECT_THAT(output(), HasSubstr("\n1   2026-11-20 01:00:00Z  1:00 "));
  EXPECT_THAT(output(), HasSubstr("running"));
  EXPECT_THAT(errors(), IsEmpty());
  EXPECT_EQ(idsOf({}), "2 1 3 ");
}

// The zone of whoever asks, unless UTC is asked for; what is asked for ends with the command line.
TEST_F(SessionsCommandTest, ShowsAndTakesLocalTimesOrUtc) {
  const ScopedTimeZone zone("CET-1");
  EXPECT_EQ(run({"sessions"}), kDone);
  EXPECT_THAT(output(), HasSubstr("\n1   2026-11-20 02:00:00  1:00 "));
  EXPECT_EQ(idsOf({"--until", "2026-11-20 02:00"}), "2 1 ");
  EXPECT_EQ(run({"sessions", "--utc"}), kDone);
  EXPECT_THAT(output(), HasSubstr("\n1   2026-11-20 01:00:00Z  1:00 "));
  EXPECT_EQ(idsOf({"--utc", "--until", "2026-11-20 01:00"}), "2 1 ");
  EXPECT_EQ(run({"--utc", "sessions"}), kDone);
  EXPECT_THAT(output(), HasSubstr("\n1   2026-11-20 01:00:00Z  1:00 "));
  EXPECT_EQ(run({"sessions"}), kDone);
  EXPECT_THAT(output(), HasSubstr("\n1   2026-11-20 02:00:00  1:00 "));
}

TEST_F(SessionsCommandTest, KeepsTheNewestSoMany) { EXPECT_EQ(idsOf({"-n", "2"}), "1 3 "); }

TEST_F(SessionsCommandTest, ChoosesByWhatTheSessionsAre) {
  EXPECT_EQ(idsOf({"--app", "Mel*"}), "2 3 ");
  EXPECT_EQ(idsOf({"--service", "tele*"}), "1 ");
  EXPECT_EQ(idsOf({"--device", "Micro*"}), "2 ");
  EXPECT_EQ(idsOf({"--device", "[EH]*", "--app", "Melody"}), "3 ");
  EXPECT_EQ(idsOf({"--app", "nobody"}), "");
}

TEST_F(SessionsCommandTest, ChoosesByWhenTheSessionsRan) {
  // The second one ended just when the first one began.
  EXPECT_EQ(idsOf({"--until", "2026-11-20T01:00:00Z"}), "2 1 ");
  EXPECT_EQ(idsOf({"--since", "2026-11-20T01:00:30Z"}), "1 3 ");
  EXPECT_EQ(idsOf({"--since", "2026-11-20T02:30:00Z"}), "3 ");
}

TEST_F(SessionsCommandTest, RefusesWhatIsNoTimeAndNoCount) {
  EXPECT_EQ(run({"sessions", "--since", "then"}), kWrongUsage);
  EXPECT_EQ(run({"sessions", "-n", "0"}), kWrongUsage);
}

TEST_F(SessionsCommandTest, SaysThatThereIsNoStore) {
  setenv("STATE_DIRECTORY", directory_.path("empty").c_str(), 1);
  EXPECT_EQ(run({"sessions"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("empty/reports.db"));
  EXPECT_THAT(output(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
