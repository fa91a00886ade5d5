// SPDX-License-Identifier: Apache-2.0
#include "system/support/StoppedThread.h"

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <gtest/gtest.h>
#include <sys/ptrace.h>
#include <sys/wait.h>

#include "system/support/ChildProcess.h"

namespace tonewerk {
namespace {

pid_t findThread(pid_t process, const std::string& name) {
  for (const auto& entry :
       std::filesystem::directory_iterator("/proc/" + std::to_string(process) + "/task")) {
    if (textOfFile(entry.path() / "comm") == name + "\n") return std::stoi(entry.path().filename());
  }
  return -1;
}

}  // namespace

StoppedThread::StoppedThread(pid_t process, const std::string& name) {
  // A thread names itself when it begins to run.
  pid_t found = -1;
  EXPECT_TRUE(waitUntil([&] { return (found = findThread(process, name)) > 0; })) << "no thread " << name;
  if (found <= 0) return;
  EXPECT_EQ(ptrace(PTRACE_SEIZE, found, nullptr, nullptr), 0) << std::strerror(errno);
  EXPECT_EQ(ptrace(PTRACE_INTERRUPT, found, nullptr, nullptr), 0) << std::strerror(errno);
  int status = 0;
  EXPECT_EQ(waitpid(found, &status, __WALL), found);
  EXPECT_TRUE(WIFSTOPPED(status)) << status;
  thread_ = found;
}

StoppedThread::~StoppedThread() {
  if (thread_ > 0) ptrace(PTRACE_DETACH, thread_, nullptr, nullptr);
}

}  // namespace tonewerk
