// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/StatusReport.h"

#include <algorithm>
#include <gmock/gmock.h>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <time.h>
#include <unistd.h>

#include "support/ScopedTimeZone.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

constexpr double kNow = 1'800'000'000.0;  // 2027-01-15 08:00 UTC

// A daemon with which nothing is wrong.
class StatusReportTest : public testing::Test {
 protected:
  const ScopedTimeZone zone_{"UTC0"};
  StatusReportTest() {
    setenv("TZ", "UTC", 1);
    tzset();
    const ValueMap daemon{{"version", "1.0"},
                          {"processIdentifier", 42},
                          {"user", 3'999'999},
                          {"startedAt", kNow - 7260},
                          {"seconds", 7260.0},
                          {"internalBuild", false},
                          {"runtime", "/run/tonewerk"},
                          {"state", "/var/lib/tonewerk"},
                          {"configuration", "/etc/tonewerk"}};
    const ValueArray resources{
        ValueMap{{"name", "keptBytes"}, {"held", 1'572'864}, {"share", 268'435'456}, {"refused", 2}}};
    const ValueArray accounts{
        ValueMap{{"user", 3'999'998}, {"trusted", true}, {"linesHeldBack", 7}, {"resources", resources}}};
    report.daemon = reportOf(
        {{"daemon", daemon},
         {"total", 1},
         {"accounts", accounts},
         {"sinks", ValueArray{ValueMap{{"name", "store"}, {"waiting", 17}, {"dropped", 0}, {"hangs", 0}}}},
         {"endpoints", ValueArray{}},
         {"troubles", ValueArray{}}});
    report.store.path = "/var/lib/tonewerk/reports.db";
    report.store.exists = true;
    report.store.bytes = 10 * 1024 * 1024;
    report.store.oldestAt = kNow - 5 * 86'400.0;
    report.store.newestAt = kNow;
    report.storeMegabytes = 256;
    report.bridges = {{7, 3'999'999}};
    report.now = kNow;
    report.ownVersion = "1.0";
  }
  ~StatusReportTest() override { unsetenv("TZ"); }

  std::string printed(std::optional<std::size_t> width = std::nullopt) const {
    std::ostringstream out;
    report.print(out, width);
    return out.str();
  }
  void trouble(double at, ValueMap more = {}) {
    ValueMap line{{"time", at}, {"category", "twrs"}, {"text", "cannot write"}, {"times", 3}};
    line.merge(more);
    report.daemon.troubles = ValueArray{line};
  }

  StatusReport report;
};

TEST_F(StatusReportTest, ShowsHowTheDaemonAndWhatBelongsToItStand) {
  EXPECT_EQ(
      printed(),
      "daemon    version 1.0, process 42 of 3999999\n"
      "          since 2027-01-15 05:59:00Z, for 2 h 1 min\n"
      "mode      the system's daemon\n"
      "store     /var/lib/tonewerk/reports.db\n"
      "          10.0 MiB of at most 256.0 MiB; the oldest report is 5 d 0 h old; grows by 2.0 MiB a day\n"
      "bridge    tw-pipewire, process 7 of 3999999\n"
      "\n"
      "user     resource   held     share      refused\n"
      "3999998  keptBytes  1.5 MiB  256.0 MiB  2\n"
      "3999998  logLines   -        -          7\n"
      "\n"
      "sink   waiting  dropped  hangs\n"
      "store  17       0        no\n"
      "\n"
      "well      nothing is wrong\n");
  EXPECT_THAT(report.problems(), IsEmpty()) << "a limit that a user met is there for that";
}

