// SPDX-License-Identifier: Apache-2.0
//
// Tests twctl sandbox as a program: a command with a daemon of its own.
#include <csignal>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <map>
#include <nlohmann/json.hpp>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "system/support/ChildProcess.h"
#include "system/support/PseudoTerminal.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::StartsWith;

class SandboxTest : public testing::Test {
 protected:
  SandboxTest() { std::filesystem::create_directories(directory.path("temporary")); }

  bool start(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "sandbox");
    std::map<std::string, std::string> environment = variables;
    environment.try_emplace("TMPDIR", directory.path("temporary"));
    ChildCommand command{TONEWERK_TWCTL_PATH, arguments, environment};
    command.input = input;
    return tool.start(command, directory.path("output"), directory.path("errors"));
  }
  // Its exit status.
  int run(const std::vector<std::string>& arguments) {
    return start(arguments) ? tool.wait(2 * kSystemTimeout).value_or(-1) : -1;
  }
  std::string output() const { return textOfFile(directory.path("output")); }
  std::string errors() const { return textOfFile(directory.path("errors")); }
  std::set<std::string> left() const {
    std::set<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(directory.path("temporary")))
      names.insert(entry.path());
    return names;
  }

  const TemporaryDirectory directory;
  std::map<std::string, std::string> variables;
  std::string input = "/dev/null";
  ChildProcess tool;
};

TEST_F(SandboxTest, ShowsWhatTheCommandHasReported) {
  ASSERT_EQ(run({TONEWERK_PLAYER_C}), 0) << errors();
  EXPECT_THAT(output(), StartsWith("player: done\n"));
  EXPECT_THAT(output(), HasSubstr("Sessions\n"));
  EXPECT_THAT(output(), testing::ContainsRegex("longformaudio +org.example.Player +stopped +7 +0"));
  EXPECT_THAT(output(), HasSubstr("\nPlayed\n"));
  EXPECT_THAT(output(), testing::ContainsRegex("org.example.Player +[0-9.]+ +0.5 +Speaker +48000 +2 +lpcm"));
  EXPECT_THAT(output(), testing::ContainsRegex("org.example.Player +[0-9.]+ +0.3 +Speaker +48000 +2 +lpcm"));
  EXPECT_THAT(output(), HasSubstr("\nIssues\n"));
  EXPECT_THAT(output(), Not(HasSubstr("\nRecorded\n")));
  EXPECT_EQ(errors(), "");
  EXPECT_THAT(left(), IsEmpty());
}

TEST_F(SandboxTest, ShowsItAsJson) {
  ASSERT_EQ(run({"--json", TONEWERK_PLAYER_CXX}), 0) << errors();
  std::istringstream lines(output());
  std::string line;
  std::getline(lines, line);
  EXPECT_EQ(line, "player: done");
  std::multiset<std::string> views;
  while (std::getline(lines, line)) {
    const json row = json::parse(line);
    views.insert(row.at("view"));
    EXPECT_EQ(row.at("application"), "org.example.Player");
  }
  EXPECT_EQ(views, (std::multiset<std::string>{"issue", "session", "volume_stretch", "volume_stretch"}));
}

TEST_F(SandboxTest, HasTheStatusOfTheCommand) {
  EXPECT_EQ(run({"sh", "-c", "exit 7"}), 7);
  EXPECT_EQ(errors(), "twctl: warning: no session was reported\n");
  EXPECT_THAT(left(), IsEmpty());
}

TEST_F(SandboxTest, HasTheStatusOfACommandThatASignalEnds) {
  EXPECT_EQ(run({"sh", "-c", "kill -KILL $$"}), 128 + SIGKILL);
  EXPECT_THAT(left(), IsEmpty());
}

TEST_F(SandboxTest, SaysThatThereIsNoSuchCommand) {
  EXPECT_EQ(run({"/nonexistent/player"}), 127);
  EXPECT_THAT(errors(), StartsWith("twctl: /nonexistent/player: No such file or directory\n"));
  EXPECT_EQ(run({directory.path("temporary")}), 126);
  EXPECT_THAT(left(), IsEmpty());
}

TEST_F(SandboxTest, LeavesTheCommandItsOptions) {
  ASSERT_EQ(run({"--keep", "echo", "--keep", "--json", "-n", "list"}), 0);
  EXPECT_EQ(output(), "--keep --json -n list\n");
}

TEST_F(SandboxTest, TakesACommandAfterTwoDashes) {
  ASSERT_EQ(run({"--", "echo", "--keep", "--", "list"}), 0) << errors();
  EXPECT_EQ(output(), "--keep -- list\n");
  EXPECT_EQ(run({"--", "sh", "-c", "exit 7"}), 7);
  EXPECT_EQ(run({"--json", "--", "./--no-such"}), 127);
  EXPECT_EQ(run({"--", "--no-such"}), 127);
  ASSERT_EQ(run({"--", TONEWERK_PLAYER_C}), 0) << errors();
  EXPECT_THAT(output(), testing::ContainsRegex("longformaudio +org.example.Player +stopped"));
  EXPECT_THAT(left(), IsEmpty());
}

