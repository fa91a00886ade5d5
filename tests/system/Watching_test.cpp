// SPDX-License-Identifier: Apache-2.0
//
// Tests watching a running daemon: its requests, and twctl top and tail as programs.
#include <csignal>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "service/TapSubscriber.h"
#include "support/OtherUser.h"
#include "support/TemporaryDirectory.h"
#include "system/support/DaemonTest.h"
#include "system/support/PseudoTerminal.h"
#include "system/support/Vt52Screen.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kTelephony = 2;
constexpr AudioEventCategory kPlayback = 4;
constexpr AudioEventCategory kVolume = 14;
const Arguments kNoFilter{std::nullopt, std::nullopt, std::nullopt};

class WatchingTest : public DaemonTest {
 protected:
  void SetUp() override {
    daemon.setEnvironment("TONEWERK_LOG", "info");  // logs who watches
    // Without this a sanitizer keeps more memory than the daemon may use.
    daemon.setEnvironment("ASAN_OPTIONS", "quarantine_size_mb=8");
    ASSERT_TRUE(daemon.start());
  }

  // Returns a client with a started session.
  DaemonClient player() {
    DaemonClient client = connect();
    client.create(kSession, kTelephony);
    client.setConfiguration(kSession, {{"HostApplicationDisplayID", "com.example.phone"}});
    client.start(kSession);
    return client;
  }
  static void send(DaemonClient& client, int number, AudioEventCategory category = kPlayback) {
    client.send({{"number", number}}, category, kTypeStart, {kSession});
  }

  static void open(DaemonClient& watcher) {
    EXPECT_EQ(watcher.call("watch.openMessages", kNoFilter).result, Value(true));
  }
  static ValueMap nextAnswer(DaemonClient& watcher) {
    const Answer answer = watcher.call("watch.nextMessages");
    return answer.result && answer.result->asMap() ? *answer.result->asMap() : ValueMap();
  }
  static std::vector<std::int64_t> numbersIn(const ValueMap& answer) {
    std::vector<std::int64_t> numbers;
    for (const Value& message : *answer.find("messages")->asArray()) {
      numbers.push_back(message.asMap()->find("payload")->asMap()->integer("number"));
    }
    return numbers;
  }

  ChildCommand twctl(const std::vector<std::string>& arguments) const {
    return {TONEWERK_TWCTL_PATH, arguments, daemon.clientEnvironment()};
  }
  // Starts twctl tail and waits until it watches.
  void startTail(std::vector<std::string> arguments) {
    const std::size_t before = logLinesWith("watches messages");
    arguments.insert(arguments.begin(), "tail");
    ASSERT_TRUE(tool.start(twctl(arguments), directory.path("output"), directory.path("errors")));
    ASSERT_TRUE(waitUntil([&] { return logLinesWith("watches messages") > before; }));
  }
  std::string output() const { return textOfFile(directory.path("output")); }
  std::string errors() const { return textOfFile(directory.path("errors")); }
  std::vector<json> objects() const {
    std::vector<json> found;
    std::istringstream lines(output());
    for (std::string line; std::getline(lines, line);) found.push_back(json::parse(line, nullptr, false));
    return found;
  }

  TemporaryDirectory directory;
  ChildProcess tool;
};

// Tests of the requests.

