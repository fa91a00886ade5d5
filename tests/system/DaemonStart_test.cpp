// SPDX-License-Identifier: Apache-2.0
//
// Tests the daemon as a program: its options, where it puts its files, which socket it listens on.
#include <filesystem>
#include <map>
#include <signal.h>
#include <string>
#include <sys/socket.h>
#include <sys/stat.h>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "support/TemporaryDirectory.h"
#include "system/support/DaemonTest.h"

namespace tonewerk {
namespace {

using ::testing::HasSubstr;
using ::testing::StartsWith;

bool answersAt(const std::string& socketPath) {
  ReportingClient client;
  std::error_code error = client.connect({socketPath});
  return !error && client.call("getAllReporters", {}, kSystemTimeout, error).has_value();
}

// Runs the daemon without the fixture's directories.
class DaemonStartTest : public ::testing::Test {
 protected:
  void TearDown() override { expectNoSanitizerReport(textOfFile(errorPath())); }

  bool start(const ChildCommand& command) { return process.start(command, outputPath(), errorPath()); }
  // Runs the daemon to its end.
  std::optional<int> run(const std::vector<std::string>& arguments) {
    return start({TONEWERK_DAEMON_PATH, arguments, {}}) ? process.wait() : std::nullopt;
  }
  bool startsToAnswerAt(const std::string& socketPath) {
    return waitUntil([&] { return answersAt(socketPath) || !process.isRunning(); }) && answersAt(socketPath);
  }
  std::optional<int> stop() {
    process.signal(SIGTERM);
    return process.wait();
  }
  std::string path(const std::string& name) const { return directory.path(name); }
  std::string outputPath() const { return path("output"); }
  std::string errorPath() const { return path("error"); }

  const TemporaryDirectory directory;
  ChildProcess process;
};

TEST_F(DaemonStartTest, HelpAndVersionArePrintedAndAnythingElseIsWrongUsage) {
  EXPECT_EQ(run({"--help"}), 0);
  EXPECT_THAT(textOfFile(outputPath()), StartsWith("Usage: twreportingd"));
  EXPECT_EQ(run({"--version"}), 0);
  EXPECT_THAT(textOfFile(outputPath()), HasSubstr("\ntwreportingd 0."));
  EXPECT_EQ(textOfFile(errorPath()), "");
  EXPECT_EQ(run({"--daemon"}), 2);
  EXPECT_EQ(run({"--help", "--version"}), 2);
  EXPECT_EQ(run({""}), 2);
  EXPECT_THAT(textOfFile(errorPath()), HasSubstr("no arguments but --help and --version"));
}

TEST_F(DaemonStartTest, TheServiceManagersDirectoriesAreUsedAndMade) {
  ASSERT_TRUE(start({TONEWERK_DAEMON_PATH,
                     {},
                     {{"RUNTIME_DIRECTORY", path("a/run")},
                      {"STATE_DIRECTORY", path("b/state") + ":" + path("elsewhere")},
                      {"CONFIGURATION_DIRECTORY", path("c/etc")},
                      {"XDG_RUNTIME_DIR", path("xdg-runtime")},
                      {"XDG_STATE_HOME", path("xdg-state")}}}));
  ASSERT_TRUE(startsToAnswerAt(path("a/run/reporting.sock"))) << textOfFile(errorPath());
  EXPECT_TRUE(waitUntil([&] { return std::filesystem::exists(path("b/state/reports.db")); }));
  EXPECT_EQ(stop(), 0);
  EXPECT_FALSE(std::filesystem::exists(path("elsewhere")));
  EXPECT_FALSE(std::filesystem::exists(path("xdg-runtime")));
  EXPECT_FALSE(std::filesystem::exists(path("xdg-state")));
}

TEST_F(DaemonStartTest, TheUsersBaseDirectoriesAreUsedWithoutThem) {
  ASSERT_TRUE(start({TONEWERK_DAEMON_PATH,
                     {},
                     {{"XDG_RUNTIME_DIR", path("runtime")},
                      {"XDG_STATE_HOME", path("state")},
                      {"XDG_CONFIG_HOME", path("config")}}}));
  ASSERT_TRUE(startsToAnswerAt(path("runtime/tonewerk/reporting.sock"))) << textOfFile(errorPath());
  EXPECT_TRUE(waitUntil([&] { return std::filesystem::exists(path("state/tonewerk/reports.db")); }));
  EXPECT_EQ(stop(), 0);
}

TEST_F(DaemonStartTest, ARuntimeDirectoryThatCannotBeMadeIsSaid) {
  ASSERT_TRUE(start({TONEWERK_DAEMON_PATH,
                     {},
                     {{"RUNTIME_DIRECTORY", "/proc/nowhere"}, {"STATE_DIRECTORY", path("state")}}}));
  EXPECT_EQ(process.wait(), 1);
  EXPECT_THAT(textOfFile(errorPath()), HasSubstr("cannot listen: cannot make /proc/nowhere"));
}

class DaemonSocketTest : public RunningDaemonTest {
 protected:
  // Another daemon in the same directories, with a log of its own.
  std::optional<int> runSecond() {
    const ChildCommand command{TONEWERK_DAEMON_PATH,
                               {},
                               {{"RUNTIME_DIRECTORY", daemon.path(DaemonProcess::kRuntime)},
                                {"STATE_DIRECTORY", daemon.path(DaemonProcess::kState)},
                                {"CONFIGURATION_DIRECTORY", daemon.path(DaemonProcess::kConfiguration)}}};
    ChildProcess second;
    return second.start(command, directory.path("output"), directory.path("error")) ? second.wait()
                                                                                    : std::nullopt;
  }

