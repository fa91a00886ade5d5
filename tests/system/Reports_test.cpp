// SPDX-License-Identifier: Apache-2.0
//
// Tests the reports of clients' messages: events in the store, and summary files.
#include <algorithm>
#include <chrono>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <numeric>
#include <string>
#include <vector>

#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr AudioEventCategory kPlayback = 4;
constexpr AudioEventType kActivate = 3;
constexpr AudioEventType kDeactivate = 4;

double now() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

class ReportsTest : public RunningDaemonTest {
 protected:
  RecordedEvents recorded() const { return RecordedEvents(daemon.storePath()); }

  bool waitForEvents(const std::string& name, std::size_t count) const {
    return waitUntil([&] { return recorded().named(name).size() >= count; });
  }

  // The paths of everything in the directory of the summary files, sorted.
  std::vector<std::filesystem::path> filesInReporting() const {
    std::vector<std::filesystem::path> found;
    std::error_code error;
    const std::filesystem::directory_iterator all(daemon.path(DaemonProcess::kLogs, "Audio/Reporting"),
                                                  error);
    if (!error) {
      for (const auto& entry : all) found.push_back(entry.path());
    }
    std::sort(found.begin(), found.end());
    return found;
  }
  // The paths of all summary files.
  std::vector<std::filesystem::path> summaryFiles() const {
    std::vector<std::filesystem::path> found = filesInReporting();
    std::erase_if(found, [](const auto& path) { return path.extension() != ".json"; });
    return found;
  }
  std::vector<std::filesystem::path> unfinishedFiles() const {
    std::vector<std::filesystem::path> found = filesInReporting();
    std::erase_if(found, [](const auto& path) { return path.extension() == ".json"; });
    return found;
  }
  static json contentsOf(const std::filesystem::path& path) {
    std::ifstream stream(path);
    return json::parse(stream, nullptr, false);
  }

  // Waits for the only summary file. It is complete as soon as it exists.
  json summaryFile() const {
    json file;
    EXPECT_TRUE(waitUntil([&] {
      const auto paths = summaryFiles();
      if (paths.size() != 1) return false;
      file = contentsOf(paths.front());
      return true;
    }));
    return file;
  }

  // Sends a minute of playback that ended just now: ten seconds quiet, twenty loud.
  void play(DaemonClient& client, ReporterID reporterID) {
    const double begin = now() - 60.0;
    const auto say = [&](AudioEventType type, double at, ValueMap message) {
      message.set("twreporting_timestamp", begin + at);
      client.send(message, kPlayback, type, {reporterID});
    };
    say(kTypeStart, 0.0,
        {{"session_output_running", true}, {"QMSessionVolume", 0.25}, {"active_devices", "Speaker"}});
    say(kTypeGeneric, 10.0, {{"QMSessionVolume", 0.75}});
    say(kTypeStop, 30.0, {{"session_output_running", false}});
  }
};

TEST_F(ReportsTest, AMessageIsRecordedUnderBothItsNamesWithItsPayload) {
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.setConfiguration(kSession, {{"HostApplicationDisplayID", "com.example.player"}});
  client.start(kSession);
  const double before = now();
  client.send({{"truth", true},
               {"whole", -5},
               {"large", UINT64_MAX},
               {"fraction", 0.5},
               {"two words", "grüezi \"you\"\n"},
               {"when", Date{0.5}},
               {"list", ValueArray({1, "b", ValueMap{{"c", 2.0}}})}},
              kPlayback, kTypeStart, {kSession});
  for (const char* name : {"com.orvane.tonewerk.Playback.Start", "com.orvane.longformaudio.Playback.Start"}) {
    SCOPED_TRACE(name);
    ASSERT_TRUE(waitForEvents(name, 1));
    const json payload = recorded().named(name).at(0);
    EXPECT_EQ(payload.at("truth"), true);
    EXPECT_EQ(payload.at("whole"), -5);
    EXPECT_EQ(payload.at("large"), UINT64_MAX);
    EXPECT_EQ(payload.at("fraction"), 0.5);
    EXPECT_EQ(payload.at("two_words"), "grüezi \"you\"\n");
    EXPECT_EQ(payload.at("when"), "1970-01-01T00:00:00.5Z");
    EXPECT_EQ(payload.at("list"), json::parse(R"([1, "b", {"c": 2.0}])"));
    EXPECT_EQ(payload.at("audiotag"), "PlaybackStart");
    EXPECT_EQ(payload.at("HostApplicationDisplayID"), "com.example.player");
    EXPECT_GE(payload.at("twreporting_timestamp").get<double>(), before);
  }
}

