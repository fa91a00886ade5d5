// SPDX-License-Identifier: Apache-2.0
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

class StatusCommandTest : public testing::Test {
 protected:
  StatusCommandTest() { setenv("TONEWERK_REPORTING_SOCKET", socket.c_str(), 1); }
  void TearDown() override { unsetenv("TONEWERK_REPORTING_SOCKET"); }

  int run(std::vector<const char*> arguments) {
    arguments.insert(arguments.begin(), "twctl");
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
  EXPECT_EQ(out.str(),
            "user     name  trusted  resource     held     share      refused\n"
            "0        root  yes      connections  3        480        0\n"
            "0        root  yes      keptBytes    1.5 MiB  256.0 MiB  2\n"
            "3999999        no       logLines     -        -          7\n");
}

TEST_F(StatusCommandTest, GivesProgramsNumbers) {
  answerTwoUsers(2);
  EXPECT_EQ(run({"status", "--json"}), kDone);
  EXPECT_THAT(out.str(),
              testing::HasSubstr("{\"user\":0,\"name\":\"root\",\"trusted\":true,\"resource\":\"keptBytes\","
                                 "\"held\":1572864,\"share\":268435456,\"refused\":2}\n"));
}

TEST_F(StatusCommandTest, ShowsWhichSinksHangAndWhatTheyDropped) {
  const ValueArray sinks{ValueMap{{"name", "store"}, {"waiting", 17}, {"dropped", 0}, {"hangs", 0}},
                         ValueMap{{"name", "jsonFiles"}, {"waiting", 3}, {"dropped", 2}, {"hangs", 41}}};
  daemon.answer("watch.accounts", ValueMap{{"total", 0}, {"accounts", ValueArray{}}, {"sinks", sinks}});
  EXPECT_EQ(run({"status"}), kDone);
  EXPECT_THAT(out.str(), testing::HasSubstr("\n"
                                            "sink       waiting  dropped  hangs\n"
                                            "store      17       0        no\n"
                                            "jsonFiles  3        2        41 s\n"));
}

TEST_F(StatusCommandTest, GivesProgramsALineForEachSink) {
  const ValueArray sinks{ValueMap{{"name", "store"}, {"waiting", 17}, {"dropped", 1}, {"hangs", 0}}};
  daemon.answer("watch.accounts", ValueMap{{"total", 0}, {"accounts", ValueArray{}}, {"sinks", sinks}});
  EXPECT_EQ(run({"status", "--json"}), kDone);
  EXPECT_EQ(out.str(), "{\"sink\":\"store\",\"waiting\":17,\"dropped\":1,\"hangs\":0}\n");
}

TEST_F(StatusCommandTest, SaysHowManyUsersAreMissing) {
  answerTwoUsers(600);
  EXPECT_EQ(run({"status"}), kDone);
  EXPECT_THAT(out.str(), testing::EndsWith("and 598 more users\n"));
}

}  // namespace
}  // namespace tonewerk