TEST_F(WatchingTest, AWatcherThatDoesNotAskMissesTheOldestAndHoldsNoMoreThanItsBound) {
  DaemonClient client = player();
  DaemonClient watcher = connect();
  open(watcher);
  const std::string text(200'000, 'x');
  constexpr int kSent = 2000;  // 400 MB
  const std::size_t before = daemon.residentBytes();
  // Redundant, so that the session keeps one of them.
  for (int number = 0; number < kSent; ++number) {
    client.send({{"number", 1}, {"text", text}}, kPlayback, kTypeStart, {kSession});
  }
  EXPECT_LT(daemon.residentBytes(), before + (std::size_t{100} << 20));
  send(client, 2);
  std::int64_t missed = 0;
  std::vector<std::int64_t> numbers;
  while (numbers.empty() || numbers.back() != 2) {
    const ValueMap answer = nextAnswer(watcher);
    ASSERT_TRUE(answer.contains("messages"));
    missed += answer.integer("missed");
    for (const std::int64_t number : numbersIn(answer)) numbers.push_back(number);
  }
  EXPECT_EQ(missed + static_cast<std::int64_t>(numbers.size()), kSent + 1);
  EXPECT_LE(numbers.size(), TapSubscriber::kMaxBytes / text.size() + 1);
  EXPECT_GT(numbers.size(), 10U);
}

TEST_F(WatchingTest, AWatcherThatDoesNotReadItsAnswersHoldsUpNobody) {
  DaemonClient client = player();
  DaemonClient watcher = connect();
  open(watcher);
  const std::string text(200'000, 'x');
  for (int round = 0; round < 100; ++round) {
    watcher.notify("watch.nextMessages", {});
    watcher.request("watch.nextMessages", {});
    client.send({{"number", 1}, {"text", text}}, kPlayback, kTypeStart, {kSession});
  }
  EXPECT_THAT(client.allReporters(), ElementsAre(kSession));
}

TEST_F(WatchingTest, TheLargestAndTheDeepestMessageThatAnAnswerHoldsArrive) {
  DaemonClient client = player();
  DaemonClient watcher = connect();
  open(watcher);
  // Leaves room for the keys that the session adds.
  client.send({{"number", 1}, {"text", std::string(TapSubscriber::kMaxAnswerBytes - 2000, 'x')}}, kPlayback,
              kTypeStart, {kSession});
  EXPECT_THAT(numbersIn(nextAnswer(watcher)), ElementsAre(1));
  const auto nested = [](std::size_t levels) {
    ValueMap map{{"number", 2}};
    for (std::size_t level = 1; level < levels; ++level) map = ValueMap{{"number", 2}, {"inner", map}};
    return map;
  };
  client.send(nested(TapSubscriber::kMaxPayloadLevels + 1), kPlayback, kTypeStart, {kSession});
  client.send(nested(TapSubscriber::kMaxPayloadLevels), kPlayback, kTypeStart, {kSession});
  const ValueMap answer = nextAnswer(watcher);
  EXPECT_EQ(answer.integer("missed"), 1);
  EXPECT_THAT(numbersIn(answer), ElementsAre(2));
}

TEST_F(WatchingTest, AWatcherThatGoesIsForgotten) {
  DaemonClient client = player();
  DaemonClient stays = connect();
  open(stays);
  {
    DaemonClient gone = connect();
    open(gone);
    gone.notify("watch.nextMessages", {});
  }
  ASSERT_TRUE(waitForLogLine("removing " + std::to_string(::getpid()) + " from the server client list"));
  send(client, 1);
  EXPECT_THAT(numbersIn(nextAnswer(stays)), ElementsAre(1));
}

TEST_F(WatchingTest, AnotherUserIsRefused) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can become somebody else";
  using std::filesystem::perms;
  const std::filesystem::path socket = daemon.socketPath();
  const perms enter = perms::owner_all | perms::group_exec | perms::others_exec;
  std::filesystem::permissions(socket.parent_path().parent_path(), enter);
  std::filesystem::permissions(socket.parent_path(), enter);
  std::filesystem::permissions(socket, perms::all);
  runAsOtherUser([&] {
    DaemonClient stranger = connect();
    stranger.create(78);  // every client may do this
    const std::map<std::string, Arguments> requests{
        {"watch.sessions", {0}}, {"watch.openMessages", kNoFilter}, {"watch.nextMessages", {}}};
    for (const auto& [method, arguments] : requests) {
      const Answer answer = stranger.call(method, arguments);
      EXPECT_EQ(answer.error, messagingError(4, "not permitted: " + method + " is for trusted users"));
    }
  });
  EXPECT_EQ(logLinesWith("watches messages"), 0U);
}

// Tests of twctl top.

TEST_F(WatchingTest, TopPrintsOneFrameIntoAFile) {
  DaemonClient client = player();
  send(client, 1);
  send(client, 1);
  const auto text = outputOf(twctl({"top", "--interval", "0.1"}));
  ASSERT_TRUE(text);
  EXPECT_THAT(*text,
              HasSubstr("1 session, 0.0 messages a second, 0 overloads\nsession  service    application "));
  EXPECT_THAT(*text, HasSubstr("77       telephony  com.example.phone  "));
  EXPECT_THAT(*text, HasSubstr("50.0 %"));
  EXPECT_EQ(text->find('\x1b'), std::string::npos);
  const auto line = outputOf(twctl({"top", "--json", "--interval", "0.1"}));
  ASSERT_TRUE(line);
  const json object = json::parse(*line);
  EXPECT_EQ(object["reporterID"], kSession);
  EXPECT_EQ(object["serviceName"], "telephony");
  EXPECT_EQ(object["messages"], 2);
  EXPECT_EQ(object["redundantShare"], 0.5);
  EXPECT_EQ(object["processIdentifier"], ::getpid());
  EXPECT_GE(object["seconds"], 0.0);
}

// Tests of twctl top on a terminal.
class TopOnATerminalTest : public WatchingTest {
 protected:
  void SetUp() override {
    WatchingTest::SetUp();
    before = terminal.modes();
  }

  // A terminal of the type xterm is switched to another screen and back; that of a vt52 has simple controls.
  void startTop(const std::string& type = "xterm", const std::string& interval = "0.1") {
    ChildCommand command = twctl({"top", "--interval", interval});
    command.environment["TERM"] = type;
    command.environment["RUNTIME_DIRECTORY"] = directory.path("runtime");
    command.input = terminal.path();
    ASSERT_TRUE(tool.start(command, terminal.path(), directory.path("errors")));
    if (type == "xterm") {
      ASSERT_TRUE(terminal.waitFor("\x1b[?1049h")) << errors();
      ASSERT_TRUE(terminal.waitFor("0 sessions")) << errors();
    }
  }
  void expectRestored() {
    ASSERT_TRUE(terminal.waitFor("\x1b[?1049l"));
    const termios after = terminal.modes();
    EXPECT_EQ(after.c_lflag, before.c_lflag);
    EXPECT_EQ(after.c_iflag, before.c_iflag);
    EXPECT_EQ(after.c_oflag, before.c_oflag);
    EXPECT_EQ(after.c_cc[VMIN], before.c_cc[VMIN]);
    // The cursor is visible again, after it was hidden for the last time.
    const std::string& written = terminal.written();
    const std::size_t shown = written.rfind("?25h");
    ASSERT_NE(shown, std::string::npos);
    EXPECT_TRUE(written.rfind("\x1b[?25l") == std::string::npos || written.rfind("\x1b[?25l") < shown);
  }
  // What the vt52 shows now.
  Vt52Screen screen() {
    Vt52Screen screen(columns, rows);
    screen.write(terminal.written());
    return screen;
  }
  bool waitForOnScreen(const std::string& text) {
    return waitUntil([&] { return screen().text().find(text) != std::string::npos; });
  }
  bool waitForGoneFromScreen(const std::string& text) {
    return waitUntil([&] { return screen().text().find(text) == std::string::npos; });
  }
  void resize(unsigned short newColumns, unsigned short newRows) {
    columns = newColumns;
    rows = newRows;
    terminal.resize(newColumns, newRows);
  }

  PseudoTerminal terminal;
  termios before{};
  unsigned short columns = 80;
  unsigned short rows = 24;
};

TEST_F(TopOnATerminalTest, RefreshesUntilQIsPressed) {
  DaemonClient client = player();
  resize(140, 24);  // so that nothing is cut
  startTop("vt52");
  ASSERT_TRUE(waitForOnScreen("com.example.phone")) << errors();
  EXPECT_EQ(terminal.modes().c_lflag & ICANON, 0U);
  client.setConfiguration(kSession, {{"HostApplicationDisplayID", "com.example.\x1b[31mred"}});
  ASSERT_TRUE(waitForOnScreen("com.example.\\u001b[31mred")) << screen().text();
  EXPECT_EQ(screen().unknown(), "");
  EXPECT_TRUE(tool.isRunning());
  terminal.press("xq");
  EXPECT_EQ(tool.wait(), 0);
  EXPECT_EQ(terminal.modes().c_lflag, before.c_lflag);
  EXPECT_EQ(errors(), "");
}

TEST_F(TopOnATerminalTest, KeysChangeWhatIsShown) {
  DaemonClient client = player();
  DaemonClient other = connect();
  other.create(78);
  other.setConfiguration(78, {{"HostApplicationDisplayID", "org.example.other"}});
  startTop("vt52");
  ASSERT_TRUE(waitForOnScreen("com.example.phone")) << errors();
  ASSERT_TRUE(waitForOnScreen("org.example.other"));
  terminal.press("?");
  ASSERT_TRUE(waitForOnScreen("sort by the column")) << screen().text();
  terminal.press("x");
  ASSERT_TRUE(waitForOnScreen("com.example.phone"));
  terminal.press("/ORG");
  ASSERT_TRUE(waitForOnScreen("only rows with: ORG_"));
  terminal.press("\r");
  ASSERT_TRUE(waitForOnScreen("sessions with \"ORG\""));
  EXPECT_THAT(screen().text(), testing::Not(HasSubstr("com.example.phone")));
  terminal.press("\x1b");
  ASSERT_TRUE(waitForOnScreen("com.example.phone")) << screen().text();
  terminal.press("1");
  ASSERT_TRUE(waitForGoneFromScreen("session  service"));
  terminal.press("n");
  ASSERT_TRUE(waitForOnScreen("no bridge tells"));
  terminal.press("q");
  EXPECT_EQ(tool.wait(), 0);
}

TEST_F(TopOnATerminalTest, ShowsHowTheAudioDoes) {
  DaemonClient client = player();
  client.send({{"issue_type", "overload"}}, 7, kTypeError, {kSession});
  const std::string channels = directory.path("runtime/channels");
  std::filesystem::create_directories(channels);
  std::ofstream(channels + "/bridge.json") << R"({"driver": "PipeWire1", "channels": [
        {"group": "Tx", "subgroup": "speaker", "name": "Xruns", "unit": "xruns", "format": "simple", "value": 2},
        {"group": "Nodes", "subgroup": "mixer", "name": "Busy", "unit": "permille", "format": "simple", "value": 340}]})";
  startTop("vt52");
  ASSERT_TRUE(waitForOnScreen("1 overload\n")) << screen().text() << errors();
  EXPECT_THAT(screen().text(), HasSubstr("speaker: idle, 2 xruns\n"));
  terminal.press("n");
  ASSERT_TRUE(waitForOnScreen("mixer  34 %")) << screen().text();
  terminal.press("q");
  EXPECT_EQ(tool.wait(), 0);
}

