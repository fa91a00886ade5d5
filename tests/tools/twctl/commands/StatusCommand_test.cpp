// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <gmock/gmock.h>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <vector>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/TemporaryDirectory.h"
#include "tools/twctl/ScriptedDaemon.h"
#include "tools/twctl/commands/Commands.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;

class StatusCommandTest : public testing::Test {
 protected:
  StatusCommandTest() {
    setenv("TONEWERK_REPORTING_SOCKET", socket.c_str(), 1);
    setenv("STATE_DIRECTORY", directory.path("state").c_str(), 1);
    setenv("CONFIGURATION_DIRECTORY", directory.path("configuration").c_str(), 1);
  }
  void TearDown() override {
    for (const char* name : {"TONEWERK_REPORTING_SOCKET", "STATE_DIRECTORY", "CONFIGURATION_DIRECTORY"})
      unsetenv(name);
  }

  int run(std::vector<const char*> arguments) {
    arguments.insert(arguments.begin(), "twctl");
    out.str({});
    err.str({});
    Tool tool{out, err, json};
    return runCommandLine(static_cast<int>(arguments.size()), arguments.data(), tool);
  }
  void answerTwoUsers(std::int64_t total) {
    const ValueArray ofRoot{
        ValueMap{{"name", "connections"}, {"held", 3}, {"share", 480}, {"refused", 0}},
        ValueMap{{"name", "keptBytes"}, {"held", 1'572'864}, {"share", 268'435'456}, {"refused", 2}}};
    const ValueArray accounts{
        ValueMap{{"user", 0}, {"trusted", true}, {"linesHeldBack", 0}, {"resources", ofRoot}},
        ValueMap{{"user", 3'999'999}, {"trusted", false}, {"linesHeldBack", 7}, {"resources", ValueArray{}}}};
    daemon.answer("watch.accounts", ValueMap{{"total", total}, {"accounts", accounts}});
  }

  TemporaryDirectory directory;
  const std::string socket = directory.path("reporting.sock");
  ScriptedDaemon daemon{socket};
  NlohmannJsonService json;
  std::ostringstream out;
  std::ostringstream err;
};

TEST_F(StatusCommandTest, ShowsWhatEachUserHoldsAndWasRefused) {
  answerTwoUsers(2);
  EXPECT_EQ(run({"status"}), kDone);
  EXPECT_THAT(out.str(), HasSubstr("user     resource     held     share      refused\n"
                                   "root     connections  3        480        0\n"
                                   "root     keptBytes    1.5 MiB  256.0 MiB  2\n"
                                   "3999999  logLines     -        -          7\n"));
}

TEST_F(StatusCommandTest, IsWhatTwctlDoesWithoutACommand) {
  answerTwoUsers(2);
  EXPECT_EQ(run({}), kDone);
  EXPECT_THAT(out.str(), HasSubstr("root     keptBytes"));
  EXPECT_EQ(run({"--json"}), kDone);
  EXPECT_THAT(out.str(), HasSubstr("{\"well\":true,"));
  EXPECT_EQ(run({"stats"}), kWrongUsage);
  EXPECT_THAT(err.str(), HasSubstr("did you mean 'status'?"));
}

TEST_F(StatusCommandTest, GivesProgramsOneObject) {
  answerTwoUsers(2);
  EXPECT_EQ(run({"status", "--json"}), kDone);
  EXPECT_THAT(out.str(),
              HasSubstr("{\"name\":\"keptBytes\",\"held\":1572864,\"share\":268435456,\"refused\":2}"));
  const std::string text = out.str();
  EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), 1);
}

TEST_F(StatusCommandTest, ShowsWhichSinksHangAndWhatTheyDropped) {
  const ValueArray sinks{ValueMap{{"name", "store"}, {"waiting", 17}, {"dropped", 0}, {"hangs", 0}},
                         ValueMap{{"name", "jsonFiles"}, {"waiting", 3}, {"dropped", 2}, {"hangs", 41}}};
  daemon.answer("watch.accounts", ValueMap{{"total", 0}, {"accounts", ValueArray{}}, {"sinks", sinks}});
  EXPECT_EQ(run({"status"}), kRefused) << "something is wrong";
  EXPECT_THAT(out.str(), HasSubstr("\n"
                                   "sink       waiting  dropped  hangs\n"
                                   "store      17       0        no\n"
                                   "jsonFiles  3        2        41 s\n"));
  EXPECT_THAT(out.str(), HasSubstr("\nwrong     the sink jsonFiles hangs for 41 s\n"));
}

TEST_F(StatusCommandTest, SaysHowManyUsersAreMissing) {
  answerTwoUsers(600);
  EXPECT_EQ(run({"status"}), kDone);
  EXPECT_THAT(out.str(), HasSubstr("and 598 more users\n"));
}

TEST_F(StatusCommandTest, ADaemonThatRefusesIsWrong) {
  daemon.refuse("watch.accounts", ReplyError{"com.orvane.tonewerk.messaging", 1, "unknown method"});
  EXPECT_EQ(run({"status"}), kRefused);
  EXPECT_THAT(out.str(), HasSubstr("daemon    watch.accounts: unknown method"));
}

// The exit status was that of a daemon with troubles.
TEST_F(StatusCommandTest, ADaemonThatDoesNotAnswerIsNone) {
  daemon.endAt("watch.accounts");
  EXPECT_EQ(run({"status"}), kNoDaemon);
  EXPECT_THAT(out.str(), HasSubstr("daemon    the daemon does not answer ("));
}

TEST_F(StatusCommandTest, LooksAtTheStoreOfTheDaemonThatAnswers) {
  daemon.answer("watch.accounts", ValueMap{{"total", 0},
                                           {"accounts", ValueArray{}},
                                           {"daemon", ValueMap{{"state", directory.path("elsewhere")}}}});
  EXPECT_EQ(run({"status"}), kDone);
  EXPECT_THAT(out.str(), HasSubstr("store     " + directory.path("elsewhere/reports.db")));
}

}  // namespace
}  // namespace tonewerk
