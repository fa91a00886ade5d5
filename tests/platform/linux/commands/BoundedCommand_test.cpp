// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/commands/BoundedCommand.h"

#include <cerrno>
#include <csignal>
#include <gmock/gmock.h>
#include <poll.h>
#include <string>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/TextFile.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;
using testing::MatchesRegex;
using testing::SizeIs;
using End = BoundedCommand::End;

constexpr BoundedCommand::Limits kLimits{30s, 1 << 20};
constexpr BoundedCommand::Limits kShort{200ms, 1 << 20};

BoundedCommand::Result shell(const std::string& line, const BoundedCommand::Limits& limits = kLimits) {
  return BoundedCommand::shell(line, limits).run();
}

bool hasChildren() {
  siginfo_t information{};
  return waitid(P_ALL, 0, &information, WEXITED | WNOHANG | WNOWAIT) == 0 || errno != ECHILD;
}

bool isRunning(const std::string& process) {
  std::string status;
  if (readTextFile("/proc/" + process + "/stat", status)) return false;
  return status.find(") Z") == std::string::npos;  // a zombie has ended; its new parent will reap it
}

// Waits for the end of a process that was killed before, which may take the kernel a moment.
bool hasEndedSoon(const std::string& process) {
  const FileDescriptor watch(static_cast<int>(syscall(SYS_pidfd_open, std::stoi(process), 0)));
  if (!watch) return errno == ESRCH;
  pollfd waited{watch.get(), POLLIN, 0};
  return poll(&waited, 1, 30'000) == 1;
}

TEST(BoundedCommandTest, GivesTheOutputAndTheStatus) {
  const BoundedCommand::Result result = shell("echo out; echo err >&2; exit 3");
  EXPECT_EQ(result.end, End::kExited);
  EXPECT_EQ(result.status, 3);
  EXPECT_EQ(result.output, "out\n");
  EXPECT_EQ(result.problem, "ended with status 3");
}

TEST(BoundedCommandTest, HasNoProblemWithStatusZero) {
  const BoundedCommand::Result result = BoundedCommand({"echo", "a b"}, kLimits).run();
  EXPECT_EQ(result.end, End::kExited);
  EXPECT_EQ(result.output, "a b\n");
  EXPECT_EQ(result.problem, "");
}

TEST(BoundedCommandTest, SaysWhenThereIsNoSuchProgram) {
  const BoundedCommand::Result result = BoundedCommand({"/nowhere/tool"}, kLimits).run();
  EXPECT_EQ(result.end, End::kNotStarted);
  EXPECT_EQ(result.problem, "No such file or directory");
  EXPECT_EQ(BoundedCommand({}, kLimits).run().end, End::kNotStarted);
  EXPECT_FALSE(hasChildren());
}

TEST(BoundedCommandTest, GivesTheShellsStatusForACommandItCannotStart) {
  EXPECT_EQ(shell("/nowhere/tool").status, 127);
  EXPECT_EQ(shell("/etc/passwd").status, 126);
}

TEST(BoundedCommandTest, SaysWhichSignalEndedIt) {
  const BoundedCommand::Result result = shell("echo before; kill -SEGV $$");
  EXPECT_EQ(result.end, End::kSignalled);
  EXPECT_EQ(result.status, SIGSEGV);
  EXPECT_EQ(result.output, "before\n");
  EXPECT_EQ(result.problem, "ended by signal 11");
}

TEST(BoundedCommandTest, EndsAHangingProgramAndKeepsItsOutput) {
  const BoundedCommand::Result result = shell("echo before; exec sleep 1000", kShort);
  EXPECT_EQ(result.end, End::kTimedOut);
  EXPECT_EQ(result.output, "before\n");
  EXPECT_EQ(result.problem, "timed out after 200 ms");
  EXPECT_FALSE(hasChildren());
}

TEST(BoundedCommandTest, EndsAProgramThatIgnoresSignals) {
  EXPECT_EQ(shell("trap '' TERM INT HUP PIPE; while :; do :; done", kShort).end, End::kTimedOut);
  EXPECT_FALSE(hasChildren());
}

TEST(BoundedCommandTest, EndsAHangingProgramThatHasClosedItsOutput) {
  EXPECT_EQ(shell("exec >&-; exec sleep 1000", kShort).end, End::kTimedOut);
  EXPECT_FALSE(hasChildren());
}

TEST(BoundedCommandTest, EndsAProgramThatWritesWithoutEnd) {
  const BoundedCommand::Result result = shell("exec yes", {30s, 100'000});
  EXPECT_EQ(result.end, End::kTooMuchOutput);
  EXPECT_THAT(result.output, SizeIs(100'000));
  EXPECT_EQ(result.problem, "wrote more than 100000 bytes");
  EXPECT_FALSE(hasChildren());
}

TEST(BoundedCommandTest, TakesOutputUpToTheLimit) {
  EXPECT_EQ(shell("printf 1234567890", {30s, 10}).end, End::kExited);
  const BoundedCommand::Result over = shell("printf 12345678901", {30s, 10});
  EXPECT_EQ(over.end, End::kTooMuchOutput);
  EXPECT_EQ(over.output, "1234567890");
}

TEST(BoundedCommandTest, TakesMoreThanAPipeHolds) {
  const BoundedCommand::Result result = shell("head -c 500000 /dev/zero");
  EXPECT_EQ(result.end, End::kExited);
  EXPECT_THAT(result.output, SizeIs(500'000));
}

TEST(BoundedCommandTest, DoesNotWaitForAGrandchildThatHoldsThePipe) {
  // Waiting for it would time out.
  const BoundedCommand::Result result = shell("sleep 1000 & echo $!");
  EXPECT_EQ(result.end, End::kExited);
  EXPECT_TRUE(hasEndedSoon(result.output.substr(0, result.output.find('\n'))));
}

TEST(BoundedCommandTest, DoesNotWaitForAGrandchildThatLeftTheProcessGroup) {
  // The shell hasEndedSoon when the grandchild has left the group and written its process identifier.
  const TemporaryDirectory directory;
  const std::string fifo = directory.path("left");
  const BoundedCommand::Result result = shell("mkfifo " + fifo + "; setsid sh -c 'echo $$; echo > " + fifo +
                                              "; exec sleep 1000' & read line < " + fifo);
  EXPECT_EQ(result.end, End::kExited);
  const std::string process = result.output.substr(0, result.output.find('\n'));
  ASSERT_NE(process, "");
  EXPECT_TRUE(isRunning(process));  // the documented exception
  kill(std::stoi(process), SIGKILL);
}

TEST(BoundedCommandTest, EndsTheProgramsChildrenAtTheTimeLimit) {
  const BoundedCommand::Result result = shell("sleep 1000 & echo $!; wait", kShort);
  EXPECT_EQ(result.end, End::kTimedOut);
  EXPECT_TRUE(hasEndedSoon(result.output.substr(0, result.output.find('\n'))));
}

TEST(BoundedCommandTest, GivesTheProgramNoOtherDescriptors) {
  const TemporaryDirectory directory;
  const int open = dup(STDOUT_FILENO);  // without the close-on-exec flag
  ASSERT_GT(open, 2);
  EXPECT_EQ(shell("ls /proc/self/fd | sort -n | tr '\\n' ' '").output, "0 1 2 3 ");  // 3 is ls's own
  close(open);
}

TEST(BoundedCommandTest, GivesTheProgramAnEmptyInputAndDefaultSignals) {
  struct sigaction before {};
  struct sigaction ignore {};
  ignore.sa_handler = SIG_IGN;
  sigaction(SIGPIPE, &ignore, &before);
  const BoundedCommand::Result result = shell("cat; grep -E '^Sig(Blk|Ign)' /proc/self/status");
  sigaction(SIGPIPE, &before, nullptr);
  EXPECT_THAT(result.output, HasSubstr("SigBlk:\t0000000000000000\n"));
  // Checks the first 28 signals, which include SIGPIPE. The C library uses 32 and 33 itself.
  EXPECT_THAT(result.output, MatchesRegex("(.|\n)*SigIgn:\t[0-9a-f]{9}0000000\n"));
}

}  // namespace
}  // namespace tonewerk
