// SPDX-License-Identifier: Apache-2.0
//
// Tests the command-line tool as a program, with a running daemon.
#include <filesystem>
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::Eq;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr int kDone = 0;
constexpr int kRefused = 1;
constexpr int kWrongUsage = 2;
constexpr int kNoDaemon = 3;
constexpr ReporterID kSession = 77;

class TwctlTest : public RunningDaemonTest {
 protected:
  // Runs the tool to its end with the daemon's directories and returns its exit status. Fills `output` and
  // `errors`.
  std::optional<int> run(const std::vector<std::string>& arguments) {
    const TemporaryDirectory directory;
    ChildProcess process;
    if (!process.start(command(arguments), directory.path("output"), directory.path("errors"))) return {};
    const std::optional<int> status = process.wait();
    output = textOfFile(directory.path("output"));
    errors = textOfFile(directory.path("errors"));
    expectNoSanitizerReport(errors);
    return status;
  }

  ChildCommand command(const std::vector<std::string>& arguments) const {
    return {TONEWERK_TWCTL_PATH,
            arguments,
            {{"RUNTIME_DIRECTORY", daemon.path(DaemonProcess::kRuntime)},
             {"STATE_DIRECTORY", daemon.path(DaemonProcess::kState)},
             {"CONFIGURATION_DIRECTORY", daemon.path(DaemonProcess::kConfiguration)}}};
  }

  // Parses one JSON object per line.
  static std::vector<json> objects(const std::string& text) {
    std::vector<json> found;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) found.push_back(json::parse(line, nullptr, false));
    return found;
  }

  bool waitForEvents(const std::string& name, std::size_t count) const {
    return waitUntil([&] { return RecordedEvents(daemon.storePath()).named(name).size() >= count; });
  }

  static std::string example(const std::string& name) { return TONEWERK_EXAMPLES_DIRECTORY "/" + name; }

  std::string output;
  std::string errors;
};

TEST_F(TwctlTest, EveryCommandHelps) {
  const std::vector<std::string> commands{
      "list",   "validate",  "send",     "replay", "record",   "top",    "tail",
      "events", "metrics",   "power",    "rtc",    "defaults", "notify", "captures",
      "drafts", "whirlcaps", "channels", "paths",  "kill",     "status", "doctor"};
  EXPECT_EQ(run({"--help"}), kDone);
  for (const std::string& name : commands) {
    SCOPED_TRACE(name);
    EXPECT_THAT(output, HasSubstr("\n  " + name + " "));
  }
  for (const std::string& name : commands) {
    SCOPED_TRACE(name);
    EXPECT_EQ(run({name, "--help"}), kDone);
    EXPECT_THAT(output, AllOf(HasSubstr("Usage: twctl " + name), HasSubstr("--json")));
    EXPECT_EQ(errors, "");
  }
  EXPECT_EQ(run({"--version"}), kDone);
  EXPECT_THAT(output, HasSubstr("twctl"));
}

TEST_F(TwctlTest, WrongUsageIsStatusTwo) {
  const std::vector<std::vector<std::string>> wrong = {
      {"lists"},
      {"list", "extra"},
      {"validate"},
      {"validate", "seven"},
      {"validate", "9223372036854775808"},
      {"send", "--category", "Playback"},
      {"send", "--category", "Nothing", "--type", "Start", "a=1"},
      {"send", "--category", "Playback", "--type", "65536", "a=1"},
      {"send", "--category", "Playback", "--type", "Start", "no value"},
      {"send", "--category", "Playback", "--type", "Start", "--payload", "[1]"},
      {"replay"},
      {"events", "--since", "someday"},
      {"events", "--limit", "0"},
      {"defaults"},
      {"defaults", "write", "org.example", "key"},
      {"notify", "post", "org.example", "loud"},
  };
  for (const std::vector<std::string>& arguments : wrong) {
    EXPECT_EQ(run(arguments), kWrongUsage) << ::testing::PrintToString(arguments);
    EXPECT_EQ(output, "");
    EXPECT_NE(errors, "");
  }
}