TEST_F(ReportsTest, AScriptedPlaybackBecomesVolumeSummariesWithItsFigures) {
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.setConfiguration(kSession, {{"HostApplicationDisplayID", "com.example.player"}});
  client.start(kSession);
  play(client, kSession);
  client.stop(kSession);

  for (const char* name : {"com.orvane.tonewerk.Volume.Summary", "com.orvane.longformaudio.Volume.Summary"}) {
    SCOPED_TRACE(name);
    ASSERT_TRUE(waitForEvents(name, 2));
    const std::vector<json> summaries = recorded().named(name);
    ASSERT_THAT(summaries, SizeIs(2));
    EXPECT_EQ(summaries[0].at("play_seconds"), 10.0);
    EXPECT_EQ(summaries[0].at("QMSessionVolume"), 0.25);
    EXPECT_EQ(summaries[0].at("QMSessionVolumeBucketed"), "0.25");
    EXPECT_EQ(summaries[0].at("msgidx"), 1);
    EXPECT_EQ(summaries[1].at("play_seconds"), 20.0);
    EXPECT_EQ(summaries[1].at("QMSessionVolume"), 0.75);
    EXPECT_EQ(summaries[1].at("QMSessionVolumeBucketed"), "0.75");
    EXPECT_EQ(summaries[1].at("msgidx"), 2);
    for (const json& summary : summaries) {
      EXPECT_EQ(summary.at("msgcnt"), 2);
      EXPECT_EQ(summary.at("active_devices"), "Speaker");
      EXPECT_EQ(summary.at("HostApplicationDisplayID"), "com.example.player");
    }
  }
}

TEST_F(ReportsTest, ASessionsEndIsSummedUp) {
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  client.send({{"a", 1}}, kPlayback, kTypeStart, {kSession});
  client.send({{"a", 1}}, kPlayback, kTypeStart, {kSession});  // repeats the message before it
  client.send({{"session_duration", 12.5}}, kPlayback, kTypeStop, {kSession});
  client.send({{"issue_type", "overload"}}, 1, kTypeGeneric, {kSession});
  client.stop(kSession);
  const char* name = "com.orvane.tonewerk.Session_Generic.Summary";
  ASSERT_TRUE(waitForEvents(name, 1)) << ::testing::PrintToString(recorded().names());
  const json summary = recorded().named(name).at(0);
  EXPECT_EQ(summary.at("total_active_time"), 12.5);
  EXPECT_EQ(summary.at("active_count"), 1);
  EXPECT_EQ(summary.at("overload_count"), 1);
  EXPECT_EQ(summary.at("num_messages"), 4);
  EXPECT_EQ(summary.at("num_unique_messages"),
            5);  // with the start and the stop, without the repeated one
  EXPECT_EQ(summary.at("singleMessageSession"), false);
  EXPECT_EQ(summary.at("summaryServiceName"), "longformaudio");
}

TEST_F(ReportsTest, ASummaryNamesTheClientsProcessUnlessTheServiceTypeWasChanged) {
  DaemonClient client = connect();
  client.create(kSession);
  client.start(kSession);
  client.stop(kSession);
  client.create(5, kLongFormAudio);
  client.start(5);
  client.stop(5);
  ASSERT_TRUE(waitForEvents("com.orvane.longformaudio.Session_Generic.Summary", 1));
  const std::vector<json> named = recorded().named("com.orvane.unknown.Session_Generic.Summary");
  ASSERT_THAT(named, SizeIs(1));
  std::ifstream comm("/proc/self/comm");
  std::string ownName;
  std::getline(comm, ownName);
  EXPECT_EQ(named.at(0).at("clientProcessName"), ownName);
  EXPECT_FALSE(recorded()
                   .named("com.orvane.longformaudio.Session_Generic.Summary")
                   .at(0)
                   .contains("clientProcessName"));
}

TEST_F(ReportsTest, AMessageWithoutIdentifiersGoesToEveryStartedSessionOfEveryClient) {
  DaemonClient first = connect();
  DaemonClient second = connect();
  first.create(kSession, kLongFormAudio);
  first.start(kSession);
  second.create(5, 3);
  second.start(5);
  second.create(6, 2);
  second.send({{"to", "all"}}, kPlayback, kActivate, {});
  ASSERT_TRUE(waitForEvents("com.orvane.haptics.Playback.Activate", 1));
  EXPECT_THAT(recorded().named("com.orvane.longformaudio.Playback.Activate"), SizeIs(1));
  EXPECT_THAT(recorded().named("com.orvane.telephony.Playback.Activate"), IsEmpty());
  EXPECT_EQ(logLinesWith("Creating singleMessageSession"), 0U);
}