TEST_F(SandboxTest, KeepsItsDirectoriesWhenAskedTo) {
  ASSERT_EQ(run({"--keep", TONEWERK_PLAYER_C}), 0);
  ASSERT_EQ(left().size(), 1U);
  const std::string kept = *left().begin();
  EXPECT_EQ(errors(), "twctl: kept " + kept + "\n");
  EXPECT_TRUE(std::filesystem::exists(kept + "/state/reports.db"));
  EXPECT_EQ(std::filesystem::status(kept).permissions(), std::filesystem::perms::owner_all);
}

TEST_F(SandboxTest, GivesToolsAndProgramsItsDaemon) {
  const std::string twctl = TONEWERK_TWCTL_PATH;
  ASSERT_EQ(run({"sh", "-c",
                 twctl + " paths socket; echo $TONEWERK_REPORTING_SOCKET; " + twctl +
                     " send --category Playback --type Start a=1; " + twctl + " kill"}),
            0)
      << errors();
  std::istringstream lines(output());
  std::string first;
  std::string second;
  std::getline(lines, first);
  std::getline(lines, second);
  EXPECT_THAT(first, StartsWith(directory.path("temporary")));
  EXPECT_EQ(first, second);
  EXPECT_THAT(left(), IsEmpty());
}

TEST_F(SandboxTest, RunsAShellWithoutACommand) {
  std::ofstream(directory.path("commands")) << TONEWERK_PLAYER_C << "\nexit 3\n";
  input = directory.path("commands");
  variables["SHELL"] = "/bin/sh";
  EXPECT_EQ(run({}), 3) << errors();
  EXPECT_THAT(output(), StartsWith("player: done\nSessions\n"));
}

// A signal to this tool alone, as from a service manager.
TEST_F(SandboxTest, PassesSignalsToTheCommand) {
  for (const int signal : {SIGTERM, SIGINT, SIGHUP}) {
    SCOPED_TRACE(signal);
    const std::string ready = directory.path("ready" + std::to_string(signal));
    const std::string program = "trap 'exit 5' TERM INT HUP; : >" + ready + "; while :; do sleep 0.05; done";
    ASSERT_TRUE(start({"sh", "-c", program}));
    ASSERT_TRUE(waitUntil([&] { return std::filesystem::exists(ready); }));
    tool.signal(signal);
    EXPECT_EQ(tool.wait(2 * kSystemTimeout), 5);
    EXPECT_THAT(left(), IsEmpty());
  }
}

// The terminal sends the key's signal to the tool and to the command. The daemon must outlive it. script(1)
// makes the terminal the one that controls them.
TEST_F(SandboxTest, ShowsTheReportsAfterControlC) {
  PseudoTerminal terminal;
  std::ofstream(directory.path("program"))
      << "trap 'exit 6' INT\n"
      << TONEWERK_PLAYER_C << "\necho ready\nwhile :; do sleep 0.05; done\n";
  ChildCommand command{
      "script",
      {"--quiet", "--return", "--flush", "--command",
       "exec " + std::string(TONEWERK_TWCTL_PATH) + " sandbox sh " + directory.path("program"), "/dev/null"},
      {{"TMPDIR", directory.path("temporary")}, {"TERM", "xterm"}, {"SHELL", "/bin/sh"}}};
  command.input = terminal.path();
  ASSERT_TRUE(tool.start(command, directory.path("output"), directory.path("errors")));
  ASSERT_TRUE(waitUntil([&] { return output().find("ready") != std::string::npos; }, 2 * kSystemTimeout))
      << output();
  terminal.press("\x03");
  EXPECT_EQ(tool.wait(2 * kSystemTimeout), 6) << output();
  EXPECT_THAT(output(), testing::ContainsRegex("org.example.Player +[0-9.]+ +0.5 +Speaker"));
  EXPECT_THAT(left(), IsEmpty());
}

TEST_F(SandboxTest, SaysWhyTheDaemonCannotStart) {
  // A socket's path has at most 107 bytes.
  const std::string deep = directory.path(std::string(100, 'd'));
  std::filesystem::create_directories(deep);
  variables["TMPDIR"] = deep;
  EXPECT_EQ(run({"echo", "never"}), 3);
  EXPECT_EQ(output(), "");
  EXPECT_THAT(errors(), StartsWith("twctl: the daemon cannot start: "));
  EXPECT_THAT(errors(), HasSubstr("reporting.sock"));
  EXPECT_TRUE(std::filesystem::is_empty(deep));
}

TEST_F(SandboxTest, SaysThatThereIsNoPlaceForItsDirectories) {
  variables["TMPDIR"] = directory.path("nothing");
  EXPECT_EQ(run({"echo", "never"}), 3);
  EXPECT_EQ(output(), "");
  EXPECT_THAT(errors(), StartsWith("twctl: "));
}

TEST_F(SandboxTest, RefusesWhatItDoesNotKnow) {
  EXPECT_EQ(run({"--keeep", "echo"}), 2);
  EXPECT_EQ(errors(), "twctl: unknown option '--keeep'\n");
  EXPECT_EQ(run({"--system", "echo"}), 2);
  EXPECT_EQ(output(), "");
  EXPECT_THAT(left(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
