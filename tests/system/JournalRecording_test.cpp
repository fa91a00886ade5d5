// SPDX-License-Identifier: Apache-2.0
//
// Tests that the journal of a daemon, as a recording, gives the reports that the daemon itself gave.
#include <algorithm>
#include <filesystem>
#include <iterator>
#include <nlohmann/json.hpp>
#include <set>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr AudioServiceType kTelephony = 2;
constexpr AudioEventCategory kPlayback = 4;
constexpr const char* kUptime = "com.orvane.tonewerk.twreportingclientuptime";
// A slow machine takes long between the time of a request and that of its report.
constexpr double kLongestWork = 5.0;

// A row of a store: what it says, and the times in it.
struct Row {
  std::string what;
  std::vector<double> times;

  friend bool operator<(const Row& a, const Row& b) {
    return std::tie(a.what, a.times) < std::tie(b.what, b.times);
  }
};

// Takes the times out of `value`, and what the machine was doing meanwhile: a recovery does not know that.
void takeOut(json& value, std::vector<double>& times) {
  static const std::set<std::string> kTimes{"recorded_at", "posted_at", "sent_at",
                                            "started_at",  "seconds",   "twreporting_timestamp",
                                            "TimestampEnd"};
  static const std::set<std::string> kMachine{"load_avg_1_min",
                                              "load_avg_5_min",
                                              "load_avg_15_min",
                                              "vmInfo_phys_footprint_MiB",
                                              "thermal_state",
                                              "low_power_enabled",
                                              "kLinkReportSessionInfoHierarchyToken"};
  for (auto member = value.begin(); member != value.end();) {
    if (kTimes.count(member.key()) > 0) times.push_back(member.value());
    const bool isOut = kTimes.count(member.key()) + kMachine.count(member.key()) > 0;
    if (!isOut && member.value().is_object()) takeOut(member.value(), times);
    member = isOut ? value.erase(member) : std::next(member);
  }
}

// What the rows say that `rows` does not have. Both are sorted.
std::vector<std::string> missingIn(const std::vector<Row>& rows, const std::vector<Row>& wanted) {
  const auto textsOf = [](const std::vector<Row>& all) {
    std::vector<std::string> texts;
    texts.reserve(all.size());
    for (const Row& row : all) texts.push_back(row.what);
    return texts;
  };
  const std::vector<std::string> there = textsOf(rows);
  const std::vector<std::string> all = textsOf(wanted);
  std::vector<std::string> missing;
  std::set_difference(all.begin(), all.end(), there.begin(), there.end(), std::back_inserter(missing));
  return missing;
}

class JournalRecordingTest : public DaemonTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(
        daemon.writeConfiguration("preferences/com.orvane.tonewerk.store.toml", "journal_days = 1\n"));
    ASSERT_TRUE(daemon.start());
  }

  // Runs twctl on the state directory and returns what it prints; it must succeed.
  std::string twctl(const std::vector<std::string>& arguments, const std::string& state) const {
    const std::optional<std::string> output =
        outputOf({TONEWERK_TWCTL_PATH,
                  arguments,
                  {{"RUNTIME_DIRECTORY", daemon.path(DaemonProcess::kRuntime)},
                   {"STATE_DIRECTORY", state},
                   {"CONFIGURATION_DIRECTORY", daemon.path(DaemonProcess::kConfiguration)}}});
    EXPECT_TRUE(output) << arguments.front();
    return output.value_or("");
  }
  std::string ownState() const { return daemon.path(DaemonProcess::kState); }
  std::string recording() const { return made.path("recording.jsonl"); }
  // Makes a recording of the journal, and plays it into replayed().
  void recordAndReplay(const std::vector<std::string>& options = {}) {
    std::vector<std::string> words{"record", "-o", recording()};
    words.insert(words.end(), options.begin(), options.end());
    twctl(words, ownState());
    std::filesystem::create_directory(replayed());
    const std::string said =
        twctl({"replay", "--offline", "--json", recording(), "-o", replayed() + "/reports.db"}, ownState());
    EXPECT_THAT(said, HasSubstr("\"refused\":0"));
  }
  std::string replayed() const { return made.path("replayed"); }

  // The rows of one command of twctl, sorted; without the ends of connections, because the journal does not
  // have clients that only ask.
  std::vector<Row> rowsOf(const std::string& command, const std::string& state) const {
    std::vector<Row> rows;
    std::istringstream lines(twctl({command, "--json"}, state));
    for (std::string line; std::getline(lines, line);) {
      json value = json::parse(line);
      if (value.value("name", "") == kUptime) continue;
      value.erase("id");
      std::vector<double> times;
      takeOut(value, times);
      rows.push_back({value.dump(), times});
    }
    std::sort(rows.begin(), rows.end());
    return rows;
  }
  void expectSameReports(const std::vector<std::string>& commands) const {
    for (const std::string& command : commands) {
      SCOPED_TRACE(command);
      const std::vector<Row> own = rowsOf(command, ownState());
      const std::vector<Row> played = rowsOf(command, replayed());
      EXPECT_THAT(own, Not(IsEmpty()));
      EXPECT_THAT(missingIn(played, own), IsEmpty());
      EXPECT_THAT(missingIn(own, played), IsEmpty()) << "the daemon did not report this";
      if (HasFailure()) continue;
      for (std::size_t at = 0; at < own.size(); ++at) {
        ASSERT_EQ(played[at].times.size(), own[at].times.size()) << own[at].what;
        for (std::size_t time = 0; time < own[at].times.size(); ++time) {
          EXPECT_NEAR(played[at].times[time], own[at].times[time], kLongestWork) << own[at].what;
        }
      }
    }
  }

  // A player's session with several summaries, an issue and a power event. It is not stopped.
  void play(DaemonClient& client, ReporterID session, AudioServiceType service) const {
    client.create(session, service);
    client.setConfiguration(session, {{"HostApplicationDisplayID", "com.example.player"}});
    client.start(session);
    const auto say = [&](AudioEventCategory category, AudioEventType type, double at, ValueMap message) {
      message.set("twreporting_timestamp", kBegin + at);
      client.send(message, category, type, {session});
    };
    say(kPlayback, kTypeStart, 0.0,
        {{"session_output_running", true}, {"QMSessionVolume", 0.25}, {"active_devices", "Speaker"}});
    say(kPlayback, kTypeGeneric, 10.0, {{"QMSessionVolume", 0.75}});
    say(kPlayback, kTypeGeneric, 10.0, {{"QMSessionVolume", 0.75}});  // redundant
    say(kPlayback, kTypeStop, 60.0, {{"session_output_running", false}});
  }

  static constexpr double kBegin = 1'795'000'000.0;
  const TemporaryDirectory made;
};