TEST_F(TwctlTest, SessionsAreListedForPeopleAndForPrograms) {
  EXPECT_EQ(run({"list", "--json"}), kDone);
  EXPECT_EQ(output, "");
  DaemonClient client = connect();
  client.create(kSession, 7);
  client.create(-5);
  EXPECT_EQ(run({"list", "--json"}), kDone);
  EXPECT_THAT(
      objects(output),
      ElementsAre(json{{"reporterID", -5}, {"serviceType", 65'535}, {"serviceName", "unknown"}},
                  json{{"reporterID", kSession}, {"serviceType", 7}, {"serviceName", "longformaudio"}}));
  EXPECT_EQ(run({"list"}), kDone);
  EXPECT_THAT(output, AllOf(StartsWith("reporterID"), HasSubstr("\n77 "), HasSubstr("longformaudio\n")));
}

TEST_F(TwctlTest, AnIdentifierIsValidWhileItsSessionIsThere) {
  DaemonClient client = connect();
  client.create(kSession, 7);
  EXPECT_EQ(run({"validate", "--json", "77"}), kDone);
  EXPECT_THAT(
      objects(output),
      ElementsAre(json{{"reporterID", kSession}, {"serviceType", 7}, {"serviceName", "longformaudio"}}));
  EXPECT_EQ(run({"validate", "78"}), kRefused);
  EXPECT_EQ(output, "");
  EXPECT_EQ(run({"validate", "0"}), kRefused);
  EXPECT_EQ(run({"validate", "9223372036854775807"}), kRefused);
  EXPECT_EQ(run({"validate", "-5"}), kRefused);
  client.destroy(kSession);
  EXPECT_EQ(run({"validate", "77"}), kRefused);
}

TEST_F(TwctlTest, AMessageReachesTheSessionsNamedOrElseAllStarted) {
  DaemonClient client = connect();
  client.create(kSession, 7);
  client.start(kSession);
  client.create(78, 3);
  EXPECT_EQ(run({"send", "--id", "77", "--id", "78", "--category", "Playback", "--type", "Start",
                 "quiet=false", "volume=0.5", "count=-3", "name=a b=c"}),
            kDone);
  EXPECT_EQ(run({"send", "--category", "HAL_Playback", "--type", "3", "--payload",
                 R"({"list": [1, {"a": true}]})"}),
            kDone);
  const char* sent = "com.orvane.longformaudio.Playback.Start";
  ASSERT_TRUE(waitForEvents(sent, 1));
  const json message = RecordedEvents(daemon.storePath()).named(sent).at(0);
  EXPECT_EQ(message.at("quiet"), false);
  EXPECT_EQ(message.at("volume"), 0.5);
  EXPECT_EQ(message.at("count"), -3);
  EXPECT_EQ(message.at("name"), "a b=c");
  const char* toAll = "com.orvane.longformaudio.HAL_Playback.Activate";
  ASSERT_TRUE(waitForEvents(toAll, 1));
  EXPECT_EQ(RecordedEvents(daemon.storePath()).named(toAll).at(0).at("list"),
            json::parse(R"([1, {"a": true}])"));
  EXPECT_THAT(RecordedEvents(daemon.storePath()).named("com.orvane.haptics.HAL_Playback.Activate"),
              IsEmpty());
}

TEST_F(TwctlTest, AMessageForAnIdentifierThatNobodyHasIsSentToNone) {
  DaemonClient client = connect();
  client.create(kSession, 7);
  client.start(kSession);
  EXPECT_EQ(run({"send", "--id", "77", "--id", "79", "--category", "Playback", "--type", "Start", "n=1"}),
            kRefused);
  EXPECT_EQ(errors, "twctl: no session has the identifier 79; the message was sent to none\n");
  EXPECT_EQ(run({"send", "--id", "77", "--category", "Playback", "--type", "Start", "n=2"}), kDone);
  const char* sent = "com.orvane.longformaudio.Playback.Start";
  ASSERT_TRUE(waitForEvents(sent, 1));
  EXPECT_EQ(RecordedEvents(daemon.storePath()).named(sent).at(0).at("n"), 2);
}

// Each command that only reads once left an event with the duration of its connection.
TEST_F(TwctlTest, LookingLeavesNoEventBehindAndSendingDoes) {
  DaemonClient client = connect();
  client.create(kSession, 7);
  client.start(kSession);
  EXPECT_EQ(run({"list"}), kDone);
  EXPECT_EQ(run({"validate", "77"}), kDone);
  EXPECT_EQ(run({"top", "--json", "--interval", "0.05"}), kDone);
  EXPECT_EQ(run({"send", "--category", "Playback", "--type", "Start", "n=1"}), kDone);
  // The connections that waited for the daemon to listen have left such events too.
  const auto visits = [this] {
    const char* uptime = "com.orvane.tonewerk.twreportingclientuptime";
    std::vector<json> events = RecordedEvents(daemon.storePath()).named(uptime);
    std::erase_if(events, [](const json& event) { return event.value("processName", "") != "twctl"; });
    return events;
  };
  ASSERT_TRUE(waitUntil([&] { return !visits().empty(); }));
  EXPECT_THAT(visits(), SizeIs(1));  // events of earlier connections would come before it
}

TEST_F(TwctlTest, TheStoreIsWherePathsSays) {
  EXPECT_EQ(run({"paths", "store"}), kDone);
  EXPECT_EQ(output, daemon.storePath() + "\n");
  EXPECT_EQ(run({"paths", "socket"}), kDone);
  EXPECT_THAT(output, StartsWith(daemon.socketPath() + "\n"));
}

TEST_F(TwctlTest, WhatTheHapticsEngineReportsIsInThePowerLog) {
  DaemonClient client = connect();
  client.create(kSession, 3);
  ASSERT_EQ(run({"send", "--id", "77", "--category", "Generic", "--type", "Energybook", "EngineOnTime=2.5",
                 "EngineState=EngineOn"}),
            kDone);
  ASSERT_TRUE(waitUntil([&] { return run({"power", "--json"}) == kDone && objects(output).size() == 2; }));
  const std::vector<json> events = objects(output);
  EXPECT_EQ(events[0].at("event_group"), 28);
  EXPECT_EQ(events[0].at("name"), "Flumen_Haptics_EngineOnDuration");
  EXPECT_EQ(events[0].at("payload").at("EngineOnDuration"), 2.5);
  EXPECT_EQ(events[1].at("name"), "Flumen_Haptics_ClientStatus");
  EXPECT_EQ(events[1].at("payload").at("Status"), true);
  EXPECT_EQ(run({"power", "--totals", "--json"}), kDone);
  EXPECT_THAT(objects(output),
              ElementsAre(json{{"ApplicationName", nullptr}, {"EngineOnDuration", 2.5}, {"events", 1}}));
}

TEST_F(TwctlTest, AMessageThatNoFrameCarriesIsRefused) {
  // A value of 900 KB fits into a frame, and not into the arguments of a program.
  const std::string deep = std::string(40, '[') + std::string(40, ']');
  EXPECT_EQ(run({"send", "--category", "1", "--type", "0", "--payload", "{\"deep\": " + deep + "}"}),
            kRefused);
  EXPECT_EQ(run({"send", "--category", "1", "--type", "0", "--payload", R"({"nothing": null})"}),
            kWrongUsage);
}

TEST_F(TwctlTest, TheExamplesArePlayedAndRecorded) {
  EXPECT_EQ(run({"replay", example("music-session.jsonl")}), kDone) << errors;
  const char* name = "com.orvane.longformaudio.Volume.Summary";
  ASSERT_TRUE(waitForEvents(name, 3));
  const std::vector<json> summaries = RecordedEvents(daemon.storePath()).named(name);
  ASSERT_THAT(summaries, SizeIs(3));
  // Two seconds at 0.5, two at 0.8, one and a half on headphones. Played in real time on a machine that may
  // be busy.
  const std::vector<double> seconds{2.0, 2.0, 1.5};
  const std::vector<double> volumes{0.5, 0.8, 0.8};
  const std::vector<std::string> devices{"Speaker", "Speaker", "Headphones"};
  for (std::size_t at = 0; at < 3; ++at) {
    EXPECT_NEAR(summaries[at].at("play_seconds").get<double>(), seconds[at], 1.0);
    EXPECT_EQ(summaries[at].at("QMSessionVolume"), volumes[at]);
    EXPECT_EQ(summaries[at].at("active_devices"), devices[at]);
    EXPECT_EQ(summaries[at].at("HostApplicationDisplayID"), "org.example.Player");
  }
  EXPECT_EQ(run({"replay", "--speed", "max", example("no-session.jsonl")}), kDone) << errors;
  EXPECT_TRUE(waitForEvents("com.orvane.standalone.RouteChange.Generic", 1));
  EXPECT_TRUE(waitForEvents("com.orvane.standalone.HAL_Error.Error", 1));
}

// The names and values of what a store has recorded, without what differs between two runs: times, how long
// something lasted, and what the machine was doing.
std::vector<std::string> comparableEvents(const std::string& store) {
  const RecordedEvents events(store);
  std::map<std::string, std::size_t> counts;
  std::vector<std::string> found;
  for (const std::string& name : events.names()) {
    if (name == "com.orvane.tonewerk.twreportingclientuptime") continue;
    json payload = events.named(name).at(counts[name]++);
    for (const char* key : {"twreporting_timestamp", "start_epoch_time", "stop_epoch_time", "play_seconds",
                            "inputrunning_seconds", "load_avg_1_min", "load_avg_5_min", "load_avg_15_min",
                            "vmInfo_phys_footprint_MiB"}) {
      payload.erase(key);
    }
    found.push_back(name + " " + payload.dump());
  }
  return found;
}

TEST_F(TwctlTest, AReplayWithoutADaemonRecordsWhatADaemonRecords) {
  const TemporaryDirectory directory;
  const std::string store = directory.path("store.db");
  ASSERT_EQ(run({"replay", "--speed", "max", example("every-sink.jsonl")}), kDone) << errors;
  ASSERT_TRUE(waitForEvents("com.orvane.tonewerk.twreportingclientuptime", 1));
  ASSERT_TRUE(waitForEvents("com.orvane.longformaudio.Input.Summary", 1));
  EXPECT_EQ(run({"replay", "--offline", example("every-sink.jsonl"), "-o", store}), kDone) << errors;
  EXPECT_THAT(output, HasSubstr("requests"));
  EXPECT_THAT(comparableEvents(store),
              AllOf(SizeIs(testing::Gt(20)), Eq(comparableEvents(daemon.storePath()))));
  EXPECT_EQ(run({"replay", "--offline", example("every-sink.jsonl"), "-o", store}), kRefused);
  EXPECT_THAT(errors, HasSubstr("it exists already"));
}

TEST_F(TwctlTest, TheGuidesRecordingMakesAVolumeSummary) {
  const std::string guide = textOfFile(example("../docs/guide/report.md"));
  const std::string begin = "twctl replay /dev/stdin <<'END'\n";
  const std::size_t from = guide.find(begin);
  ASSERT_NE(from, std::string::npos);
  const std::size_t to = guide.find("END\n", from + begin.size());
  const TemporaryDirectory directory;
  const std::string file = directory.path("recording.jsonl");
  std::ofstream(file) << guide.substr(from + begin.size(), to - from - begin.size());
  EXPECT_EQ(run({"replay", file}), kDone) << errors;
  const char* name = "com.orvane.tonewerk.Volume.Summary";
  ASSERT_TRUE(waitForEvents(name, 1));
  const json summary = RecordedEvents(daemon.storePath()).named(name).at(0);
  EXPECT_EQ(summary.at("QMSessionVolume"), 0.5);
  EXPECT_EQ(summary.at("active_devices"), "Speaker");
  EXPECT_EQ(summary.at("HostApplicationDisplayID"), "org.example.Player");
  EXPECT_NEAR(summary.at("play_seconds").get<double>(), 2.0, 1.0);
}

TEST_F(TwctlTest, ABadRecordingIsNotPlayedAndARefusedLineIsNamed) {
  const TemporaryDirectory directory;
  const std::string file = directory.path("recording.jsonl");
  const char* good = "{\"at\": 0, \"call\": \"createReportingSession\", \"params\": [5]}\n";
  ASSERT_TRUE(std::ofstream(file) << good << "{\"at\": 0, \"call\": \"nothing\", \"params\": []}\n");
  EXPECT_EQ(run({"replay", file}), kWrongUsage);
  EXPECT_THAT(errors, HasSubstr("line 2"));
  EXPECT_EQ(logLinesWith("session created for reporter 5"), 0U);
  EXPECT_EQ(run({"replay", directory.path("missing.jsonl")}), kWrongUsage);

  std::ofstream full(file, std::ios::trunc);
  for (int at = 1; at <= 4097; ++at) {
    full << "{\"at\": 0, \"call\": \"createReportingSession\", \"params\": [" << at << "]}\n";
  }
  full.close();
  EXPECT_EQ(run({"replay", "--speed", "max", file}), kRefused);
  EXPECT_THAT(errors, HasSubstr("line 4097"));
}

TEST_F(TwctlTest, EventsAreFilteredAndParsed) {
  DaemonClient client = connect();
  client.create(kSession, 7);
  for (int at = 1; at <= 5; ++at)
    client.send({{"number", at}}, 4, static_cast<AudioEventType>(at), {kSession});
  ASSERT_TRUE(waitForEvents("com.orvane.tonewerk.Playback.Setup", 1));

  EXPECT_EQ(run({"events", "--json", "--name", "com.orvane.tonewerk.Playback.S*"}), kDone);
  const std::vector<json> events = objects(output);
  ASSERT_THAT(events, SizeIs(3));
  EXPECT_EQ(events[0].at("name"), "com.orvane.tonewerk.Playback.Start");
  EXPECT_EQ(events[1].at("name"), "com.orvane.tonewerk.Playback.Stop");
  EXPECT_EQ(events[2].at("payload").at("number"), 5);
  EXPECT_LT(events[0].at("id").get<std::int64_t>(), events[1].at("id").get<std::int64_t>());
  EXPECT_GT(events[0].at("recorded_at").get<double>(), 1.7e9);

  EXPECT_EQ(run({"events", "--json", "--name", "*.longformaudio.*", "--limit", "2"}), kDone);
  ASSERT_THAT(objects(output), SizeIs(2));
  EXPECT_EQ(objects(output)[1].at("payload").at("number"), 5);
  EXPECT_EQ(run({"events", "--json", "--until", "2020-01-01T00:00:00Z"}), kDone);
  EXPECT_EQ(output, "");
  EXPECT_EQ(run({"events", "--since", "10m", "--name", "com.orvane.longformaudio.Playback.Start"}), kDone);
  EXPECT_THAT(output, AllOf(StartsWith("time "), HasSubstr("  Playback.Start  ")));

  client.disconnect();
  ASSERT_EQ(daemon.stop(), 0);
  EXPECT_EQ(run({"events", "--json", "--name", "*.Volume.*"}), kDone);  // no daemon is needed
}

TEST_F(TwctlTest, EventsAreFollowedAsTheyCome) {
  const TemporaryDirectory directory;
  ChildProcess follower;
  ASSERT_TRUE(follower.start(command({"events", "--json", "--follow", "--name", "*.Playback.*"}),
                             directory.path("output"), directory.path("errors")));
  DaemonClient client = connect();
  client.create(kSession, 7);
  for (std::size_t at = 1; at <= 3; ++at) {
    client.send({{"number", at}}, 4, kTypeStart, {kSession});
    EXPECT_TRUE(waitUntil([&] {
      const auto seen = objects(textOfFile(directory.path("output")));
      return seen.size() == 2 * at && !seen.back().is_discarded();
    })) << textOfFile(directory.path("errors"));
  }
}

TEST_F(TwctlTest, ChannelsAreShownAsTheyAreAndAsTheyChange) {
  const auto publish = [this](int value) {
    const std::string channels = daemon.path(DaemonProcess::kRuntime) + "/channels";
    std::filesystem::create_directories(channels);
    std::ofstream(channels + "/.new")
        << json{{"driver", "Amp"},
                {"channels", {{{"group", "Tx"}, {"name", "n"}, {"format", "simple"}, {"value", value}}}}};
    std::filesystem::rename(channels + "/.new", channels + "/amp.json");
  };
  publish(1);
  EXPECT_EQ(run({"channels", "--json", "--driver", "Amp"}), kDone) << errors;
  EXPECT_THAT(objects(output),
              ElementsAre(json{
                  {"driver", "Amp"}, {"group", "Tx"}, {"name", "n"}, {"format", "simple"}, {"value", 1}}));

  const TemporaryDirectory directory;
  ChildProcess watcher;
  ASSERT_TRUE(watcher.start(command({"channels", "--json", "--driver", "Amp", "--watch", "0.05"}),
                            directory.path("output"), directory.path("errors")));
  int value = 1;
  // The watcher may start at any of these values.
  EXPECT_TRUE(waitUntil([&] {
    publish(value += 1000);
    const auto seen = objects(textOfFile(directory.path("output")));
    return seen.size() >= 3 && !seen.back().is_discarded();
  })) << textOfFile(directory.path("errors"));
  const auto first = objects(textOfFile(directory.path("output"))).front();
  EXPECT_EQ(first.at("name"), "n");
  EXPECT_GE(first.at("value").get<int>(), 1000);
  EXPECT_EQ(first.at("value").get<int>() % 1000, 0);
  EXPECT_GT(first.at("at").get<double>(), 1.7e9);
}

TEST_F(TwctlTest, PreferencesAreReadWrittenAndDeleted) {
  ASSERT_TRUE(daemon.writeConfiguration("preferences/org.example.toml", "configured = 1\n"));
  EXPECT_EQ(run({"defaults", "write", "org.example", "list", R"(["a", "b"])"}), kDone) << errors;
  EXPECT_EQ(run({"defaults", "write", "org.example", "text", "just words"}), kDone) << errors;
  EXPECT_EQ(run({"defaults", "read", "--json", "org.example"}), kDone);
  EXPECT_THAT(objects(output), ::testing::UnorderedElementsAre(
                                   json{{"key", "configured"}, {"from", "configuration"}, {"value", 1}},
                                   json{{"key", "list"}, {"from", "state"}, {"value", {"a", "b"}}},
                                   json{{"key", "text"}, {"from", "state"}, {"value", "just words"}}));
  EXPECT_EQ(run({"defaults", "delete", "org.example", "text"}), kDone);
  EXPECT_EQ(run({"defaults", "read", "org.example", "text"}), kRefused);
  EXPECT_EQ(run({"defaults", "delete", "org.example", "configured"}), kRefused);
  EXPECT_EQ(run({"defaults", "read", "org.nothing"}), kRefused);
}

TEST_F(TwctlTest, WhatIsWrittenTakesEffectInTheRunningDaemon) {
  EXPECT_EQ(
      run({"defaults", "write", "com.orvane.metricon", "consumers", R"([{name = "none", events = []}])"}),
      kDone)
      << errors;
  DaemonClient client = connect();
  client.create(kSession, 7);
  // The change takes effect within about a second: later messages are not recorded.
  const RecordedEvents events(daemon.storePath());
  std::size_t sent = 0;
  EXPECT_TRUE(waitUntil([&] {
    client.send({{"number", ++sent}}, 4, kTypeStart, {kSession});
    return events.named("com.orvane.longformaudio.Playback.Start").size() + 20 < sent;
  }));
}

TEST_F(TwctlTest, ARunningSessionIsToldOfTheRingerThatIsPosted) {
  DaemonClient client = connect();
  client.create(kSession, 7);
  client.start(kSession);
  EXPECT_EQ(run({"notify", "post", "com.orvane.homedeck.ringerstate", "1"}), kDone) << errors;
  EXPECT_TRUE(waitForEvents("com.orvane.longformaudio.Setup.Setup", 1)) << daemon.log();
  EXPECT_EQ(run({"notify", "post", "com.orvane.homedeck.ringerstate", "2"}), kDone) << errors;
  EXPECT_TRUE(waitForEvents("com.orvane.longformaudio.Setup.Setup", 2));
  const auto told = RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.Setup.Setup");
  ASSERT_GE(told.size(), 2U);
  EXPECT_EQ(told.front().value("ringerstate", json()), true);
  EXPECT_EQ(told.back().value("ringerstate", json()), false);
  EXPECT_TRUE(told.front().contains("last_updated"));
  EXPECT_EQ(run({"notify", "get", "--json", "com.orvane.homedeck.ringerstate"}), kDone);
  EXPECT_THAT(objects(output), ElementsAre(json{{"name", "com.orvane.homedeck.ringerstate"}, {"state", 2}}));
}

TEST_F(TwctlTest, ARunningSessionIsToldOfTheDevicesNameThatIsWritten) {
  DaemonClient client = connect();
  client.create(kSession, 7);
  client.start(kSession);
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", "Kitchen"}), kDone) << errors;
  EXPECT_TRUE(waitForEvents("com.orvane.longformaudio.Setup.Setup", 1)) << daemon.log();
  const auto told = RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.Setup.Setup");
  ASSERT_GE(told.size(), 1U);
  EXPECT_EQ(told.front().value("device_name", ""), "Kitchen");
}

TEST_F(TwctlTest, KillEndsTheDaemonAndThenNoneAnswers) {
  DaemonClient client = connect();
  client.create(kSession, 7);
  client.send({{"number", 1}}, 4, kTypeStart, {kSession});
  EXPECT_EQ(run({"kill"}), kDone) << errors;
  EXPECT_EQ(daemon.process().wait(), 2);
  EXPECT_THAT(RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.Playback.Start"), SizeIs(1));
  const std::vector<std::vector<std::string>> asking = {{"list"},
                                                        {"validate", "77"},
                                                        {"kill"},
                                                        {"send", "--category", "1", "--type", "0", "a=1"},
                                                        {"replay", example("no-session.jsonl")}};
  for (const std::vector<std::string>& arguments : asking) {
    EXPECT_EQ(run(arguments), kNoDaemon) << ::testing::PrintToString(arguments);
    EXPECT_THAT(errors, HasSubstr(daemon.socketPath()));
    EXPECT_EQ(output, "");
  }
}

}  // namespace
}  // namespace tonewerk
