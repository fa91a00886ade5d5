// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <gmock/gmock.h>
#include <sstream>
#include <string>
#include <sys/stat.h>

#include "platform/linux/files/TextFile.h"
#include "support/reports/ReportViews.h"
#include "tools/twctl/CommandLineTest.h"

namespace tonewerk {
namespace {

using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

class ReportCommandTest : public CommandLineTest {
 protected:
  ReportCommandTest() {
    std::filesystem::create_directories(directory_.path("state"));
    ReportViews views(directory_.path("state") + "/reports.db");
    views.played(1, "Melody", 1'795'132'800.0, 3600.0, "Speaker", 0.5);
    views.played(2, "Phone", 1'795'136'400.0, 60.0, "Earpiece", 0.5);
  }
};

TEST_F(ReportCommandTest, PrintsThePageWithoutAFile) {
  EXPECT_EQ(run({"report"}), kDone);
  EXPECT_THAT(output(), StartsWith("<!doctype html>\n"));
  EXPECT_THAT(output(), HasSubstr("\"Melody\""));
  EXPECT_THAT(output(), EndsWith("</html>\n"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(ReportCommandTest, MakesAFileThatOnlyItsOwnerMayRead) {
  const std::string file = directory_.path("report.html");
  EXPECT_EQ(run({"report", "-o", file}), kDone);
  EXPECT_THAT(output(), IsEmpty());
  std::string page;
  ASSERT_FALSE(readTextFile(file, page));
  EXPECT_THAT(page, EndsWith("</html>\n"));
  struct stat status {};
  ASSERT_EQ(stat(file.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777U, 0600U);
}

TEST_F(ReportCommandTest, LeavesAFileThatExistsAsItIs) {
  const std::string file = write("report.html", "mine");
  EXPECT_EQ(run({"report", "-o", file}), kRefused);
  EXPECT_EQ(errors(), "twctl: " + file + ": it exists already\n");
  std::string text;
  ASSERT_FALSE(readTextFile(file, text));
  EXPECT_EQ(text, "mine");
}

TEST_F(ReportCommandTest, SaysWhyAFileCannotBeMadeAndLeavesNothing) {
  EXPECT_EQ(run({"report", "-o", directory_.path("missing/report.html")}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("missing/report.html: No such file or directory"));
}

TEST_F(ReportCommandTest, PrintsNoPageOnATerminal) {
  Tool tool{out_, err_, json_};
  tool.outIsTerminal = true;
  const char* arguments[] = {"twctl", "report"};
  EXPECT_EQ(runCommandLine(2, arguments, tool), kWrongUsage);
  EXPECT_THAT(err_.str(), HasSubstr("name a file with -o report.html"));
  EXPECT_THAT(out_.str(), IsEmpty());
}

TEST_F(ReportCommandTest, GivesProgramsTheData) {
  EXPECT_EQ(run({"report", "--json", "--app", "Ph*"}), kDone);
  std::string problem;
  const auto data = json_.parse(output().substr(0, output().find("\"timeline\"") - 1) + "}", problem);
  ASSERT_TRUE(data) << problem;
  EXPECT_EQ(data->asMap()->find("totals")->asMap()->integer("sessions"), 1);
  EXPECT_THAT(output(), HasSubstr(R"("filter":{"application":"Ph*"})"));
}

TEST_F(ReportCommandTest, PrintsNothingThatControlsATerminal) {
  const std::string state = directory_.path("other");
  std::filesystem::create_directories(state);
  ReportViews(state + "/reports.db")
      .played(1, "a\x7F\xC2\x9B\xE2\x80\xAE", 1'795'132'800.0, 1.0, "Speaker", 0.5);
  setenv("STATE_DIRECTORY", state.c_str(), 1);
  EXPECT_EQ(run({"report", "--json"}), kDone);
  EXPECT_THAT(output(), HasSubstr(R"("a\u007f\u009b\u202e")"));
}

TEST_F(ReportCommandTest, NamesTheDeviceAsItsPreferenceDoes) {
  std::filesystem::create_directories(directory_.path("configuration/preferences"));
  (void)write("configuration/preferences/com.orvane.tonewerk.toml", "device_name = \"Kitchen Display\"\n");
  EXPECT_EQ(run({"report", "--json"}), kDone);
  EXPECT_THAT(output(), HasSubstr(R"("name":"Kitchen Display"})"));
}

TEST_F(ReportCommandTest, SaysThatNoDaemonAnswers) {
  EXPECT_EQ(run({"report", "--json"}), kDone);
  EXPECT_THAT(output(), HasSubstr(R"("daemon":{"answers":false,"reason":"No such file or directory"})"));
}

TEST_F(ReportCommandTest, SaysWhatTheDaemonDroppedAndRefused) {
  const ValueArray resources{ValueMap{{"name", "keptBytes"}, {"held", 1}, {"share", 2}, {"refused", 3}},
                             ValueMap{{"name", "connections"}, {"held", 1}, {"share", 2}, {"refused", 0}}};
  const ValueArray accounts{
      ValueMap{{"user", 1000}, {"trusted", true}, {"linesHeldBack", 4}, {"resources", resources}}};
  const ValueArray sinks{ValueMap{{"name", "store"}, {"waiting", 17}, {"dropped", 5}, {"hangs", 2.5}}};
  daemon().answer("watch.accounts", ValueMap{{"total", 1}, {"accounts", accounts}, {"sinks", sinks}});
  EXPECT_EQ(run({"report", "--json"}), kDone);
  EXPECT_THAT(
      output(),
      HasSubstr(
          R"("daemon":{"answers":true,"tellsSinks":true,"refused":[{"user":1000,"resource":"keptBytes",)"
          R"("times":3}],"linesHeldBack":4,"sinks":[{"sink":"store","waiting":17,"dropped":5,"hangs":2.5}]})"));
}

TEST_F(ReportCommandTest, SaysThatAUserWhoIsNotTrustedIsToldOfNoSink) {
  daemon().answer("watch.accounts", ValueMap{{"total", 1}, {"accounts", ValueArray{}}});
  EXPECT_EQ(run({"report", "--json"}), kDone);
  EXPECT_THAT(output(), HasSubstr(R"("tellsSinks":false,"refused":[],"linesHeldBack":0,"sinks":[])"));
}

TEST_F(ReportCommandTest, MakesThePageOfOneSession) {
  EXPECT_EQ(run({"report", "--json", "--session", "2"}), kDone);
  EXPECT_THAT(output(), HasSubstr(R"("session":{"id":2,"reporter":1002,)"));
  EXPECT_THAT(output(), testing::Not(HasSubstr("Melody")));
}

TEST_F(ReportCommandTest, RefusesASessionThatIsNotThere) {
  const std::string file = directory_.path("report.html");
  EXPECT_EQ(run({"report", "--session", "12", "-o", file}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("no session has the id 12"));
  EXPECT_FALSE(std::filesystem::exists(file));
}

TEST_F(ReportCommandTest, RefusesWhatIsNoTimeAndNoNumber) {
  EXPECT_EQ(run({"report", "--since", "then"}), kWrongUsage);
  EXPECT_EQ(run({"report", "--session", "first"}), kWrongUsage);
}

}  // namespace
}  // namespace tonewerk