TEST_F(ReportsTest, AMessageWithoutAnySessionMakesOneThatIsStoppedAfterFiveQuietSeconds) {
  DaemonClient client = connect();
  client.send({{"alone", 1}}, kPlayback, kActivate, {});
  client.send({{"alone", 2}}, kPlayback, kActivate, {});
  ASSERT_TRUE(waitForEvents("com.orvane.standalone.Playback.Activate", 2));
  EXPECT_EQ(logLinesWith("Creating singleMessageSession"), 1U);
  EXPECT_THAT(client.allReporters(), IsEmpty());
  EXPECT_FALSE(
      recorded().named("com.orvane.standalone.Playback.Activate").at(0).contains("sendSingleMessage"));
  EXPECT_TRUE(waitForLogLine("Stopping singleMessageSession after timeout=5"));
}

TEST_F(ReportsTest, AClientThatGoesIsReportedWithItsSessions) {
  {
    DaemonClient client = connect();
    client.create(kSession, kLongFormAudio);
    client.start(kSession);
    play(client, kSession);
  }
  EXPECT_TRUE(waitForEvents("com.orvane.longformaudio.Volume.Summary", 2));
  EXPECT_TRUE(waitForEvents("com.orvane.longformaudio.Session_Generic.Summary", 1));
  const char* uptime = "com.orvane.tonewerk.twreportingclientuptime";
  ASSERT_TRUE(waitForEvents(uptime, 1));
  for (const json& event : recorded().named(uptime)) {
    EXPECT_TRUE(event.at("processName").is_string());
    EXPECT_GE(event.at("seconds").get<double>(), 0.0);
  }
}

TEST_F(ReportsTest, OnlyEventsThatSomebodyAskedForAreRecorded) {
  ASSERT_EQ(daemon.stop(), 0);
  ASSERT_TRUE(
      daemon.writeConfiguration("preferences/com.orvane.metricon.toml",
                                "[[consumers]]\nname = \"calls\"\nevents = [\"com.orvane.*.Volume.*\"]\n"));
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  play(client, kSession);
  client.stop(kSession);
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(recorded().named("com.orvane.longformaudio.Volume.Summary"), SizeIs(2));
  EXPECT_THAT(recorded().named("com.orvane.longformaudio.Playback.Start"), IsEmpty());
}

TEST_F(ReportsTest, ASummaryFileIsWrittenForATestSessionAlone) {
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  client.send({{"a", 1}}, kPlayback, kTypeStart, {kSession});
  client.stop(kSession);
  client.create(5, 11);
  client.start(5);
  client.send({{"a", 1}}, kPlayback, kTypeStart, {5});
  client.stop(5);
  const json file = summaryFile();
  EXPECT_FALSE(file.empty());
  ASSERT_THAT(summaryFiles(), SizeIs(1));
  EXPECT_THAT(summaryFiles().front().string(), EndsWith("-5-Unknown-test.json"));
}

// Several stops within one second once left only the file of the last one.
TEST_F(ReportsTest, StopsWithinOneSecondLeaveAWholeFileEach) {
  constexpr int kRuns = 20;  // in far fewer seconds
  DaemonClient client = connect();
  client.create(5, 11);
  for (int run = 0; run < kRuns; ++run) {
    client.start(5);
    client.send({{"run", run}}, kPlayback, kTypeStart, {5});
    client.stop(5);
  }
  ASSERT_TRUE(waitUntil([&] { return summaryFiles().size() >= kRuns; })) << summaryFiles().size();
  std::vector<int> runs;
  bool isAnyNumbered = false;
  for (const auto& path : summaryFiles()) {
    const json file = contentsOf(path);
    ASSERT_TRUE(file.is_array()) << path;
    for (const json& entry : file) {
      if (entry.contains("Playback_Start_1")) runs.push_back(entry["Playback_Start_1"].at("run").get<int>());
    }
    isAnyNumbered = isAnyNumbered || path.string().ends_with("-5-Unknown-test-2.json");
  }
  std::sort(runs.begin(), runs.end());
  std::vector<int> all(kRuns);
  std::iota(all.begin(), all.end(), 0);
  EXPECT_EQ(runs, all);
  EXPECT_TRUE(isAnyNumbered);
  EXPECT_THAT(unfinishedFiles(), IsEmpty());
}

TEST_F(ReportsTest, AnEntryThatJsonCannotSayLeavesTheFileValid) {
  DaemonClient client = connect();
  client.create(5, 11);
  client.start(5);
  client.send({{"n", 1}}, kPlayback, kTypeStart, {5});
  client.send({{"n", std::nan("")}}, kPlayback, kTypeGeneric, {5});
  client.send({{"n", 3}}, kPlayback, kTypeStop, {5});
  client.stop(5);
  const json file = summaryFile();
  ASSERT_TRUE(file.is_array());
  std::vector<std::string> names;
  for (const json& entry : file) names.push_back(entry.begin().key());
  EXPECT_THAT(names, Contains("Playback_Start_1"));
  EXPECT_THAT(names, Contains("Playback_Stop_1"));
  EXPECT_THAT(names, Not(Contains("Playback_Generic_1")));
  EXPECT_THAT(textOfFile(summaryFiles().front()), HasSubstr("\n}\n\n,\n{\n"));
  EXPECT_TRUE(waitForLogLine("dataWithJSONObject: "));
}

