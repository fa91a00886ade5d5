// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/commands/LinuxCommandRunner.h"

#include <chrono>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
#include <thread>
#include <vector>

#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using ::testing::EndsWith;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;
using End = CommandRunner::End;

// Large enough that only the tests of a limit reach it.
constexpr CommandRunner::Limits kLimits{1 << 20, std::chrono::minutes(1)};

class LinuxCommandRunnerTest : public ::testing::Test {
 protected:
  LinuxCommandRunner runner;
  TemporaryDirectory directory;
};

TEST_F(LinuxCommandRunnerTest, GivesWhatACommandOfTheShellWritesAndItsStatus) {
  const auto result = runner.run("echo one; echo 't\"w'\"'o\" | tr a-z A-Z; exit 3", kLimits);
  EXPECT_EQ(result.output, "one\nT\"W'O\n");
  EXPECT_EQ(result.end, End::kExited);
  EXPECT_EQ(result.number, 3);
}

TEST_F(LinuxCommandRunnerTest, GivesOutputByteForByte) {
  const auto result = runner.run(R"(printf 'a\000b\377\nno newline')", kLimits);
  EXPECT_EQ(result.output, std::string("a\0b\377\nno newline", 15));
}

TEST_F(LinuxCommandRunnerTest, AnEmptyCommandExitsWithStatusZero) {
  const auto result = runner.run("", kLimits);
  EXPECT_EQ(result.end, End::kExited);
  EXPECT_EQ(result.number, 0);
  EXPECT_THAT(result.output, IsEmpty());
}

TEST_F(LinuxCommandRunnerTest, AMissingCommandIsNotStarted) {
  EXPECT_EQ(runner.run("/nowhere/tonewerk-no-such-tool", kLimits).end, End::kNotStarted);
}

TEST_F(LinuxCommandRunnerTest, ACommandThatMayNotBeRunIsNotStarted) {
  std::ofstream(directory.path("tool")) << "echo never\n";
  EXPECT_EQ(runner.run(directory.path("tool"), kLimits).end, End::kNotStarted);
}

TEST_F(LinuxCommandRunnerTest, AStatusOf127AfterOutputIsAnExitStatus) {
  const auto result = runner.run("echo said; exit 127", kLimits);
  EXPECT_EQ(result.end, End::kExited);
  EXPECT_EQ(result.number, 127);
  EXPECT_EQ(result.output, "said\n");
}

TEST_F(LinuxCommandRunnerTest, AToolThatWritesWithoutEndIsCutAtTheLimit) {
  const auto result = runner.run("exec yes", kLimits);
  EXPECT_EQ(result.end, End::kTooMuch);
  EXPECT_THAT(result.output, SizeIs(kLimits.bytes));
  EXPECT_THAT(result.output, StartsWith("y\ny\n"));
}

TEST_F(LinuxCommandRunnerTest, AToolThatHangsIsStopped) {
  const auto result =
      runner.run("echo before; sleep 3600; echo after", {kLimits.bytes, std::chrono::milliseconds(500)});
  EXPECT_EQ(result.end, End::kTooLong);
  EXPECT_EQ(result.output, "before\n");
}

TEST_F(LinuxCommandRunnerTest, ReportsTheSignalThatEndedATool) {
  const auto result = runner.run("echo last words; kill -SEGV $$", kLimits);
  EXPECT_EQ(result.end, End::kSignalled);
  EXPECT_EQ(result.number, SIGSEGV);
  EXPECT_EQ(result.output, "last words\n");
}

TEST_F(LinuxCommandRunnerTest, DoesNotWaitForAGrandchildThatKeepsThePipeOpen) {
  const auto result = runner.run("sleep 3600 & echo gone ahead", kLimits);  // waiting for it would time out
  EXPECT_EQ(result.end, End::kExited);
  EXPECT_EQ(result.output, "gone ahead\n");
}

TEST_F(LinuxCommandRunnerTest, ToolsBesideThisExecutableAreFoundFirst) {
  const std::string own = std::filesystem::read_symlink("/proc/self/exe").parent_path();
  EXPECT_THAT(runner.run("sh -c 'echo \"$PATH\"'", kLimits).output, StartsWith(own + ":"));
  const auto found = runner.run("command -v tonewerk_adapter_tests", kLimits);
  EXPECT_THAT(found.output, EndsWith("/tonewerk_adapter_tests\n"));
}

TEST_F(LinuxCommandRunnerTest, ManyThreadsRunCommandsAtOnce) {
  std::vector<std::thread> threads;
  std::vector<std::string> outputs(8);
  for (std::size_t i = 0; i < outputs.size(); ++i) {
    threads.emplace_back(
        [&, i] { outputs[i] = runner.run("echo " + std::to_string(i) + " | cat", kLimits).output; });
  }
  for (auto& thread : threads) thread.join();
  for (std::size_t i = 0; i < outputs.size(); ++i) EXPECT_EQ(outputs[i], std::to_string(i) + "\n");
}

}  // namespace
}  // namespace tonewerk
