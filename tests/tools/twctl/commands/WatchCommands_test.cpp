// SPDX-License-Identifier: Apache-2.0
//
// Tests twctl top, tail and list with a scripted daemon.
#include <gmock/gmock.h>
#include <memory>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <utility>
#include <vector>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ScopedTimeZone.h"
#include "support/TemporaryDirectory.h"
#include "tools/twctl/ScriptedDaemon.h"
#include "tools/twctl/commands/Commands.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

const ReplyError kRefusal = messagingError(kNotPermitted, "not permitted: this is for others");

class WatchCommandsTest : public testing::Test {
 protected:
  const ScopedTimeZone zone_{"UTC0"};
  WatchCommandsTest() { setenv("TONEWERK_REPORTING_SOCKET", socket.c_str(), 1); }
  void TearDown() override { unsetenv("TONEWERK_REPORTING_SOCKET"); }

  int run(std::vector<const char*> arguments) {
    arguments.insert(arguments.begin(), "twctl");
    out.str({});
    err.str({});
    Tool tool{out, err, json};
    return runCommandLine(static_cast<int>(arguments.size()), arguments.data(), tool);
  }
  // Makes the answer with the total number of sessions and these sessions.
  void answerSessions(std::vector<Value> sessions) {
    const std::size_t count = sessions.size();
    daemon.answer("watch.sessions",
                  ValueMap{{"total", count}, {"sessions", ValueArray(std::move(sessions))}});
  }
  void answerMessages(std::int64_t missed, std::vector<Value> messages) {
    daemon.answer("watch.nextMessages",
                  ValueMap{{"missed", missed}, {"messages", ValueArray(std::move(messages))}});
  }
  static ValueMap message(int number) {
    return {{"reporterID", 77},
            {"serviceType", 2},
            {"category", 4},
            {"type", 1},
            {"redundant", false},
            {"time", 1763634000.5},
            {"payload", ValueMap{{"number", number}}}};
  }
  Arguments argumentsOf(const std::string& method) {
    for (const auto& request : daemon.requests()) {
      if (request.method == method) return request.arguments;
    }
    ADD_FAILURE() << method << " was not called";
    return {};
  }

  TemporaryDirectory directory;
  const std::string socket = directory.path("reporting.sock");
  ScriptedDaemon daemon{socket};
  NlohmannJsonService json;
  std::ostringstream out;
  std::ostringstream err;
};

TEST_F(WatchCommandsTest, TopPrintsOneFrameWhereThereIsNoTerminal) {
  answerSessions({ValueMap{{"reporterID", 77}, {"serviceName", "telephony"}, {"processIdentifier", 11}}});
  EXPECT_EQ(run({"top", "--interval", "0.05"}), kDone);
  EXPECT_EQ(out.str(),
            "1 session, 0.0 messages a second\n"
            "session  service    application  client  msg/s  redundant  overloads  running\n"
            "77       telephony               ? 11    0.0    -          -          -\n");
  EXPECT_THAT(daemon.requestsFor("watch.sessions"), SizeIs(2));
}

TEST_F(WatchCommandsTest, ConnectsAsAnOnlookerFirst) {
  answerSessions({});
  answerMessages(0, {message(1)});
  for (const std::vector<const char*>& command :
       {std::vector{"top", "--interval", "0.05"}, std::vector{"tail", "--count", "1"}}) {
    const std::size_t before = daemon.requests().size();
    EXPECT_EQ(run(command), kDone);
    ASSERT_GT(daemon.requests().size(), before);
    EXPECT_EQ(daemon.requests()[before].method, "observe") << command[0];
  }
}

TEST_F(WatchCommandsTest, TopPrintsAnObjectASessionForPrograms) {
  answerSessions({ValueMap{{"reporterID", 77}}, ValueMap{{"reporterID", 78}}});
  EXPECT_EQ(run({"top", "--json", "--interval", "0.05"}), kDone);
  EXPECT_EQ(out.str(),
            "{\"reporterID\":77,\"messagesPerSecond\":0.0}\n{\"reporterID\":78,\"messagesPerSecond\":0.0}\n");
}

