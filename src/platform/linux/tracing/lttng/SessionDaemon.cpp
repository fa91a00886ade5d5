// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/SessionDaemon.h"

#include <cerrno>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <lttng/lttng.h>
#include <string_view>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <system_error>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using Clock = std::chrono::steady_clock;

constexpr char kProgram[] = "lttng-sessiond";
constexpr seconds kStartTimeout{5};
constexpr seconds kEndTimeout{3};
constexpr milliseconds kPause{5};

std::string systemText(int error) { return std::generic_category().message(error); }

// Runs in the child process. Between fork and exec it may only make calls that are safe there. It writes the
// number of an error to `report`.
[[noreturn]] void becomeSessionDaemon(int logFile, int report, char* const* environment) {
  // The kernel kills the session daemon if this daemon ends unexpectedly.
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  sigset_t none;
  sigemptyset(&none);
  ::sigprocmask(SIG_SETMASK, &none, nullptr);
  ::signal(SIGPIPE, SIG_DFL);
  ::signal(SIGXFSZ, SIG_DFL);
  const int null = ::open("/dev/null", O_RDWR);
  ::dup2(null, STDIN_FILENO);
  ::dup2(null, STDOUT_FILENO);
  ::dup2(logFile >= 0 ? logFile : null, STDERR_FILENO);
  char program[] = "lttng-sessiond";
  char option[] = "--no-kernel";
  char* const arguments[] = {program, option, nullptr};
  ::execvpe(kProgram, arguments, environment);
  const int error = errno;
  static_cast<void>(!::write(report, &error, sizeof(error)));
  ::_exit(127);
}

// Holds this process's environment and one more variable: how many seconds the session daemon waits for a
// program that does not answer. Each such program delays the start and the stop of every trace by that time.
class Environment {
 public:
  Environment() {
    for (char** entry = environ; *entry != nullptr; ++entry) pointers_.push_back(*entry);
    pointers_.push_back(timeout_);
    pointers_.push_back(nullptr);
  }
  char* const* get() { return pointers_.data(); }

 private:
  char timeout_[28] = "LTTNG_APP_SOCKET_TIMEOUT=1";
  std::vector<char*> pointers_;
};

// Waits at most `timeout` until the process has ended. waitpid() is still necessary afterwards.
bool endsWithin(pid_t process, milliseconds timeout) {
  const auto end = Clock::now() + timeout;
  for (;;) {
    siginfo_t info{};
    if (::waitid(P_PID, static_cast<id_t>(process), &info, WEXITED | WNOHANG | WNOWAIT) != 0) return true;
    if (info.si_pid == process) return true;
    if (Clock::now() >= end) return false;
    std::this_thread::sleep_for(kPause);
  }
}

}  // namespace

SessionDaemon::SessionDaemon(std::string logPath, const LogCategory& log)
    : logPath_(std::move(logPath)), log_(log) {}

SessionDaemon::~SessionDaemon() { end(); }

bool SessionDaemon::isPrivate() const {
  const MutexLock lock(mutex_);
  return process_ != 0;
}

std::string SessionDaemon::ensureRunning() {
  if (isPrivate() && hasEnded()) {
    errorLog(log_, "the tracer's session daemon has ended: %@", lastLogLine());
    end();
  }
  const int alive = lttng_session_daemon_alive();
  if (alive == 1) return {};
  if (alive < 0) return std::string("the session daemon cannot be looked for: ") + lttng_strerror(alive);
  end();
  return startPrivate();
}

std::string SessionDaemon::startPrivate() {
  int pipe[2] = {-1, -1};
  if (::pipe2(pipe, O_CLOEXEC) != 0) return "no pipe: " + systemText(errno);
  const FileDescriptor result(pipe[0]);
  FileDescriptor report(pipe[1]);
  const FileDescriptor logFile(
      ::open(logPath_.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0600));
  Environment environment;
  const pid_t process = ::fork();
  if (process == 0) becomeSessionDaemon(logFile.get(), report.get(), environment.get());
  if (process < 0) return "no process for " + std::string(kProgram) + ": " + systemText(errno);
  {
    const MutexLock lock(mutex_);
    process_ = process;
  }
  report.reset();
  int error = 0;
  if (::read(result.get(), &error, sizeof(error)) == sizeof(error)) {
    end();
    return std::string(kProgram) + " cannot be started: " + systemText(error);
  }
  infoLog(log_, "started the tracer's session daemon, process %d", process);
  return waitUntilItAnswers();
}

std::string SessionDaemon::waitUntilItAnswers() {
  const auto end = Clock::now() + kStartTimeout;
  for (;;) {
    if (lttng_session_daemon_alive() == 1) return {};
    if (hasEnded() || Clock::now() >= end) break;
    std::this_thread::sleep_for(kPause);
  }
  const std::string problem = hasEnded() ? " ended at once: " : " does not answer: ";
  this->end();
  return kProgram + problem + lastLogLine();
}

bool SessionDaemon::hasEnded() {
  const MutexLock lock(mutex_);
  return process_ == 0 || endsWithin(process_, milliseconds(0));
}

void SessionDaemon::end() {
  pid_t process = 0;
  {
    const MutexLock lock(mutex_);
    process = process_;
  }
  if (process == 0) return;
  ::kill(process, SIGTERM);
  if (!endsWithin(process, kEndTimeout)) kill();
  // waitpid() is called under the lock, and nowhere else. So kill() cannot hit another process that got the
  // same number.
  const MutexLock lock(mutex_);
  int status = 0;
  while (::waitpid(process, &status, 0) < 0 && errno == EINTR) {
  }
  process_ = 0;
}

void SessionDaemon::kill() {
  const MutexLock lock(mutex_);
  if (process_ != 0) ::kill(process_, SIGKILL);
}

// The last line of the session daemon's log. If it ended by itself, that line is the reason.
std::string SessionDaemon::lastLogLine() const {
  std::string text;
  if (readTextFile(logPath_, text)) return "it has left no reason";
  while (!text.empty() && text.back() == '\n') text.pop_back();
  const std::size_t line = text.rfind('\n');
  if (line != std::string::npos) text.erase(0, line + 1);
  return text.empty() ? "it has left no reason" : text;
}

}  // namespace tonewerk
