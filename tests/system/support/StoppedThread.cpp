// SPDX-License-Identifier: Apache-2.0
#include "system/support/StoppedThread.h"

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <gtest/gtest.h>
#include <sstream>
#include <sys/ptrace.h>
#include <sys/syscall.h>
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

// Whether a stopped thread was waiting for work. One that was at work may hold a lock that others need.
bool isWaiting(pid_t process, pid_t thread, StoppedThread::WaitsIn waitsIn) {
  std::istringstream call(
      textOfFile("/proc/" + std::to_string(process) + "/task/" + std::to_string(thread) + "/syscall"));
  long number = -1;
  call >> number;
  if (waitsIn == StoppedThread::WaitsIn::kFutex) return number == SYS_futex;
  return number == SYS_epoll_wait || number == SYS_epoll_pwait;
}

bool stop(pid_t thread) {
  if (ptrace(PTRACE_INTERRUPT, thread, nullptr, nullptr) != 0) return false;
  int status = 0;
  return waitpid(thread, &status, __WALL) == thread && WIFSTOPPED(status);
}

}  // namespace

StoppedThread::StoppedThread(pid_t process, const std::string& name, WaitsIn waitsIn) {
  // A thread names itself when it begins to run.
  pid_t found = -1;
  EXPECT_TRUE(waitUntil([&] { return (found = findThread(process, name)) > 0; })) << "no thread " << name;
  if (found <= 0) return;
  EXPECT_EQ(ptrace(PTRACE_SEIZE, found, nullptr, nullptr), 0) << std::strerror(errno);
  EXPECT_TRUE(waitUntil([&] {
    if (!stop(found)) return false;
    if (isWaiting(process, found, waitsIn)) return true;
    ptrace(PTRACE_CONT, found, nullptr, nullptr);
    return false;
  })) << "the thread never waits";
  thread_ = found;
}

StoppedThread::~StoppedThread() {
  // A thread that has ended with its process waits to be reaped by us, and the process waits for that.
  if (thread_ > 0 && ptrace(PTRACE_DETACH, thread_, nullptr, nullptr) != 0) {
    waitpid(thread_, nullptr, __WALL);
  }
}

}  // namespace tonewerk
