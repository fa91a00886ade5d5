// SPDX-License-Identifier: Apache-2.0
//
// Tests that a real-time thread's sending avoids forbidden actions, and that the traps for these work.
#include <gmock/gmock.h>
#include <string>
#include <sys/syscall.h>
#include <vector>

#include "platform/linux/commands/BoundedCommand.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using testing::MatchesRegex;

constexpr int kTrapped = 1;
constexpr int kNotPermitted = 3;

BoundedCommand::Result run(const std::string& action, bool trapsSystemCalls) {
  const TemporaryDirectory directory;
  std::vector<std::string> arguments{TONEWERK_TRAPPED_SENDER, directory.path("socket"), action};
  if (!trapsSystemCalls) arguments.emplace_back("without-system-calls");
  return BoundedCommand(std::move(arguments), {std::chrono::seconds(60)}).run();
}

bool isPermitted(const BoundedCommand::Result& result) {
  return result.end != BoundedCommand::End::kExited || result.status != kNotPermitted;
}

class TrappedSenderTest : public testing::Test {
 protected:
  static void expectSent(const BoundedCommand::Result& result) {
    EXPECT_EQ(result.end, BoundedCommand::End::kExited) << result.problem;
    EXPECT_EQ(result.status, 0) << result.output;
    EXPECT_THAT(result.output, MatchesRegex("taken [1-9][0-9]* dropped [1-9][0-9]*\n"));
  }
};

TEST_F(TrappedSenderTest, NeitherAllocatesNorLocks) { expectSent(run("send", false)); }

TEST_F(TrappedSenderTest, MakesNoSystemCall) {
  const BoundedCommand::Result result = run("send", true);
  if (!isPermitted(result)) GTEST_SKIP() << "no system call was trapped, seccomp: " << result.output;
  expectSent(result);
}

TEST_F(TrappedSenderTest, NeitherAllocatesNorLocksToSayWhatTheAudioDoes) {
  EXPECT_EQ(run("say", false).output, "taken 10000 dropped 0\n");
}

TEST_F(TrappedSenderTest, MakesNoSystemCallToSayWhatTheAudioDoes) {
  const BoundedCommand::Result result = run("say", true);
  if (!isPermitted(result)) GTEST_SKIP() << "no system call was trapped, seccomp: " << result.output;
  EXPECT_EQ(result.output, "taken 10000 dropped 0\n");
}

TEST_F(TrappedSenderTest, WouldBeCaughtMakingASystemCall) {
  const BoundedCommand::Result result = run("getppid", true);
  if (!isPermitted(result)) GTEST_SKIP() << "no system call was trapped, seccomp: " << result.output;
  EXPECT_EQ(result.status, kTrapped);
  EXPECT_EQ(result.output, "trapped system call " + std::to_string(SYS_getppid) + "\n");
}

struct Misdeed {
  const char* action;
  const char* function;
};

class CaughtSenderTest : public testing::TestWithParam<Misdeed> {};

TEST_P(CaughtSenderTest, IsCaught) {
  const BoundedCommand::Result result = run(GetParam().action, false);
  EXPECT_EQ(result.end, BoundedCommand::End::kExited) << result.problem;
  EXPECT_EQ(result.status, kTrapped);
  EXPECT_EQ(result.output, std::string("trapped ") + GetParam().function + "\n");
}

INSTANTIATE_TEST_SUITE_P(Misdeeds, CaughtSenderTest,
                         testing::Values(Misdeed{"malloc", "malloc"}, Misdeed{"calloc", "calloc"},
                                         Misdeed{"realloc", "realloc"}, Misdeed{"free", "free"},
                                         Misdeed{"aligned_alloc", "aligned_alloc"}, Misdeed{"new", "malloc"},
                                         Misdeed{"delete", "free"}, Misdeed{"mutex", "pthread_mutex_lock"},
                                         Misdeed{"rwlock", "pthread_rwlock_rdlock"},
                                         Misdeed{"spin", "pthread_spin_lock"},
                                         Misdeed{"cond", "pthread_cond_signal"}, Misdeed{"sem", "sem_post"}),
                         [](const auto& tested) { return std::string(tested.param.action); });

}  // namespace
}  // namespace tonewerk