TEST_F(TopOnATerminalTest, EndsWithControlCAndWithSignals) {
  startTop();
  terminal.press("\x03");
  EXPECT_EQ(tool.wait(), 0);
  expectRestored();
  for (const int signal : {SIGINT, SIGTERM, SIGHUP, SIGQUIT}) {
    startTop();
    tool.signal(signal);
    EXPECT_EQ(tool.wait(), 0);
    expectRestored();
  }
}

TEST_F(TopOnATerminalTest, FitsTheWindow) {
  DaemonClient client = connect();
  for (ReporterID reporterID = 1; reporterID <= 5; ++reporterID) client.create(reporterID);
  resize(60, 7);
  startTop("vt52");
  ASSERT_TRUE(waitForOnScreen("... and 3 more")) << screen().text();
  EXPECT_THAT(screen().text(), HasSubstr("overloads"));
  EXPECT_THAT(screen().text(), testing::Not(HasSubstr("redundant")));
  resize(80, 8);
  tool.signal(SIGWINCH);  // the system sends it to a terminal's own processes
  EXPECT_TRUE(waitForOnScreen("... and 2 more")) << screen().text();
  terminal.press("q");
  EXPECT_EQ(tool.wait(), 0);
}

TEST_F(TopOnATerminalTest, RestoresTheTerminalBeforeItSaysThatTheDaemonHasGone) {
  startTop();
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_EQ(tool.wait(), 3);
  expectRestored();
  EXPECT_THAT(errors(), HasSubstr("twctl: the daemon has gone"));
}