// Such a death once left half a file under its final name.
TEST_F(ReportsTest, ADaemonThatIsKilledWhileItWritesAFileLeavesNoHalfOne) {
  DaemonClient client = connect();
  client.create(5, 11);
  client.start(5);
  std::string text(std::size_t{900} << 10, 'x');
  for (int n = 0; n < 60; ++n) client.send({{"n", n}, {"text", text}}, kPlayback, kTypeStart, {5});
  client.stop(5);
  ASSERT_TRUE(waitUntil([&] {
    const auto unfinished = unfinishedFiles();
    std::error_code error;
    return !unfinished.empty() && std::filesystem::file_size(unfinished.front(), error) > text.size();
  }));
  daemon.process().kill();
  ASSERT_THAT(unfinishedFiles(), SizeIs(1)) << "it was not killed in the midst of it";
  EXPECT_THAT(summaryFiles(), IsEmpty());

  ASSERT_TRUE(daemon.start());
  DaemonClient next = connect();
  next.create(6, 11);
  next.start(6);
  next.stop(6);
  // That of the session that the daemon was killed in, from its journal, and that of the next one.
  EXPECT_TRUE(waitUntil([&] { return summaryFiles().size() == 2; }));
  for (const auto& path : summaryFiles()) EXPECT_TRUE(contentsOf(path).is_array()) << path;
  EXPECT_THAT(unfinishedFiles(), IsEmpty());
}

class InternalBuildReportsTest : public ReportsTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n"));
    ReportsTest::SetUp();
  }
};

TEST_F(InternalBuildReportsTest, ASummaryFileHoldsTheSessionsMessagesInTheOrderOfTheirTimes) {
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.setConfiguration(kSession, {{"HostApplicationDisplayID", "com.example.player"}});
  client.send({{"early", 1}, {"twreporting_timestamp", now() - 90.0}}, kPlayback, kTypeStart, {kSession});
  client.start(kSession);
  play(client, kSession);
  client.send({{"late", 1}, {"twreporting_timestamp", now() - 80.0}}, 1, kTypeGeneric, {kSession});
  client.stop(kSession);

  const json file = summaryFile();
  ASSERT_TRUE(file.is_array());
  std::vector<std::string> names;
  std::vector<std::string> started;
  for (const json& entry : file) {
    ASSERT_THAT(entry, SizeIs(1));
    names.push_back(entry.begin().key());
    started.push_back(entry.begin()->at("isSessionStarted"));
  }
  EXPECT_THAT(names, ElementsAre("Playback_Start_1", "Generic_Generic_1", "Playback_Start_2",
                                 "Playback_Generic_1", "Playback_Stop_1", "Setup_Start_1", "Setup_Stop_1",
                                 "Volume_Summary_1", "Volume_Summary_2", "Session_Generic_Summary_1"));
  EXPECT_THAT(started, ElementsAre("NO", "YES", "YES", "YES", "YES", "NO", "NO", "YES", "YES", "YES"));
  EXPECT_EQ(file.at(7).at("Volume_Summary_1").at("play_seconds"), 10.0);
  ASSERT_THAT(summaryFiles(), SizeIs(1));
  EXPECT_THAT(summaryFiles().front().string(), EndsWith("-77-com.example.player-longformaudio.json"));
}

TEST_F(InternalBuildReportsTest, AMessageWithoutIdentifiersIsMarked) {
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  client.send({{"to", "all"}}, kPlayback, kActivate, {});
  client.send({{"to", "one"}}, kPlayback, kDeactivate, {kSession});
  ASSERT_TRUE(waitForEvents("com.orvane.longformaudio.Playback.Deactivate", 1));
  EXPECT_EQ(recorded().named("com.orvane.longformaudio.Playback.Activate").at(0).at("sendSingleMessage"),
            true);
  EXPECT_FALSE(
      recorded().named("com.orvane.longformaudio.Playback.Deactivate").at(0).contains("sendSingleMessage"));
}

TEST_F(InternalBuildReportsTest, NamesThatLeaveTheDirectoryMakeNoFile) {
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.setConfiguration(kSession, {{"HostApplicationDisplayID", "/../../../escaped"}});
  client.start(kSession);
  client.send({{"a", 1}}, kPlayback, kTypeStart, {kSession});
  client.stop(kSession);
  EXPECT_TRUE(waitForLogLine("SummaryJsonFileWorker failed to open file"));
  EXPECT_THAT(summaryFiles(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
