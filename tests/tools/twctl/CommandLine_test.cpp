// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <memory>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <sys/socket.h>
#include <utility>
#include <vector>

#include "platform/accounts/Accounts.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/store/ReportStore.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"
#include "tools/twctl/CommandLineTest.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using testing::StartsWith;

TEST_F(CommandLineTest, HelpsWithEveryCommand) {
  for (const char* name :
       {"list", "validate", "send", "replay", "record", "top", "tail", "events", "metrics", "power", "rtc",
        "defaults", "notify", "captures", "drafts", "whirlcaps", "channels", "paths", "kill"}) {
    EXPECT_EQ(run({name, "--help"}), kDone);
    EXPECT_THAT(output(), HasSubstr("--json")) << name;
    EXPECT_THAT(errors(), IsEmpty());
  }
}

TEST_F(CommandLineTest, SaysItsVersion) {
  EXPECT_EQ(run({"--version"}), kDone);
  EXPECT_THAT(output(), StartsWith("twctl "));
}

TEST_F(CommandLineTest, SaysThatItCouldNotWrite) {
  out_.setstate(std::ios::badbit);  // as on a full disk
  EXPECT_EQ(run({"--help"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("cannot write"));
}

TEST_F(CommandLineTest, CallsWrongUsageWrong) {
  for (const std::vector<std::string>& wrong : std::vector<std::vector<std::string>>{
           {"frob"},
           {"list", "more"},
           {"validate"},
           {"validate", "seven"},
           {"validate", "9223372036854775808"},
           {"send", "--type", "Start", "a=1"},
           {"send", "--category", "Playback", "--type", "Start"},
           {"send", "--category", "Nonsense", "--type", "Start", "a=1"},
           {"send", "--category", "Playback", "--type", "Nonsense", "a=1"},
           {"send", "--category", "Playback", "--type", "Start", "a"},
           {"send", "--category", "Playback", "--type", "Start", "--payload", "[]"},
           {"send", "--category", "Playback", "--type", "Start", "--payload", "{}", "a=1"},
           {"send", "--category", "Playback", "--type", "Start", "--id", "x", "a=1"},
           {"replay", "/nowhere.jsonl"},
           {"replay", "/"},
           {"events", "--since", "then"},
           {"events", "--limit", "0"},
           {"power", "--until", "then"},
           {"power", "--limit", "0"},
           {"metrics", "--name", "a"},
           {"metrics", "--since", "then"},
           {"power", "more"},
           {"defaults"},
           {"channels", "more"},
           {"top", "--interval", "0"},
           {"top", "--interval", "nan"},
           {"channels", "--watch", "nan"},
           {"defaults", "write", "a.b", "c"},
           {"notify"},
           {"notify", "post"},
           {"notify", "post", "a", "loud"},
           {"notify", "post", "a", "-1"},
           {"notify", "post", "a", "18446744073709551616"},
           {"notify", "post", "a", "1", "2"},
           {"notify", "get"}}) {
    EXPECT_EQ(run(wrong), kWrongUsage) << testing::PrintToString(wrong);
    EXPECT_THAT(errors(), testing::Not(IsEmpty()));
  }
}

// It printed "--watch: --watch:", and for an unknown command that a command is required.
TEST_F(CommandLineTest, SaysInOneLineWhatIsWrong) {
  const std::vector<std::pair<std::vector<std::string>, std::string>> wrong{
      {{"defaults"}, "a command is required; see twctl defaults --help"},
      {{"evnts"}, "unknown command 'evnts'; did you mean 'events'?"},
      {{"nonsense"}, "unknown command 'nonsense'"},
      {{"defaults", "wirte", "a", "b", "c"}, "unknown command 'wirte'; did you mean 'write'?"},
      {{"captures", "lst"}, "unknown command 'lst'; did you mean 'list'?"},
      {{"--jsn", "list"}, "unknown option '--jsn'; did you mean '--json'?"},
      {{"events", "--sinse=1d"}, "unknown option '--sinse'; did you mean '--since'?"},
      {{"events", "-x"}, "unknown option '-x'"},
      {{"list", "more"}, "unexpected argument 'more'"},
      {{"validate"}, "ID is required"},
      {{"validate", "x"}, "ID: \"x\" is no signed 64-bit number"},
      {{"send", "--type", "Start", "a=1"}, "--category is required"},
      {{"send", "--category", "4", "--type", "1"}, "KEY=VALUE or --payload is required"},
      {{"send", "--category", "Playbak", "--type", "1", "a=1"},
       "there is no category 'Playbak'; did you mean 'Playback'?"},
      {{"send", "--category", "hal_playback", "--type", "1", "a=1"},
       "there is no category 'hal_playback'; did you mean 'HAL_Playback'?"},
      {{"send", "--category", "Nonsense", "--type", "1", "a=1"},
       "there is no category 'Nonsense'; there are Generic, Record, Input, Playback, Output, "
       "PlaybackAndRecord, "
       "IO, Setup, ClientRequest, RouteChange, Error, Chanmetering, Performance, Volume, Gather and "
       "HearingHealth"},
      {{"send", "--category", "4", "--type", "Nonsense", "a=1"},
       "there is no type 'Nonsense'; there are Generic, Start, Stop, Activate, Deactivate, Setup, Error, "
       "IssueDetector, Energybook, ModulonUsage, MIDIDriver, Summary, HeadphoneAudioExposure, AudioExposure, "
       "Listeningenhancement, Pellix, Simple, Histogram, State and MemoryLog"},
      {{"tail", "--type", "Strat"}, "there is no type 'Strat'; did you mean 'Start'?"},
      {{"channels", "--watch", "0"}, "--watch: \"0\" is no number of seconds from 0.05 to 86400"},
      {{"top", "--interval", "nan"}, "--interval: \"nan\" is no number of seconds from 0.05 to 86400"},
      {{"top", "--interval", "86401"}, "--interval: \"86401\" is no number of seconds from 0.05 to 86400"},
      {{"events", "--limit", "0"}, "--limit: \"0\" is no whole number from 1"},
      {{"tail", "--count", "x"}, "--count: \"x\" is no whole number from 1"},
      {{"events", "--limit"}, "--limit needs a value"},
      {{"session", "x"}, "ID: \"x\" is no whole number from 1"},
      {{"session", "1.5"}, "ID: \"1.5\" is no whole number from 1"},
      {{"session", "99999999999999999999"}, "ID: \"99999999999999999999\" is no whole number from 1"},
      {{"explain", "0"}, "EVENT: \"0\" is no whole number from 1"},
      {{"explain", "--session", "-1"}, "--session: \"-1\" is no whole number from 1"},
      {{"glitches", "--session", "0x10"}, "--session: \"0x10\" is no whole number from 1"},
      {{"report", "--session", "0"}, "--session: \"0\" is no whole number from 1"},
      {{"serve", "--session", "x"}, "--session: \"x\" is no whole number from 1"},
      {{"paths", "stor"}, "there is no path 'stor'; did you mean 'store'?"},
  };
  for (const auto& [command, problem] : wrong) {
    SCOPED_TRACE(testing::PrintToString(command));
    EXPECT_EQ(run(command), kWrongUsage);
    EXPECT_THAT(output(), IsEmpty());
    EXPECT_EQ(errors(), "twctl: " + problem + "\n");
  }
}

TEST_F(CommandLineTest, RepeatsNoWordThatControlsATerminal) {
  EXPECT_EQ(run({"ev\x1b[2J\n\xE2\x80\xAE\x7F"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: unknown command 'ev\\u001b[2J\\n\\u202e\\u007f'\n");
  EXPECT_EQ(run({"replay", "/nowhere/\xC2\x9B"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("/nowhere/\\u009b: "));
}

TEST_F(CommandLineTest, PrintsPaths) {
  EXPECT_EQ(run({"paths", "store"}), kDone);
  EXPECT_EQ(output(), directory_.path("state/reports.db") + "\n");
  EXPECT_EQ(run({"paths", "socket"}), kDone);
  EXPECT_EQ(output(), socket_ + "\n");
  EXPECT_EQ(run({"paths", "--json", "runtime"}), kDone);
  EXPECT_EQ(output(), "{\"name\":\"runtime\",\"path\":\"" + directory_.path("runtime") + "\"}\n");
  EXPECT_EQ(run({"paths"}), kDone);
  EXPECT_THAT(output(), HasSubstr("\nconfiguration  " + directory_.path("configuration") + "\n"));
  EXPECT_EQ(run({"paths", "--system"}), kDone);
  EXPECT_EQ(output(),
            "name           path\n"
            "store          /var/lib/tonewerk/reports.db\n"
            "runtime        /run/tonewerk\n"
            "state          /var/lib/tonewerk\n"
            "logs           /var/log/tonewerk\n"
            "configuration  /etc/tonewerk\n"
            "socket         /run/tonewerk/reporting.sock\n");
  // Without a variable the user's own daemon is tried first, then the system's.
  unsetenv("TONEWERK_REPORTING_SOCKET");
  EXPECT_EQ(run({"paths", "socket"}), kDone);
  EXPECT_EQ(output(), directory_.path("runtime/reporting.sock") + "\n/run/tonewerk/reporting.sock\n");
}

TEST_F(CommandLineTest, SaysWhereNoDaemonListens) {
  for (const std::vector<std::string>& command : std::vector<std::vector<std::string>>{
           {"list"}, {"validate", "7"}, {"kill"}, {"send", "--category", "4", "--type", "1", "a=1"}}) {
    EXPECT_EQ(run(command), kNoDaemon);
    EXPECT_THAT(errors(), HasSubstr("no daemon listens on " + socket_));
  }
}

// The error printed was that of the last path, where there is no file.
TEST_F(CommandLineTest, SaysThatADaemonHasLeftItsSocket) {
  unsetenv("TONEWERK_REPORTING_SOCKET");
  std::filesystem::create_directory(directory_.path("runtime"));
  const FileDescriptor left(::socket(AF_UNIX, SOCK_STREAM, 0));
  const auto address = unixAddressOf(directory_.path("runtime/reporting.sock"));
  ASSERT_TRUE(address && ::bind(left.get(), generic(*address), sizeof(*address)) == 0);
  EXPECT_EQ(run({"list"}), kNoDaemon);
  EXPECT_THAT(errors(), HasSubstr("Connection refused"));
}

TEST_F(CommandLineTest, ListsSessions) {
  daemon().answer("getAllReporters", ValueArray{7});
  daemon().answer("reporterIDValid", ValueMap{{"reporterID", 7}, {"serviceType", 2}});
  EXPECT_EQ(run({"list"}), kDone);
  EXPECT_EQ(output(), "reporterID  serviceType  serviceName\n7           2            telephony\n");
  EXPECT_EQ(run({"list", "--json"}), kDone);
  EXPECT_EQ(output(), "{\"reporterID\":7,\"serviceType\":2,\"serviceName\":\"telephony\"}\n");
  EXPECT_EQ(run({"--json", "list"}), kDone);
  EXPECT_THAT(output(), StartsWith("{"));
}

TEST_F(CommandLineTest, ListsNothingWhenThereIsNoSession) {
  daemon().answer("getAllReporters", ValueArray());
  EXPECT_EQ(run({"list", "--json"}), kDone);
  EXPECT_THAT(output(), IsEmpty());
}

TEST_F(CommandLineTest, ValidatesAnIdentifier) {
  daemon().answer("reporterIDValid", ValueMap{{"reporterID", -7}, {"serviceType", 65535}});
  EXPECT_EQ(run({"validate", "-7", "--json"}), kDone);
  EXPECT_EQ(output(), "{\"reporterID\":-7,\"serviceType\":65535,\"serviceName\":\"unknown\"}\n");
}

TEST_F(CommandLineTest, RefusesAnIdentifierOfNoSession) {
  daemon().answer("reporterIDValid", ValueMap{{"reporterID", 0}, {"serviceType", 65535}});
  EXPECT_EQ(run({"validate", "7"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("no session has the identifier 7"));
  EXPECT_EQ(run({"validate", "0"}), kRefused);
}

TEST_F(CommandLineTest, SendsAMessageToTheSessionsNamed) {
  daemon().setSessions({7, -8});
  EXPECT_EQ(run({"send", "--id", "7", "--id", "-8", "--category", "HAL_Playback", "--type", "Start",
                 "on=true", "n=5", "volume=0.5", "text=a=b"}),
            kDone);
  ASSERT_THAT(daemon().requestsFor("sendMessage"), SizeIs(1));
  const Arguments arguments = daemon().requestsFor("sendMessage")[0].arguments;
  EXPECT_EQ(arguments[0], Value(ValueMap{{"on", true}, {"n", 5}, {"volume", 0.5}, {"text", "a=b"}}));
  EXPECT_EQ(arguments[1], Value(0x20000004));
  EXPECT_EQ(arguments[2], Value(1));
  EXPECT_EQ(arguments[3], Value(ValueArray{7, -8}));
}

// The daemon ignores identifiers of no session, and answers as if the message was delivered.
TEST_F(CommandLineTest, SendsNothingWhenAnIdentifierIsOfNoSession) {
  daemon().setSessions({7});
  EXPECT_EQ(run({"send", "--id", "8", "--category", "4", "--type", "1", "a=1"}), kRefused);
  EXPECT_EQ(errors(), "twctl: no session has the identifier 8; the message was sent to none\n");
  EXPECT_EQ(run({"send", "--id", "7", "--id", "8", "--id", "0", "--category", "4", "--type", "1", "a=1"}),
            kRefused);
  EXPECT_EQ(errors(), "twctl: no session has any of the identifiers 8, 0; the message was sent to none\n");
  EXPECT_THAT(daemon().requestsFor("sendMessage"), IsEmpty());
}

TEST_F(CommandLineTest, OnlyReadingCommandsConnectAsOnlookers) {
  daemon().setSessions({7});
  daemon().answer("getAllReporters", ValueArray{7});
  const std::string recording =
      write("recording.jsonl", R"({"at": 0, "call": "createReportingSession", "params": [7]})");
  const auto firstRequestOf = [this](const std::vector<std::string>& command) {
    const std::size_t before = daemon().requests().size();
    EXPECT_EQ(run(command), kDone) << errors();
    return daemon().requests().at(before).method;
  };
  EXPECT_EQ(firstRequestOf({"list"}), "observe");
  EXPECT_EQ(firstRequestOf({"validate", "7"}), "observe");
  EXPECT_EQ(firstRequestOf({"send", "--id", "7", "--category", "4", "--type", "1", "a=1"}),
            "reporterIDValid");
  EXPECT_EQ(firstRequestOf({"replay", recording}), "createReportingSession");
  EXPECT_EQ(firstRequestOf({"kill"}), "killService");
  EXPECT_THAT(daemon().requestsFor("observe"), SizeIs(2));
}

TEST_F(CommandLineTest, ReadsFromADaemonThatDoesNotKnowOnlookers) {
  daemon().refuse("observe", messagingError(kUnknownMethod, "there is no method observe"));
  daemon().setSessions({7});
  EXPECT_EQ(run({"validate", "7"}), kDone);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(CommandLineTest, SendsAPayloadToAllWithoutANamedSession) {
  daemon();
  EXPECT_EQ(run({"send", "--category", "14", "--type", "65535", "--payload", R"({"a": [1, {"b": "c"}]})"}),
            kDone);
  const Arguments arguments = daemon().requests().at(0).arguments;
  EXPECT_EQ(arguments[0], Value(ValueMap{{"a", ValueArray{1, ValueMap{{"b", "c"}}}}}));
  EXPECT_EQ(arguments[2], Value(65535));
  EXPECT_FALSE(arguments[3]);
}

TEST_F(CommandLineTest, SaysWhyAMessageWasRefused) {
  daemon().refuse("sendMessage", ReplyError{"com.orvane.audio.reporting", 1, ""});
  EXPECT_EQ(run({"send", "--category", "4", "--type", "1", "a=1"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("reporting is disabled (com.orvane.audio.reporting, code 1)"));
}

TEST_F(CommandLineTest, RefusesAMessageThatNoFrameCarries) {
  daemon();
  EXPECT_EQ(run({"send", "--category", "4", "--type", "1", "a=" + std::string(2 << 20, 'x')}), kRefused);
  EXPECT_THAT(daemon().requests(), IsEmpty());
}

TEST_F(CommandLineTest, KillsTheDaemon) {
  daemon();
  EXPECT_EQ(run({"kill"}), kDone);
  EXPECT_THAT(daemon().requests(), SizeIs(1));
}

TEST_F(CommandLineTest, SaysWhyTheDaemonWasNotKilled) {
  daemon().refuse("killService", ReplyError{"com.orvane.audio.reporting", 1, ""});
  EXPECT_EQ(run({"kill"}), kRefused);
}

TEST_F(CommandLineTest, PlaysARecordingWithoutWaitingForAStart) {
  daemon();
  const std::string file =
      write("recording.jsonl", R"({"at": 0, "call": "createReportingSession", "params": [7]}
{"at": 0.01, "call": "startReportingSessionForID", "params": [7]}
{"at": 0.02, "call": "sendMessage", "params": [{"time": {"now": 0}}, 4, 1, null]}
)");
  EXPECT_EQ(run({"replay", file, "--json"}), kDone);
  EXPECT_EQ(output(), "{\"requests\":3,\"refused\":0}\n");
  const auto requests = daemon().requests();
  ASSERT_THAT(requests, SizeIs(3));
  EXPECT_EQ(requests[1].method, "startReportingSessionForID");
  const Value* time = requests[2].arguments[0]->asMap()->find("time");
  EXPECT_GT(numberOf(time), 1.7e9);
}

TEST_F(CommandLineTest, PlaysEachClientOfARecordingOnAConnectionOfItsOwn) {
  daemon().refuse("stopReportingSessionForID", messagingError(kOverLimit, "too much"));
  const std::string file = write("recording.jsonl", R"({"device": {"starts_at": 1763633880}}
{"at": 0, "client": 2, "connect": {"user": 1001, "process": "player"}}
{"at": 0, "client": 2, "call": "createReportingSession", "params": [7]}
{"at": 0, "client": 2, "call": "startReportingSessionForID", "params": [7]}
{"at": 0, "client": 3, "call": "createReportingSession", "params": [8]}
{"at": 0, "client": 2, "call": "stopReportingSessionForID", "params": [7]}
{"at": 0, "client": 2, "disconnect": true}
{"at": 0, "client": 2, "call": "createReportingSession", "params": [9]}
)");
  EXPECT_EQ(run({"replay", file}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("line 6: stopReportingSessionForID: too much"));
  EXPECT_THAT(daemon().requests(), SizeIs(5));
  EXPECT_EQ(daemon().connections(), 3U);
}

TEST_F(CommandLineTest, ConnectsAgainWhereTheDaemonOfARecordingBeginsAgain) {
  daemon();
  const std::string file =
      write("recording.jsonl", R"({"at": 0, "client": 2, "call": "createReportingSession", "params": [7]}
{"at": 0, "client": 3, "call": "createReportingSession", "params": [8]}
{"at": 0, "restart": true}
{"at": 0, "client": 2, "call": "createReportingSession", "params": [7]}
)");
  EXPECT_EQ(run({"replay", file}), kDone) << errors();
  EXPECT_EQ(daemon().connections(), 3U);
}

// The tests are in another directory than the programs.
TEST_F(CommandLineTest, NamesTheProgramThatAReplayWithoutADaemonNeeds) {
  EXPECT_EQ(run({"replay", "--offline", "recording.jsonl", "-o", "store.db"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("/tw-replay: No such file"));
}

TEST_F(CommandLineTest, KnowsWhatAReplayWithoutADaemonNeeds) {
  EXPECT_EQ(run({"replay", "--offline", "recording.jsonl"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("--output"));
  EXPECT_EQ(run({"replay", "recording.jsonl", "-o", "store.db"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("--offline"));
  EXPECT_EQ(run({"replay", "--offline", "recording.jsonl", "-o", "store.db", "--speed", "2"}), kWrongUsage);
}

TEST_F(CommandLineTest, PlaysWithoutPauses) {
  daemon();
  std::string text;
  for (int n = 0; n < 3000; ++n) {
    text += "{\"at\": " + std::to_string(n * 1000) + ", \"call\": \"createReportingSession\", \"params\": [" +
            std::to_string(n) + "]}\n";
  }
  EXPECT_EQ(run({"replay", write("recording.jsonl", text), "--speed", "max"}), kDone);
  EXPECT_THAT(daemon().requests(), SizeIs(3000));
}

TEST_F(CommandLineTest, NamesTheLinesOfARecordingThatWereRefused) {
  daemon().refuse("sendMessage", ReplyError{"com.orvane.tonewerk.messaging", 3, "too much"});
  const std::string file =
      write("recording.jsonl", R"({"at": 0, "call": "createReportingSession", "params": [7]}

{"at": 0, "call": "sendMessage", "params": [{}, 4, 1, [7]]}
{"at": 0, "call": "destroyReportingSession", "params": [7]}
)");
  EXPECT_EQ(run({"replay", file}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("line 3: sendMessage: too much"));
  EXPECT_THAT(daemon().requests(), SizeIs(3));
}

TEST_F(CommandLineTest, PlaysNothingOfABadRecording) {
  daemon();
  const std::string file =
      write("recording.jsonl", R"({"at": 0, "call": "createReportingSession", "params": [7]}
{"at": 0, "call": "createReportingSession", "params": ["x"]}
)");
  EXPECT_EQ(run({"replay", file}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("line 2: createReportingSession: argument 1"));
  EXPECT_EQ(run({"replay", file, "--speed", "0"}), kWrongUsage);
  EXPECT_EQ(run({"replay", file, "--speed", "fast"}), kWrongUsage);
  EXPECT_THAT(daemon().requests(), IsEmpty());
}

TEST_F(CommandLineTest, PlaysARecordingThatEndsTheDaemon) {
  daemon();
  EXPECT_EQ(
      run({"replay", write("recording.jsonl", "{\"at\": 0, \"call\": \"killService\", \"params\": []}\n")}),
      kDone);
}

TEST_F(CommandLineTest, PlaysTheExamples) {
  daemon();
  for (const char* name : {"music-session.jsonl", "no-session.jsonl", "diagnostics.jsonl"}) {
    const std::string file = std::string(TONEWERK_SOURCE_DIR) + "/examples/" + name;
    EXPECT_EQ(run({"replay", file, "--speed", "max"}), kDone) << errors();
  }
}

// The store of a daemon that has run before. It is written when this ends.
struct DaemonsStore {
  DaemonsStore(const std::string& directory, const JsonService& json)
      : store(directory, json, preferences, clock, accounts, category) {}

  MemoryLog log;
  const LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  const MemoryPreferenceStore preferences;
  ManualClock clock;
  Accounts accounts{990, clock};
  ReportStore store;
};

// Runs twctl with a store that has three events.
class EventsCommandTest : public CommandLineTest {
 protected:
  void store() {
    DaemonsStore daemons(directory_.path("state"), json_);
    ReportStore& store = daemons.store;
    store.recordEvent(1'763'633'880.0, "com.orvane.a", {{"n", 1}});
    store.recordEvent(1'763'633'890.5, "com.orvane.b", {{"n", 2}});
    store.recordEvent(1'763'633'900.0, "com.orvane.a", {{"n", 3}});
  }
};

TEST_F(EventsCommandTest, SaysThatThereIsNoStore) {
  EXPECT_EQ(run({"events"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr(directory_.path("state/reports.db") + ": there is no such file"));
}

TEST_F(EventsCommandTest, ShowsEventsToPeople) {
  store();
  EXPECT_EQ(run({"events", "--name", "*.b"}), kDone);
  EXPECT_EQ(output(),
            "time                      session  application  event         what it says\n"
            "2025-11-20 10:18:10.500Z  -        -            com.orvane.b  n=2\n");
}

TEST_F(EventsCommandTest, GivesEventsToPrograms) {
  store();
  EXPECT_EQ(run({"events", "--json", "--limit", "2"}), kDone);
  EXPECT_EQ(output(),
            "{\"id\":4,\"recorded_at\":1763633890.5,\"name\":\"com.orvane.b\",\"payload\":{\"n\":2}}\n"
            "{\"id\":6,\"recorded_at\":1763633900.0,\"name\":\"com.orvane.a\",\"payload\":{\"n\":3}}\n");
}

TEST_F(EventsCommandTest, ShowsPeopleTheNewestTenAtFirst) {
  {
    DaemonsStore daemons(directory_.path("state"), json_);
    for (int second = 1; second <= 12; ++second)
      daemons.store.recordEvent(1'763'633'880.0 + second, "com.orvane.a", {{"n", second}});
  }
  const auto shown = [&](std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "events");
    EXPECT_EQ(run(arguments), kDone) << errors();
    const std::string text = output();
    const auto lines = std::count(text.begin(), text.end(), '\n') - (text.starts_with("time") ? 1 : 0);
    return std::to_string(lines) + (text.find("n=12") == std::string::npos ? "" : " with the newest");
  };
  EXPECT_EQ(shown({}), "10 with the newest");
  EXPECT_EQ(shown({"-n", "2"}), "2 with the newest");
  EXPECT_EQ(shown({"-n", "all"}), "12 with the newest");
  EXPECT_EQ(shown({"--since", "2025-11-20"}), "12 with the newest");
  EXPECT_EQ(shown({"--until", "2025-11-20 10:18:03"}), "3");
  EXPECT_EQ(shown({"--json"}), "12");
}

TEST_F(EventsCommandTest, ShowsEverythingOfAMessageWhenAsked) {
  {
    DaemonsStore daemons(directory_.path("state"), json_);
    daemons.store.recordEvent(1'763'633'880.0, "com.orvane.tonewerk.Volume.Summary",
                              {{"audiotag", "VolumeSummary"}, {"play_seconds", 10.1000003}});
  }
  EXPECT_EQ(run({"events", "--long"}), kDone);
  EXPECT_EQ(output(),
            "event 1\n"
            "  time        2025-11-20 10:18:00Z\n"
            "  name        com.orvane.tonewerk.Volume.Summary\n"
            "    audiotag=VolumeSummary\n"
            "    play_seconds=10.1000003\n"
            "\n");
  EXPECT_EQ(run({"events"}), kDone);
  EXPECT_THAT(output(), HasSubstr("  Volume.Summary  play_seconds=10.1\n"));
}

TEST_F(EventsCommandTest, KnowsTheNearestServiceAndRefusesWhatIsNone) {
  store();
  EXPECT_EQ(run({"events", "--service", "telefony"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: --service: there is no service 'telefony'; did you mean 'telephony'?\n");
  EXPECT_EQ(run({"events", "--service", "tele*"}), kDone);
  EXPECT_EQ(run({"events", "--service", "unknown"}), kDone);
  EXPECT_EQ(run({"sessions", "--service", "alrms"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("did you mean 'alarms'?"));
}

TEST_F(EventsCommandTest, OtherListingsSayWhatTheyCannotChooseBy) {
  store();
  for (const std::vector<std::string>& wrong :
       std::vector<std::vector<std::string>>{{"power", "--session", "1"},
                                             {"power", "--service", "haptics"},
                                             {"power", "--device", "Speaker"},
                                             {"metrics", "--app", "a"},
                                             {"metrics", "--session", "1"},
                                             {"rtc", "--session", "1"},
                                             {"rtc", "--device", "Speaker"}}) {
    EXPECT_EQ(run(wrong), kWrongUsage) << testing::PrintToString(wrong);
    EXPECT_THAT(errors(), HasSubstr(wrong[1] + ": the store does not know of ")) << errors();
  }
  EXPECT_EQ(run({"power", "--app", "a"}), kDone) << errors();
  EXPECT_EQ(run({"rtc", "--app", "a", "--service", "telephony"}), kDone) << errors();
}

TEST_F(EventsCommandTest, PrintsNothingThatControlsATerminal) {
  {
    DaemonsStore daemons(directory_.path("state"), json_);
    ReportStore& store = daemons.store;
    store.recordEvent(1'763'633'880.0, "com.orvane.a\x1b\n", {{"k\x7F", "v\xC2\x9B\xE2\x80\xAE"}});
  }
  EXPECT_EQ(run({"events"}), kDone);
  EXPECT_THAT(output(), HasSubstr(R"(  com.orvane.a\u001b\n  k\u007f=v\u009b\u202e)"));
  EXPECT_EQ(run({"events", "--long"}), kDone);
  EXPECT_THAT(output(), AllOf(HasSubstr(R"(com.orvane.a\u001b\n)"), HasSubstr(R"(k\u007f=v\u009b\u202e)")));
  EXPECT_EQ(run({"events", "--json"}), kDone);
  EXPECT_THAT(output(), HasSubstr(R"("name":"com.orvane.a\u001b\n","payload":{"k\u007f":"v\u009b\u202e"}})"));
}

TEST_F(EventsCommandTest, TakesTimes) {
  store();
  EXPECT_EQ(
      run({"events", "--json", "--since", "2025-11-20T10:18:05Z", "--until", "2025-11-20T11:18:15+01:00"}),
      kDone);
  EXPECT_EQ(output(),
            "{\"id\":4,\"recorded_at\":1763633890.5,\"name\":\"com.orvane.b\",\"payload\":{\"n\":2}}\n");
}

// Runs twctl with a store that has a power event and three metric records. The second is of an unknown kind,
// and the third is damaged.
class MetricsCommandTest : public CommandLineTest {
 protected:
  void store() {
    DaemonsStore daemons(directory_.path("state"), json_);
    ReportStore& store = daemons.store;
    const auto record = [&](double second, std::uint32_t identifier, std::string bytes) {
      store.record(MetricRow{1'763'633'880.0 + second, identifier, std::move(bytes)});
    };
    record(1, 0x5B0003, std::string("\x10\x03\x1a\x07silence\x22\x05mixer\x2a\x00", 20));
    store.record(PowerRow{1'763'633'882.0, 28, "LeakedHapticsSessionInfo", {}});
    record(3, 7, std::string("\x10\x03", 2));
    record(4, 0x5B0003, "\x1a\x09");
  }
};

TEST_F(MetricsCommandTest, SaysThatThereIsNoStore) {
  EXPECT_EQ(run({"metrics"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr(directory_.path("state/reports.db") + ": there is no such file"));
}

TEST_F(MetricsCommandTest, ShowsRecordsDecodedAndOthersInHexadecimal) {
  store();
  EXPECT_EQ(run({"metrics"}), kDone);
  EXPECT_EQ(output(),
            "id  time                  identifier  record\n"
            "1   2025-11-20 10:18:01Z  5963779     "
            "{\"duration\":3,\"issuetype\":\"silence\",\"node\":\"mixer\",\"rtaidclient\":\"\"}\n"
            "2   2025-11-20 10:18:03Z  7           1003\n"
            "3   2025-11-20 10:18:04Z  5963779     1a09\n");
}

TEST_F(MetricsCommandTest, GivesRecordsToProgramsByTheFilter) {
  store();
  EXPECT_EQ(run({"metrics", "--json", "--until", "2025-11-20T10:18:03Z"}), kDone);
  EXPECT_EQ(output(),
            "{\"id\":1,\"posted_at\":1763633881.0,\"identifier\":5963779,"
            "\"record\":{\"duration\":3,\"issuetype\":\"silence\",\"node\":\"mixer\",\"rtaidclient\":\"\"}}\n"
            "{\"id\":2,\"posted_at\":1763633883.0,\"identifier\":7,\"record\":\"1003\"}\n");
}

TEST_F(MetricsCommandTest, TheLimitTakesTheNewest) {
  store();
  EXPECT_EQ(run({"metrics", "--json", "--limit", "1"}), kDone);
  EXPECT_THAT(output(), HasSubstr("{\"id\":3,"));
}

// Runs twctl with a store that has an event of another table and six power events. Those on odd seconds have
// a duration.
class PowerCommandTest : public CommandLineTest {
 protected:
  void store() {
    DaemonsStore daemons(directory_.path("state"), json_);
    ReportStore& store = daemons.store;
    store.recordEvent(1'763'633'880.0, "com.orvane.a", {{"EngineOnDuration", 100}});
    const auto record = [&](double second, const char* name, ValueMap payload) {
      store.record(PowerRow{1'763'633'880.0 + second, 28, name, std::move(payload)});
    };
    record(1, "Flumen_Haptics_EngineOnDuration", {{"EngineOnDuration", 1.5}, {"ApplicationName", "game"}});
    record(2, "Flumen_Haptics_ClientStatus", {{"Status", true}, {"ApplicationName", "game"}});
    record(3, "Flumen_Haptics_EngineOnDuration", {{"EngineOnDuration", 7}, {"ApplicationName", "chat"}});
    record(5, "Flumen_Haptics_EngineOnDuration", {{"EngineOnDuration", 2}, {"ApplicationName", "game"}});
    record(7, "Flumen_Haptics_EngineOnDuration", {{"EngineOnDuration", 0.25}});
    record(8, "LeakedHapticsSessionInfo", {{"Haptic_Active_Hardware_Time_Seconds", 3600}});
  }
};

TEST_F(PowerCommandTest, SaysThatThereIsNoStore) {
  EXPECT_EQ(run({"power"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr(directory_.path("state/reports.db") + ": there is no such file"));
}

TEST_F(PowerCommandTest, ShowsEventsAndTheTotalsOfTheirDurationsToPeople) {
  store();
  EXPECT_EQ(run({"power", "--limit", "4"}), kDone);
  EXPECT_EQ(output(),
            "id  time                  group  name                             payload\n"
            "3   2025-11-20 10:18:03Z  28     Flumen_Haptics_EngineOnDuration  "
            "{\"EngineOnDuration\":7,\"ApplicationName\":\"chat\"}\n"
            "4   2025-11-20 10:18:05Z  28     Flumen_Haptics_EngineOnDuration  "
            "{\"EngineOnDuration\":2,\"ApplicationName\":\"game\"}\n"
            "5   2025-11-20 10:18:07Z  28     Flumen_Haptics_EngineOnDuration  {\"EngineOnDuration\":0.25}\n"
            "6   2025-11-20 10:18:08Z  28     LeakedHapticsSessionInfo         "
            "{\"Haptic_Active_Hardware_Time_Seconds\":3600}\n"
            "\n"
            "ApplicationName  EngineOnDuration  events\n"
            "chat             7                 1\n"
            "game             2                 1\n"
            "(null)           0.25              1\n");
}

TEST_F(PowerCommandTest, PrintsNothingThatControlsATerminal) {
  {
    DaemonsStore daemons(directory_.path("state"), json_);
    ReportStore& store = daemons.store;
    store.record(PowerRow{1'763'633'880.0,
                          28,
                          "Flumen_Haptics_EngineOnDuration",
                          {{"EngineOnDuration", 2}, {"ApplicationName", "g\x1b]0;\x7F\xE2\x80\xAE\n"}}});
  }
  const std::string name = R"(g\u001b]0;\u007f\u202e\n)";
  EXPECT_EQ(run({"power"}), kDone);
  EXPECT_THAT(output(),
              AllOf(HasSubstr("\"ApplicationName\":\"" + name + "\""), HasSubstr("\n" + name + "  2 ")));
  EXPECT_EQ(run({"power", "--totals", "--json"}), kDone);
  EXPECT_THAT(output(), HasSubstr("{\"ApplicationName\":\"" + name + "\","));
}

TEST_F(PowerCommandTest, ShowsNoTotalsWhereNoEventHasADuration) {
  store();
  EXPECT_EQ(run({"power", "--name", "*Status"}), kDone);
  EXPECT_EQ(output(),
            "id  time                  group  name                         payload\n"
            "2   2025-11-20 10:18:02Z  28     Flumen_Haptics_ClientStatus  "
            "{\"Status\":true,\"ApplicationName\":\"game\"}\n");
}

TEST_F(PowerCommandTest, GivesEventsAloneToPrograms) {
  store();
  EXPECT_EQ(run({"power", "--json", "--name", "*Duration", "--since", "2025-11-20T10:18:05Z"}), kDone);
  EXPECT_EQ(output(),
            "{\"id\":4,\"recorded_at\":1763633885.0,\"event_group\":28,"
            "\"name\":\"Flumen_Haptics_EngineOnDuration\","
            "\"payload\":{\"EngineOnDuration\":2,\"ApplicationName\":\"game\"}}\n"
            "{\"id\":5,\"recorded_at\":1763633887.0,\"event_group\":28,"
            "\"name\":\"Flumen_Haptics_EngineOnDuration\",\"payload\":{\"EngineOnDuration\":0.25}}\n");
}

TEST_F(PowerCommandTest, GivesTotalsAloneToPrograms) {
  store();
  EXPECT_EQ(run({"power", "--json", "--totals"}), kDone);
  EXPECT_EQ(output(),
            "{\"ApplicationName\":\"chat\",\"EngineOnDuration\":7.0,\"events\":1}\n"
            "{\"ApplicationName\":\"game\",\"EngineOnDuration\":3.5,\"events\":2}\n"
            "{\"ApplicationName\":null,\"EngineOnDuration\":0.25,\"events\":1}\n");
}

TEST_F(PowerCommandTest, ChoosesByTheApplication) {
  store();
  EXPECT_EQ(run({"power", "--totals", "--app", "g*"}), kDone);
  EXPECT_EQ(output(),
            "ApplicationName  EngineOnDuration  events\n"
            "game             3.5               2\n");
}

TEST_F(PowerCommandTest, TotalsKeepToTheFilter) {
  store();
  EXPECT_EQ(run({"power", "--totals", "--since", "2025-11-20T10:18:02Z", "--until", "2025-11-20T10:18:05Z"}),
            kDone);
  EXPECT_EQ(output(),
            "ApplicationName  EngineOnDuration  events\n"
            "chat             7                 1\n"
            "game             2                 1\n");
}

TEST_F(CommandLineTest, PostsANotificationAndGetsItsState) {
  EXPECT_EQ(run({"notify", "post", "com.orvane.test", "18446744073709551615"}), kDone);
  EXPECT_THAT(output() + errors(), IsEmpty());
  EXPECT_EQ(run({"notify", "post", "com.orvane.test"}), kDone);
  EXPECT_EQ(run({"notify", "get", "com.orvane.test", "--json"}), kDone);
  EXPECT_EQ(output(), "{\"name\":\"com.orvane.test\",\"state\":18446744073709551615}\n");
  EXPECT_EQ(run({"notify", "post", "com.orvane.test", "0"}), kDone);
  EXPECT_EQ(run({"notify", "get", "com.orvane.test"}), kDone);
  EXPECT_EQ(output(),
            "name             state\n"
            "com.orvane.test  0\n");
}

TEST_F(CommandLineTest, APostWithoutAStateBeginsAtZero) {
  EXPECT_EQ(run({"notify", "post", "a"}), kDone);
  EXPECT_EQ(run({"notify", "get", "a", "--json"}), kDone);
  EXPECT_EQ(output(), "{\"name\":\"a\",\"state\":0}\n");
}

TEST_F(CommandLineTest, SaysThatANotificationWasNeverPostedOrHasNoState) {
  EXPECT_EQ(run({"notify", "get", "a"}), kRefused);
  EXPECT_EQ(errors(), "twctl: nobody has posted a\n");
  std::filesystem::create_directories(directory_.path("runtime/notifications"));
  const std::string file = write("runtime/notifications/a", "loud");
  EXPECT_EQ(run({"notify", "get", "a"}), kRefused);
  EXPECT_EQ(errors(), "twctl: " + file + " holds no number of 64 bits\n");
  std::filesystem::create_directory(directory_.path("runtime/notifications/b"));
  EXPECT_EQ(run({"notify", "get", "b"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("/notifications/b: "));
  EXPECT_EQ(run({"notify", "post", "b"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("/notifications/b: "));
}

TEST_F(CommandLineTest, RefusesWhatCannotNameANotification) {
  for (const char* name : {"", ".", "..", "../reporting", "a/b"}) {
    EXPECT_EQ(run({"notify", "post", name, "1"}), kRefused) << name;
    EXPECT_EQ(errors(), "twctl: \"" + std::string(name) + "\" cannot name a notification\n");
    EXPECT_EQ(run({"notify", "get", name}), kRefused) << name;
  }
}

}  // namespace
}  // namespace tonewerk