TEST_F(StatusReportTest, FitsSixtyColumns) {
  report.daemon.sinks =
      ValueArray{ValueMap{{"name", "diagnostics"}, {"waiting", 170'000}, {"dropped", 12}, {"hangs", 41}}};
  report.daemon.endpoints =
      ValueArray{ValueMap{{"name", "https://collector.example.org:4318/v1/logs"},
                          {"waiting", 12'000},
                          {"dropped", 3},
                          {"problem", "HTTP status 503; records are kept while there is room"}}};
  trouble(kNow - 5,
          {{"text", "a line of many words that would be far too long for a terminal of sixty columns"}});
  std::istringstream lines(printed(60));
  for (std::string line; std::getline(lines, line);) EXPECT_LE(utf8Characters(line), 60U) << line;
}

TEST_F(StatusReportTest, CountsAsWrongWhatHangsAndWhatWasDropped) {
  report.daemon.sinks = ValueArray{ValueMap{{"name", "store"}, {"waiting", 5}, {"dropped", 0}, {"hangs", 41}},
                                   ValueMap{{"name", "log"}, {"waiting", 0}, {"dropped", 3}, {"hangs", 0}}};
  EXPECT_THAT(report.problems(), ElementsAre("the sink store hangs for 41 s", "the sink log has dropped 3"));
  EXPECT_THAT(printed(), HasSubstr("\nwrong     the sink store hangs for 41 s\n"));
  EXPECT_THAT(printed(), HasSubstr("'twctl doctor' says what to do\n"));
}

TEST_F(StatusReportTest, CountsAsWrongAnEndpointThatDoesNotTakeRecords) {
  report.daemon.endpoints = ValueArray{ValueMap{
      {"name", "http://a.example/v1/logs"}, {"waiting", 2}, {"dropped", 0}, {"problem", "HTTP status 503"}}};
  EXPECT_THAT(report.problems(), ElementsAre("sending to http://a.example/v1/logs fails: HTTP status 503"));
  EXPECT_THAT(printed(), HasSubstr("http://a.example/v1/logs  2        0        HTTP status 503\n"));
}

TEST_F(StatusReportTest, CountsAsWrongTheDaemonsOwnErrorsOfTheLastHour) {
  trouble(kNow - 3599);
  EXPECT_THAT(report.problems(), ElementsAre("the daemon has logged 3 errors in the last hour"));
  EXPECT_THAT(printed(), HasSubstr("2027-01-15 07:00:01Z  cannot write (3 times)\n"));
  trouble(kNow - 3601);
  EXPECT_THAT(report.problems(), IsEmpty());
  EXPECT_THAT(printed(), HasSubstr("cannot write")) << "older ones are still shown";
  trouble(kNow - 5, {{"user", 3'999'998}});
  EXPECT_THAT(report.problems(), IsEmpty()) << "a client can cause as many as it likes";
  EXPECT_THAT(printed(), HasSubstr("(by 3999998)"));
}

TEST_F(StatusReportTest, CountsAsWrongAStoreThatCannotBeReadUnlessItIsSomebodyElses) {
  report.store.problem = "file is not a database";
  EXPECT_THAT(report.problems(), ElementsAre("the store cannot be read: file is not a database"));
  report.store.problem = "Permission denied";
  report.store.isForbidden = true;
  EXPECT_THAT(report.problems(), IsEmpty());
  EXPECT_THAT(printed(), HasSubstr("cannot be read: Permission denied"));
}

TEST_F(StatusReportTest, CountsAsWrongADaemonOfAnotherVersion) {
  report.ownVersion = "1.1";
  EXPECT_THAT(report.problems(), ElementsAre("the daemon has the version 1.0, this program 1.1"));
}

TEST_F(StatusReportTest, ShowsTheStoreWithoutADaemonToo) {
  report.daemon = {};
  report.daemon.problem = "no daemon listens on /run/x (No such file or directory)";
  EXPECT_THAT(report.problems(), ElementsAre(report.daemon.problem));
  EXPECT_THAT(printed(), HasSubstr("daemon    no daemon listens on /run/x"));
  EXPECT_THAT(printed(), HasSubstr("10.0 MiB of at most"));
  EXPECT_THAT(report.forPrograms().text(), Not(HasSubstr("\"accounts\"")));
}

TEST_F(StatusReportTest, GivesProgramsOneObjectWithNumbers) {
  const ValueMap object = report.forPrograms();
  EXPECT_TRUE(object.boolean("well"));
  EXPECT_EQ(object.find("problems")->text(), "[]");
  const ValueMap& daemon = *object.find("daemon")->asMap();
  EXPECT_TRUE(daemon.boolean("answers"));
  EXPECT_EQ(daemon.text("mode"), "system");
  EXPECT_EQ(daemon.integer("processIdentifier"), 42);
  const ValueMap& store = *object.find("store")->asMap();
  EXPECT_EQ(store.integer("bytes"), 10 * 1024 * 1024);
  EXPECT_EQ(store.integer("maxBytes"), 256 * 1024 * 1024);
  EXPECT_EQ(store.integer("bytesPerDay"), 2 * 1024 * 1024);
  EXPECT_EQ(object.find("bridges")->text(), R"([{"processIdentifier":7,"user":3999999}])");
  EXPECT_THAT(object.text(), HasSubstr(R"("sinks":[{"name":"store","waiting":17,"dropped":0,"hangs":0}])"));
}

TEST_F(StatusReportTest, LeavesOutWhatAnUntrustedCallerMayNotSee) {
  report.daemon.sinks.reset();
  report.daemon.endpoints.reset();
  report.daemon.troubles.reset();
  EXPECT_THAT(printed(), Not(HasSubstr("sink")));
  EXPECT_FALSE(report.forPrograms().contains("sinks"));
}

TEST(StatusTextsTest, ShowDurationsAndSizes) {
  EXPECT_EQ(durationText(59.9), "59 s");
  EXPECT_EQ(durationText(60), "1 min");
  EXPECT_EQ(durationText(3660), "1 h 1 min");
  EXPECT_EQ(durationText(90'000), "1 d 1 h");
  EXPECT_EQ(durationText(-5), "0 s");
  EXPECT_EQ(sizeText(1023), "1023 B");
  EXPECT_EQ(sizeText(1536), "1.5 KiB");
}

}  // namespace
}  // namespace tonewerk