TEST_F(JournalRecordingTest, TheReplayGivesTheReportsOfADaemonThatEndedInOrder) {
  {
    DaemonClient player = connect();
    DaemonClient phone = connect();
    play(player, kSession, kLongFormAudio);
    play(phone, kSession + 1, kTelephony);
    phone.send({{"number", 1}}, kPlayback, kTypeStart, {});  // to all sessions
    player.stop(kSession);
    player.destroy(kSession);
    phone.stop(kSession + 1);
    phone.send({{"number", 2}}, kPlayback, kTypeStart, {});  // to none
  }
  const std::string example = TONEWERK_EXAMPLES_DIRECTORY "/every-sink.jsonl";
  twctl({"replay", "--speed", "max", example}, ownState());
  ASSERT_EQ(daemon.stop(), 0);
  recordAndReplay();
  expectSameReports({"events", "metrics", "power", "rtc"});
  EXPECT_THAT(RecordedEvents(replayed() + "/reports.db").named(kUptime), SizeIs(3));
}

TEST_F(JournalRecordingTest, TheReplayGivesTheReportsThatARecoveryGave) {
  {
    DaemonClient player = connect();
    DaemonClient other = connect();
    play(player, kSession, kLongFormAudio);
    other.send({{"number", 1}}, kPlayback, kTypeStart, {});
    play(other, kSession + 1, kTelephony);
    daemon.process().kill();
    daemon.process().wait();
  }
  // Before the next daemon has recovered them.
  recordAndReplay();
  ASSERT_TRUE(daemon.start());
  EXPECT_THAT(connect().allReporters(), IsEmpty());
  ASSERT_EQ(daemon.stop(), 0);
  expectSameReports({"events"});
}

TEST_F(JournalRecordingTest, TheReplayGivesTheReportsOfADaemonThatWasKilledAndOfTheNext) {
  {
    DaemonClient player = connect();
    play(player, kSession, kLongFormAudio);
    player.send({{"number", 1}}, kPlayback, kTypeStart, {});
    player.stop(kSession);
    player.send({{"number", 1}}, kPlayback, kTypeStart, {});  // in the session of single messages
    play(player, kSession + 1, kTelephony);
    daemon.process().kill();
    daemon.process().wait();
  }
  ASSERT_TRUE(daemon.start());
  {
    DaemonClient player = connect();
    EXPECT_THAT(player.allReporters(), IsEmpty());
    player.send({{"number", 1}}, kPlayback, kTypeStart, {});  // in another session, so it is not redundant
    play(player, kSession, kLongFormAudio);
  }
  ASSERT_EQ(daemon.stop(), 0);
  recordAndReplay();
  expectSameReports({"events"});
}