TEST_F(TopOnATerminalTest, PrintsOneFrameOnATerminalThatCannotShowPages) {
  DaemonClient client = player();
  for (const char* type : {"dumb", "", "no-such-terminal"}) {
    startTop(type);
    EXPECT_EQ(tool.wait(), 0) << type;
    ASSERT_TRUE(terminal.waitFor("1 session, ")) << type << errors();
    ASSERT_TRUE(terminal.waitFor("com.example.phone")) << type;
    EXPECT_EQ(terminal.written().find('\x1b'), std::string::npos) << type;
    EXPECT_EQ(terminal.modes().c_lflag, before.c_lflag);
  }
}

// Tests of twctl tail.

TEST_F(WatchingTest, TailShowsWhatItsFilterWantsAsItArrives) {
  DaemonClient client = player();
  client.create(78);
  startTail({"--json", "--id", "77", "--category", "Volume", "--type", "Start"});
  send(client, 1, kPlayback);
  send(client, 2, kVolume);
  client.send({{"number", 3}}, kVolume, kTypeStart, {78});
  client.send({{"number", 4}}, kVolume, kTypeStop, {kSession});
  send(client, 2, kVolume);
  ASSERT_TRUE(waitUntil([&] { return objects().size() >= 2; }));
  const auto shown = objects();
  ASSERT_THAT(shown, SizeIs(2));
  EXPECT_EQ(shown[0]["payload"]["number"], 2);
  EXPECT_EQ(shown[0]["redundant"], false);
  EXPECT_EQ(shown[0]["application"], "com.example.phone");
  EXPECT_EQ(shown[0]["categoryName"], "Volume");
  EXPECT_EQ(shown[1]["redundant"], true);
}