TEST_F(WatchCommandsTest, TopPrintsNothingThatControlsATerminal) {
  answerSessions({ValueMap{{"reporterID", 77},
                           {"serviceName", "s\n"},
                           {"application", "a\x1b[2J\xE2\x80\xAE"},
                           {"processName", "p\xC2\x9B\x7F"}}});
  EXPECT_EQ(run({"top", "--interval", "0.05"}), kDone);
  EXPECT_THAT(out.str(), HasSubstr(R"(s\n      a\u001b[2J\u202e  p\u009b\u007f )"));
  EXPECT_EQ(run({"top", "--json", "--interval", "0.05"}), kDone);
  EXPECT_THAT(out.str(), HasSubstr(R"("application":"a\u001b[2J\u202e","processName":"p\u009b\u007f")"));
}

TEST_F(WatchCommandsTest, TopAsksForThePortionsThatAreLeft) {
  daemon.answer("watch.sessions",
                ValueMap{{"total", 3}, {"sessions", ValueArray{ValueMap{{"reporterID", 7}}}}});
  EXPECT_EQ(run({"top", "--json", "--interval", "0.05"}), kDone);
  std::vector<std::int64_t> firsts;
  for (const auto& request : daemon.requestsFor("watch.sessions"))
    firsts.push_back(request.arguments.at(0)->integer());
  EXPECT_THAT(firsts, ElementsAre(0, 1, 2, 0, 1, 2));
}

TEST_F(WatchCommandsTest, TopStopsAskingWhenAPortionIsEmpty) {
  daemon.answer("watch.sessions", ValueMap{{"total", 3}, {"sessions", ValueArray{}}});
  EXPECT_EQ(run({"top", "--json", "--interval", "0.05"}), kDone);
  EXPECT_THAT(daemon.requestsFor("watch.sessions"), SizeIs(2));
}

TEST_F(WatchCommandsTest, BothSayThatTheyAreNotPermitted) {
  daemon.refuse("watch.sessions", kRefusal);
  daemon.refuse("watch.openMessages", kRefusal);
  for (const char* command : {"top", "tail"}) {
    EXPECT_EQ(run({command}), kRefused);
    EXPECT_THAT(err.str(), HasSubstr("not permitted: this is for others"));
    EXPECT_THAT(out.str(), IsEmpty());
  }
}

TEST_F(WatchCommandsTest, BothSayWhereNoDaemonListens) {
  setenv("TONEWERK_REPORTING_SOCKET", "/nowhere", 1);
  for (const char* command : {"top", "tail"}) {
    EXPECT_EQ(run({command}), kNoDaemon);
    EXPECT_THAT(err.str(), HasSubstr("no daemon listens on /nowhere"));
  }
}

TEST_F(WatchCommandsTest, BothRefuseWrongUsage) {
  for (const std::vector<const char*>& wrong :
       std::vector<std::vector<const char*>>{{"top", "more"},
                                             {"top", "--interval", "0"},
                                             {"top", "--interval", "x"},
                                             {"tail", "more"},
                                             {"tail", "--id", "x"},
                                             {"tail", "--count", "0"},
                                             {"tail", "--service", "telefony"},
                                             {"tail", "--category", "No"},
                                             {"tail", "--type", "No"}}) {
    EXPECT_EQ(run(wrong), kWrongUsage) << testing::PrintToString(wrong);
    EXPECT_THAT(err.str(), testing::Not(IsEmpty()));
  }
  EXPECT_THAT(daemon.requests(), IsEmpty());
}

TEST_F(WatchCommandsTest, TailPrintsSoManyMessagesAndWhatWasMissedBeforeThem) {
  answerMessages(3, {message(1), message(2)});
  EXPECT_EQ(run({"tail", "--count", "3"}), kDone);
  const std::string line = "2025-11-20 10:20:00.500Z  77  telephony  Playback/Start  ";
  EXPECT_EQ(out.str(), "... missed 3 messages\n" + line + "{\"number\":1}\n" + line + "{\"number\":2}\n" +
                           "... missed 3 messages\n" + line + "{\"number\":1}\n");
}

TEST_F(WatchCommandsTest, TailShowsTheServicesThatAreChosen) {
  ValueMap other = message(1);
  other.set("serviceType", 4);
  answerMessages(0, {other, message(2)});
  EXPECT_EQ(run({"tail", "-n", "1", "--service", "tele*"}), kDone);
  EXPECT_EQ(out.str(), "2025-11-20 10:20:00.500Z  77  telephony  Playback/Start  {\"number\":2}\n");
}

TEST_F(WatchCommandsTest, TailShowsTheApplicationsAndTheDevicesThatAreChosen) {
  const auto from = [](int number, const char* application, const char* device) {
    ValueMap made = message(number);
    made.set("application", application);
    made.set("device", device);
    return Value(made);
  };
  ValueMap nowhere = message(4);
  nowhere.set("application", "org.example.Player");
  answerMessages(0, {from(1, "org.example.Player", "Speaker"), from(2, "org.example.Phone", "Headphones"),
                     from(3, "org.example.Player", "Headphones"), nowhere});
  EXPECT_EQ(run({"tail", "-n", "2", "--app", "*.Ph*"}), kDone);
  EXPECT_THAT(out.str(), testing::MatchesRegex("[^\n]*\"number\":2}\n[^\n]*\"number\":2}\n"));
  EXPECT_EQ(run({"tail", "-n", "2", "--app", "*.Player", "--device", "Head*"}), kDone);
  EXPECT_THAT(out.str(), testing::MatchesRegex("[^\n]*\"number\":3}\n[^\n]*\"number\":3}\n"));
}

class ListCommandTest : public WatchCommandsTest {
 protected:
  ListCommandTest() {
    answerSessions({sessionOf(1, 2, "org.example.Phone", "Speaker"),
                    sessionOf(2, 4, "org.example.Player", "Headphones, Speaker"),
                    sessionOf(3, 2, "org.example.Player", nullptr), single()});
  }

  static Value sessionOf(std::int64_t reporter, int service, const char* application, const char* device) {
    ValueMap session{{"reporterID", reporter}, {"serviceType", service}, {"application", application}};
    if (device != nullptr) session.set("device", device);
    return session;
  }
  static Value single() {
    return ValueMap{{"reporterID", 4},
                    {"serviceType", 2},
                    {"application", "org.example.Player"},
                    {"singleMessageSession", true}};
  }
  std::string identifiersOf(std::vector<const char*> choices) {
    choices.insert(choices.begin(), {"list", "--json"});
    EXPECT_EQ(run(choices), kDone) << err.str();
    std::string identifiers;
    std::istringstream lines(out.str());
    for (std::string line; std::getline(lines, line);) {
      std::string problem;
      identifiers += json.parse(line, problem)->asMap()->text("reporterID") + " ";
    }
    return identifiers;
  }
};

TEST_F(ListCommandTest, ChoosesTheApplicationsAndTheDevicesOfSessions) {
  EXPECT_EQ(identifiersOf({"--app", "*.Player"}), "2 3 ");
  EXPECT_EQ(identifiersOf({"--app", "*.Player", "--service", "telephony"}), "3 ");
  EXPECT_EQ(identifiersOf({"--device", "*Speaker"}), "1 2 ");
  EXPECT_EQ(identifiersOf({"--device", "Head*", "--app", "*Phone"}), "");
  EXPECT_THAT(daemon.requestsFor("getAllReporters"), IsEmpty());
}

TEST_F(ListCommandTest, SaysWhoMayNotChooseApplications) {
  daemon.refuse("watch.sessions", kRefusal);
  EXPECT_EQ(run({"list", "--app", "*"}), kRefused);
  EXPECT_THAT(err.str(), HasSubstr("not permitted: this is for others"));
  EXPECT_EQ(out.str(), "");
}

TEST_F(WatchCommandsTest, SaysWhyAListingLacksAChoiceThatOthersHave) {
  const std::vector<std::pair<std::vector<const char*>, std::string>> refused{
      {{"list", "--since", "1h"}, "--since: the list has the sessions of now"},
      {{"list", "-n", "3"}, "--limit: the list has the sessions of now"},
      {{"list", "--session", "3"}, "--session: the daemon knows a session by its reporter's identifier"},
      {{"tail", "--until", "1h"}, "--until: messages are shown as they arrive"},
      {{"tail", "--session", "3"}, "--session: the daemon knows a session by its reporter's identifier"},
      {{"channels", "--app", "x"}, "--app: drivers count for all programs together"},
      {{"channels", "--device", "x"}, "--device: channels are of drivers; use --driver"},
      {{"channels", "-n", "1"}, "--limit: channels have only their values of now"},
      {{"captures", "--app", "x"}, "--app: what is collected does not say which session it is for"},
      {{"drafts", "list", "--device", "x"}, "--device: what is collected does not say which session"}};
  for (const auto& [command, reason] : refused) {
    EXPECT_EQ(run(command), kWrongUsage) << testing::PrintToString(command);
    EXPECT_THAT(err.str(), HasSubstr("twctl: " + reason));
  }
  EXPECT_THAT(daemon.requests(), IsEmpty());
}

TEST_F(WatchCommandsTest, TailHasTheDaemonFilter) {
  answerMessages(0, {message(1)});
  EXPECT_EQ(run({"tail", "--id", "77", "--id", "-3", "--category", "HAL_Playback", "--type", "Start",
                 "--count", "1"}),
            kDone);
  const Arguments filter = argumentsOf("watch.openMessages");
  ASSERT_THAT(filter, SizeIs(3));
  EXPECT_EQ(filter[0], Value(ValueArray{77, -3}));
  EXPECT_EQ(filter[1]->asArray()->begin()->integer() & 0xFFFF, 4);
  EXPECT_EQ(filter[2], Value(ValueArray{1}));
}

TEST_F(WatchCommandsTest, TailWantsEverythingUnlessItIsTold) {
  answerMessages(0, {message(1)});
  EXPECT_EQ(run({"tail", "--count", "1"}), kDone);
  EXPECT_EQ(argumentsOf("watch.openMessages"), (Arguments{std::nullopt, std::nullopt, std::nullopt}));
}

TEST_F(WatchCommandsTest, TailSaysWhatTheDaemonRefusesLater) {
  daemon.refuse("watch.nextMessages", messagingError(kOverLimit, "enough"));
  EXPECT_EQ(run({"tail"}), kRefused);
  EXPECT_EQ(err.str(), "twctl: watch.nextMessages: enough\n");
}

}  // namespace
}  // namespace tonewerk