TEST_F(JournalRecordingTest, OneSessionTellsItsReasons) {
  {
    DaemonClient player = connect();
    play(player, kSession, kLongFormAudio);
    player.stop(kSession);
    // Another life of the same session, which is not asked for.
    player.start(kSession);
    player.send({{"number", 1}}, kPlayback, kTypeStart, {kSession});
    player.stop(kSession);
  }
  ASSERT_EQ(daemon.stop(), 0);
  const std::string story = twctl({"session", "1"}, ownState());
  EXPECT_THAT(story,
              HasSubstr("Playback Generic: redundant, it repeats message 2 in everything but its times\n"));
  EXPECT_THAT(story,
              HasSubstr("10 s  QMSessionVolume changed from 0.25 to 0.75 (message 2) -> Volume Summary 1 "
                        "of 2, event "));
  EXPECT_THAT(story, HasSubstr("50 s  output stopped (message 4) -> Volume Summary 2 of 2, event "));
  EXPECT_THAT(story, Not(HasSubstr("number=1")));
  EXPECT_THAT(twctl({"explain", "--session", "1", "--missing", "input"}, ownState()),
              HasSubstr("none: no message said that input began (session_input_running)\n"));
  const std::string equal = twctl({"explain", "--json", "--session", "1", "--message", "3"}, ownState());
  EXPECT_THAT(equal, HasSubstr(R"("number":2,)"));
  EXPECT_THAT(equal, HasSubstr(R"("number":3,)"));
  EXPECT_THAT(equal, Not(HasSubstr(R"("number":1,)")));
  constexpr const char* kSummary = "Volume Summary 1 of 2, event ";
  const std::size_t event = story.find(kSummary) + std::string_view(kSummary).size();
  EXPECT_THAT(twctl({"explain", story.substr(event, story.find(';', event) - event)}, ownState()),
              HasSubstr("A stretch of output gave it, because it was longer than 0.5 s:\n"));
  EXPECT_THAT(twctl({"session", "2"}, ownState()), HasSubstr("Playback Start: number=1\n"));
}

TEST_F(JournalRecordingTest, ASessionThatTheJournalNoLongerHasTellsWhatWouldKeepIt) {
  DaemonClient player = connect();
  play(player, kSession, kLongFormAudio);
  ASSERT_EQ(daemon.stop(), 0);
  for (const auto& segment : std::filesystem::directory_iterator(ownState() + "/journal"))
    std::filesystem::remove(segment);
  EXPECT_THAT(twctl({"session", "1"}, ownState()),
              HasSubstr("The reasons are not known: the journal no longer has its requests, which the "
                        "preference journal_days of com.orvane.tonewerk.store lets it keep.\n"));
}

TEST_F(JournalRecordingTest, OneSessionGivesItsReports) {
  constexpr const char* kSummaries = "com.orvane.longformaudio.Volume.Summary";
  {
    DaemonClient player = connect();
    DaemonClient other = connect();
    play(other, kSession + 1, kTelephony);
    play(player, kSession, kLongFormAudio);
    other.send({{"number", 1}}, kPlayback, kTypeStart, {});
    player.stop(kSession);
    other.send({{"number", 2}}, kPlayback, kTypeStart, {});
  }
  ASSERT_EQ(daemon.stop(), 0);
  recordAndReplay({"--session", std::to_string(kSession)});
  const RecordedEvents own(daemon.storePath());
  const RecordedEvents played(replayed() + "/reports.db");
  const auto summaries = [&](const RecordedEvents& events) {
    std::vector<json> found = events.named(kSummaries);
    for (json& summary : found) summary.erase("twreporting_timestamp");
    return found;
  };
  EXPECT_THAT(summaries(own), SizeIs(2));
  EXPECT_EQ(summaries(played), summaries(own));
  std::vector<int> numbers;
  for (const json& start : played.named("com.orvane.longformaudio.Playback.Start")) {
    if (start.contains("number")) numbers.push_back(start.at("number"));
  }
  EXPECT_THAT(numbers, ::testing::ElementsAre(1)) << "the message of another client to all sessions";
  EXPECT_THAT(played.named("com.orvane.telephony.Volume.Summary"), IsEmpty());
}

TEST_F(JournalRecordingTest, ARunningDaemonIsRecordedToo) {
  DaemonClient player = connect();
  play(player, kSession, kLongFormAudio);
  recordAndReplay();
  EXPECT_THAT(RecordedEvents(replayed() + "/reports.db").named("com.orvane.longformaudio.Volume.Summary"),
              SizeIs(2));
  EXPECT_EQ(logLinesWith("journal"), 0U);
  player.stop(kSession);
  EXPECT_TRUE(waitUntil([&] {
    return RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.Volume.Summary").size() == 2;
  }));
}

}  // namespace
}  // namespace tonewerk