TEST_F(WatchingTest, TailEndsAfterSoManyMessages) {
  DaemonClient client = player();
  startTail({"--count", "2"});
  for (int number = 1; number <= 3; ++number) send(client, number);
  EXPECT_EQ(tool.wait(), 0);
  EXPECT_THAT(output(), HasSubstr("  77  telephony  Playback/Start  {\"number\":2,"));
  EXPECT_EQ(output().find("\"number\":3"), std::string::npos);
}

TEST_F(WatchingTest, TailEndsWithSignals) {
  for (const int signal : {SIGINT, SIGTERM}) {
    startTail({});
    tool.signal(signal);
    EXPECT_EQ(tool.wait(), 0);
  }
  EXPECT_EQ(errors(), "");
}

TEST_F(WatchingTest, TailEndsWithTheDaemon) {
  startTail({});
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_EQ(tool.wait(), 3);
  EXPECT_THAT(errors(), HasSubstr("twctl: the daemon has gone"));
}

TEST_F(WatchingTest, TailEndsWhenNobodyReadsIt) {
  const std::string fifo = directory.path("output");
  ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
  FileDescriptor reader(::open(fifo.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  startTail({});
  reader.reset();
  EXPECT_EQ(tool.wait(), 0);
}

TEST_F(WatchingTest, AStoppedTailMissesMessagesAndSaysSo) {
  DaemonClient client = player();
  startTail({});
  tool.signal(SIGSTOP);
  const std::string text(200'000, 'x');
  constexpr int kSent = 100;  // 20 MB; the daemon keeps 4 MiB, a socket some 200 kB
  for (int number = 1; number <= kSent; ++number) {
    client.send({{"number", number}, {"text", text}}, kPlayback, kTypeStart, {kSession});
  }
  tool.signal(SIGCONT);
  ASSERT_TRUE(waitUntil([&] { return output().find("{\"number\":100,") != std::string::npos; }));
  std::istringstream lines(output());
  std::int64_t missed = 0;
  std::int64_t shown = 0;
  for (std::string line; std::getline(lines, line);) {
    std::int64_t count = 0;
    if (std::sscanf(line.c_str(), "... missed %ld message", &count) == 1) {
      missed += count;
    } else {
      ++shown;
    }
  }
  EXPECT_GT(missed, 0);
  EXPECT_EQ(missed + shown, kSent);
}

}  // namespace
}  // namespace tonewerk
