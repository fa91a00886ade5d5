// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineReplay.h"

#include <csignal>
#include <fstream>
#include <stdlib.h>
#include <sys/resource.h>

#include "tools/offline/OfflineDaemon.h"
#include "tools/offline/OfflineReplayTest.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

constexpr const char* kSession = R"({"at": 0, "call": "createReportingSession", "params": [7]}
{"at": 0, "call": "setServiceType", "params": [7, 7]}
{"at": 0, "call": "startReportingSessionForID", "params": [7]}
{"at": 1.5, "call": "sendMessage", "params": [{"route": "Speaker", "twreporting_timestamp": {"now": -1}}, 10, 0, [7]]}
)";
constexpr const char* kStop = R"({"at": 3, "call": "stopReportingSessionForID", "params": [7]}
)";

std::string readAll(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

TEST_F(OfflineReplayTest, RecordsOnTheClockOfTheRecording) {
  const std::string text = textOf(std::string(R"({"device": {"starts_at": 1763633880}})") + "\n" + kSession);
  EXPECT_THAT(text, HasSubstr("event 2025-11-20T10:18:01.5Z com.orvane.tonewerk.RouteChange.Generic\n"
                              "  also com.orvane.longformaudio.RouteChange.Generic\n"
                              "  \"route\":\"Speaker\"\n"
                              "  \"twreporting_timestamp\":1763633880.5\n"));
}

TEST_F(OfflineReplayTest, BeginsWithTheYearWithoutATimeOfTheRecording) {
  EXPECT_THAT(textOf(kSession), HasSubstr("event 2026-01-01T00:00:01.5Z com.orvane.tonewerk.RouteChange"));
}

TEST_F(OfflineReplayTest, GivesTheSameStoreInEveryTimeZone) {
  const std::string lines = std::string(kSession) + kStop;
  ASSERT_THAT(play(lines), IsEmpty());
  const std::string first = readAll(store());
  EXPECT_THAT(storeText(directory_.path("")), HasSubstr("Session_Generic.Summary"));
  setenv("TZ", "Asia/Kathmandu", 1);
  std::filesystem::remove(store());
  EXPECT_THAT(play(lines), IsEmpty());
  unsetenv("TZ");
  EXPECT_EQ(readAll(store()), first);
}

// More rows than between two writes, so that the store's thread writes them in several batches.
TEST_F(OfflineReplayTest, GivesTheSameStoreForALongRecordingToo) {
  std::string lines = kSession;
  for (int n = 0; n < 700; ++n) {
    lines += R"({"at": 2, "call": "sendMessage", "params": [{"number": )" + std::to_string(n) +
             R"(, "twreporting_timestamp": {"now": 0}}, 4, 0, [7]]})" + "\n";
  }
  lines += kStop;
  ASSERT_THAT(play(lines), IsEmpty());
  const std::string first = readAll(store());
  EXPECT_THAT(storeText(directory_.path("")), HasSubstr("\"number\":699\n"));
  std::filesystem::remove(store());
  EXPECT_THAT(play(lines), IsEmpty());
  EXPECT_EQ(readAll(store()), first);
}

TEST_F(OfflineReplayTest, MakesAnEmptyStoreOfAnEmptyRecording) {
  EXPECT_THAT(play(""), IsEmpty());
  EXPECT_THAT(files(), ElementsAre("reports.db"));
  EXPECT_THAT(storeText(directory_.path("")), IsEmpty());
}

TEST_F(OfflineReplayTest, LeavesAFileThatIsThereAsItIs) {
  std::ofstream(store()) << "mine";
  EXPECT_THAT(play(kSession), HasSubstr("it exists already"));
  EXPECT_EQ(readAll(store()), "mine");
  EXPECT_THAT(files(), ElementsAre("reports.db"));
}

TEST_F(OfflineReplayTest, DoesNotFollowALinkAtThePlaceOfTheStore) {
  std::filesystem::create_symlink(directory_.path("elsewhere"), store());
  EXPECT_THAT(play(kSession), HasSubstr("it exists already"));
  EXPECT_THAT(files(), ElementsAre("reports.db"));
}

TEST_F(OfflineReplayTest, LeavesNothingBehindWhenItIsInterrupted) {
  isInterrupted_ = true;
  EXPECT_THAT(play(kSession), HasSubstr("interrupted"));
  EXPECT_THAT(files(), IsEmpty());
}

// The timer of the single messages ticks two thousand million times between the two lines.
TEST_F(OfflineReplayTest, APauseOfManyTicksEndsWhenItIsInterrupted) {
  std::istringstream text(R"({"at": 0, "call": "sendMessage", "params": [{"a": 1}, 4, 0, null]}
{"at": 1e9, "call": "getAllReporters", "params": []}
)");
  std::string problem;
  const auto recording = Recording::read(text, requests::all(), json_, problem);
  ASSERT_TRUE(recording) << problem;
  OfflineDaemon daemon(directory_.path(""), {}, json_, category_, {}, isInterrupted_);
  daemon.take(recording->steps()[0]);
  isInterrupted_ = true;
  daemon.take(recording->steps()[1]);
}

TEST_F(OfflineReplayTest, LeavesNothingBehindWhenTheDiskIsFull) {
  rlimit before{};
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  const rlimit limit{20'000, before.rlim_max};
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
  const std::string problem = play(kSession);
  EXPECT_EQ(setrlimit(RLIMIT_FSIZE, &before), 0);
  std::signal(SIGXFSZ, handler);
  EXPECT_THAT(problem, HasSubstr("cannot be written"));
  EXPECT_THAT(files(), IsEmpty());
}

TEST_F(OfflineReplayTest, NamesADirectoryThatIsMissing) {
  std::istringstream text(kSession);
  std::string problem;
  const auto recording = Recording::read(text, requests::all(), json_, problem);
  ASSERT_TRUE(recording);
  OfflineReplay replay(json_, category_, {});
  EXPECT_THAT(replay.play(*recording, "/nowhere/store.db", isInterrupted_),
              AllOf(HasSubstr("/nowhere"), HasSubstr("No such file")));
}

TEST_F(OfflineReplayTest, NamesTheRequestsThatAreRefused) {
  EXPECT_THAT(play(R"({"at": 0, "client": 2, "connect": {"user": 1001}}
{"at": 0, "client": 2, "call": "killService", "params": []}
{"at": 0, "client": 2, "call": "observe", "params": []}
{"at": 0, "client": 2, "call": "createReportingSession", "params": [7]}
)"),
              IsEmpty());
  EXPECT_THAT(refused_, ElementsAre(AllOf(HasSubstr("line 2: "), HasSubstr("not permitted")),
                                    AllOf(HasSubstr("line 4: "), HasSubstr("not permitted"))));
}

TEST_F(OfflineReplayTest, StopsSessionsWhoseClientGoes) {
  const std::string text = textOf(std::string(kSession) + "{\"at\": 5, \"disconnect\": true}\n" +
                                  "{\"at\": 9, \"call\": \"getAllReporters\", \"params\": []}\n");
  EXPECT_THAT(text, HasSubstr("event 2026-01-01T00:00:05Z com.orvane.tonewerk.Session_Generic.Summary"));
  EXPECT_THAT(text, HasSubstr("event 2026-01-01T00:00:05Z com.orvane.tonewerk.twreportingclientuptime"));
}

TEST_F(OfflineReplayTest, StopsSessionsThatTheRecordingLeavesOpen) {
  EXPECT_THAT(textOf(kSession),
              HasSubstr("event 2026-01-01T00:00:01.5Z com.orvane.tonewerk.Session_Generic.Summary"));
}

// As in a daemon, which the request ends at once.
TEST_F(OfflineReplayTest, StopsAllSessionsWhereTheDaemonBeginsAgain) {
  const std::string text =
      textOf(std::string(kSession) +
             R"({"at": 4, "client": 2, "call": "sendMessage", "params": [{"a": 1}, 4, 1, []]}
{"at": 5, "restart": true}
{"at": 6, "call": "sendMessage", "params": [{"a": 1}, 4, 1, null]}
)");
  EXPECT_THAT(text, HasSubstr("event 2026-01-01T00:00:05Z com.orvane.tonewerk.Session_Generic.Summary"));
  EXPECT_THAT(text, HasSubstr("event 2026-01-01T00:00:06Z com.orvane.tonewerk.Playback.Start\n"
                              "  also com.orvane.standalone.Playback.Start"));
}

TEST_F(OfflineReplayTest, EndsTheSessionOfSingleMessagesWhereTheDaemonBeginsAgain) {
  const std::string message = R"("call": "sendMessage", "params": [{"a": 1}, 4, 1, null]})";
  const auto starts = [&](const std::string& between) {
    const std::string text =
        textOf("{\"at\": 1, " + message + "\n" + between + "{\"at\": 2, " + message + "\n");
    std::size_t count = 0;
    for (auto at = text.find("standalone.Playback.Start"); at != std::string::npos;
         at = text.find("standalone.Playback.Start", at + 1))
      ++count;
    return count;
  };
  EXPECT_EQ(starts(""), 1U) << "the second is redundant in the same session";
  EXPECT_EQ(starts("{\"at\": 1.5, \"restart\": true}\n"), 2U);
}

TEST_F(OfflineReplayTest, StopsNoSessionWhenARequestEndsTheDaemon) {
  const std::string text =
      textOf(std::string(kSession) + "{\"at\": 2, \"call\": \"killService\", \"params\": []}\n" + kStop);
  EXPECT_THAT(text, AllOf(HasSubstr("RouteChange.Generic"), Not(HasSubstr("Summary")),
                          Not(HasSubstr("clientuptime"))));
}

TEST_F(OfflineReplayTest, StopsASingleMessageSessionWhenItHasBeenQuiet) {
  const std::string text =
      textOf(R"({"at": 0, "call": "sendMessage", "params": [{"route": "Speaker"}, 10, 0, null]}
{"at": 20, "call": "getAllReporters", "params": []}
)");
  // More than 5 s later, and looked for twice a second.
  EXPECT_THAT(text, HasSubstr("rtc message 2026-01-01T00:00:05.5Z session 1 category 65535 type 65535\n"));
}

TEST_F(OfflineReplayTest, TakesProcessesAndUsersFromTheRecording) {
  const std::string text = textOf(R"({"at": 0, "client": 2, "connect": {"user": 1001, "process": "player"}}
{"at": 0, "client": 2, "call": "createReportingSession", "params": [7]}
{"at": 0, "client": 2, "call": "startReportingSessionForID", "params": [7]}
{"at": 1, "client": 3, "connect": {"user": 1002}}
{"at": 1, "client": 3, "call": "sendMessage", "params": [{"of": "another"}, 10, 0, [7]]}
{"at": 1, "client": 4, "call": "sendMessage", "params": [{"of": "trusted"}, 10, 0, [7]]}
{"at": 2, "client": 2, "disconnect": true}
)");
  EXPECT_THAT(text, HasSubstr("\"processName\":\"player\"\n  \"seconds\":2.0\n"));
  EXPECT_THAT(text, HasSubstr("\"of\":\"trusted\""));
  EXPECT_THAT(text, Not(HasSubstr("another")));
}

TEST_F(OfflineReplayTest, TakesTheDeviceFromTheRecording) {
  const std::string text = textOf(
      std::string(
          R"({"device": {"thermal_level": 2, "low_power_mode": true, "load_averages": [1, 2, 3], "preferences": {)"
          R"("com.orvane.metricon": {"consumers": [{"name": "c", "events": ["com.orvane.tonewerk.*"]}]}}}})") +
      "\n" + kSession + "{\"at\": 2, \"device\": {\"thermal_level\": 3}}\n" + kStop);
  EXPECT_THAT(text, HasSubstr("com.orvane.tonewerk.RouteChange.Generic"));
  EXPECT_THAT(text, Not(HasSubstr("com.orvane.longformaudio")));
  EXPECT_THAT(text, HasSubstr("\"low_power_enabled\":1"));
  EXPECT_THAT(text, HasSubstr("\"thermal_state\":\"Critical\""));
}

TEST_F(OfflineReplayTest, NamesALineWhoseChannelsAreWrong) {
  std::istringstream text("\n{\"device\": {\"channels\": [{\"channels\": []}]}}\n");
  std::string problem;
  const auto recording = Recording::read(text, requests::all(), json_, problem);
  ASSERT_TRUE(recording);
  EXPECT_THAT(OfflineReplay::problemWith(*recording, json_),
              AllOf(HasSubstr("line 2: channels: "), HasSubstr("driver")));
}

}  // namespace
}  // namespace tonewerk