  const TemporaryDirectory directory;
};

TEST_F(DaemonSocketTest, TheSocketIsForItsOwnerAndItsGroup) {
  struct stat found {};
  ASSERT_EQ(stat(daemon.socketPath().c_str(), &found), 0);
  EXPECT_TRUE(S_ISSOCK(found.st_mode));
  EXPECT_EQ(found.st_mode & 07777U, 0660U);
}

TEST_F(DaemonSocketTest, ASecondDaemonRefusesAndNamesTheFirst) {
  DaemonClient client = connect();
  client.create(77, 7);
  EXPECT_EQ(runSecond(), 1);
  EXPECT_THAT(textOfFile(directory.path("error")),
              HasSubstr(daemon.socketPath() + " is in use by twreportingd (" +
                        std::to_string(daemon.process().identifier()) + ")"));
  EXPECT_EQ(client.serviceType(77), 7);
  EXPECT_TRUE(answersAt(daemon.socketPath()));
}

TEST_F(DaemonSocketTest, AnythingElseInTheSocketsPlaceIsLeftAlone) {
  ASSERT_EQ(daemon.stop(), 0);
  std::filesystem::create_directory(daemon.socketPath());
  EXPECT_EQ(runSecond(), 1);
  EXPECT_THAT(textOfFile(directory.path("error")), HasSubstr("is there and no socket"));
  EXPECT_TRUE(std::filesystem::is_directory(daemon.socketPath()));
}

TEST_F(DaemonSocketTest, ASocketThatSomebodyElseMadeMeanwhileIsLeftAlone) {
  std::filesystem::remove(daemon.socketPath());
  std::filesystem::create_directory(daemon.socketPath());
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_TRUE(std::filesystem::is_directory(daemon.socketPath()));
}

// Passes the daemon its socket as the service manager does.
class SocketActivationTest : public DaemonStartTest {
 protected:
  std::string socketPath() const { return path("passed.sock"); }
  std::map<std::string, std::string> environment() const {
    return {{"RUNTIME_DIRECTORY", path("runtime")},
            {"STATE_DIRECTORY", path("state")},
            {"CONFIGURATION_DIRECTORY", path("configuration")}};
  }
};

TEST_F(SocketActivationTest, APassedSocketIsUsedAndNoOtherMade) {
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM, 0));  // inherited
  const auto address = unixAddressOf(socketPath());
  ASSERT_TRUE(address);
  ASSERT_EQ(::bind(socket.get(), generic(*address), sizeof(*address)), 0);
  ASSERT_EQ(::listen(socket.get(), 8), 0);
  const std::string script = "LISTEN_PID=$$ LISTEN_FDS=1; export LISTEN_PID LISTEN_FDS; exec \"$0\" 3<&" +
                             std::to_string(socket.get());
  ASSERT_TRUE(start({"sh", {"-c", script, TONEWERK_DAEMON_PATH}, environment()}));
  ASSERT_TRUE(startsToAnswerAt(socketPath())) << textOfFile(errorPath());
  EXPECT_FALSE(std::filesystem::exists(path("runtime/reporting.sock")));
  EXPECT_THAT(textOfFile(errorPath()), HasSubstr("listening on the socket that systemd passed"));
  EXPECT_EQ(stop(), 0);
  EXPECT_TRUE(std::filesystem::exists(socketPath()));  // only the service manager removes it
}

TEST_F(SocketActivationTest, TheFirstConnectionStartsTheDaemonAndIsAnswered) {
  std::map<std::string, std::string> passed = environment();
  std::vector<std::string> arguments{"--listen=" + socketPath()};
  for (const auto& [name, value] : passed) arguments.push_back("--setenv=" + name);
  arguments.push_back(TONEWERK_DAEMON_PATH);
  ASSERT_TRUE(start({"systemd-socket-activate", arguments, passed}));
  ASSERT_TRUE(waitUntil([&] { return std::filesystem::exists(socketPath()) || !process.isRunning(); }));
  if (!process.isRunning()) GTEST_SKIP() << "there is no systemd-socket-activate here";
  EXPECT_TRUE(startsToAnswerAt(socketPath())) << textOfFile(errorPath());
  EXPECT_EQ(stop(), 0);
}

}  // namespace
}  // namespace tonewerk
