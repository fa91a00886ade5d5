// SPDX-License-Identifier: Apache-2.0
#include "system/support/ChildProcess.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <gtest/gtest.h>
#include <signal.h>
#include <sstream>
#include <string_view>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "support/TemporaryDirectory.h"

namespace tonewerk {

namespace {

constexpr std::chrono::milliseconds kPollInterval{10};

// Variables that would direct a child to files, sockets or services outside the test.
constexpr std::array<std::string_view, 19> kForeignVariables = {
    "RUNTIME_DIRECTORY",
    "STATE_DIRECTORY",
    "LOGS_DIRECTORY",
    "CONFIGURATION_DIRECTORY",
    "LISTEN_FDS",
    "LISTEN_PID",
    "LISTEN_FDNAMES",
    "JOURNAL_STREAM",
    "NOTIFY_SOCKET",
    "TONEWERK_LOG",
    "WATCHDOG_USEC",
    "WATCHDOG_PID",
    "XDG_STATE_HOME",
    "XDG_CONFIG_HOME",
    "PIPEWIRE_REMOTE",
    "TONEWERK_REPORTING_SOCKET",
    "DBUS_SESSION_BUS_ADDRESS",
    "DBUS_SYSTEM_BUS_ADDRESS",
    "DBUS_STARTER_ADDRESS",
};

// An address without a D-Bus, used in place of the machine's bus.
constexpr const char* kSystemBusVariable = "DBUS_SYSTEM_BUS_ADDRESS";
constexpr const char* kNoBus = "unix:path=/nonexistent/bus";

std::vector<std::string> environmentFor(const std::map<std::string, std::string>& changes) {
  std::vector<std::string> result;
  for (char** entry = environ; *entry != nullptr; ++entry) {
    const std::string_view text(*entry);
    const std::string name(text.substr(0, text.find('=')));
    bool isForeign = changes.contains(name);
    for (const std::string_view foreign : kForeignVariables) isForeign = isForeign || name == foreign;
    if (!isForeign) result.emplace_back(text);
  }
  if (!changes.contains(kSystemBusVariable)) {
    result.emplace_back(kSystemBusVariable).append("=").append(kNoBus);
  }
  for (const auto& [name, value] : changes) result.emplace_back(name).append("=").append(value);
  return result;
}

std::vector<char*> pointersTo(std::vector<std::string>& texts) {
  std::vector<char*> pointers;
  pointers.reserve(texts.size() + 1);
  for (std::string& text : texts) pointers.push_back(text.data());
  pointers.push_back(nullptr);
  return pointers;
}

bool redirect(const std::string& path, int descriptor) {
  const int file = open(path.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_NOCTTY | O_CLOEXEC, 0644);
  return file >= 0 && dup2(file, descriptor) >= 0;
}

// Runs in the child between fork and exec; only async-signal-safe calls are allowed.
[[noreturn]] void become(char* const* arguments, char* const* environment, const std::string& inputPath,
                         const std::string& outputPath, const std::string& errorPath, pid_t parent) {
  setpgid(0, 0);
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  const int input = open(inputPath.c_str(), O_RDONLY | O_NOCTTY);
  const bool isReady = getppid() == parent && input >= 0 && dup2(input, STDIN_FILENO) >= 0 &&
                       redirect(outputPath, STDOUT_FILENO) && redirect(errorPath, STDERR_FILENO);
  if (isReady) execvpe(arguments[0], arguments, environment);
  _exit(127);
}

}  // namespace

bool waitUntil(const std::function<bool()>& condition, std::chrono::milliseconds timeout) {
  const auto end = std::chrono::steady_clock::now() + timeout;
  while (!condition()) {
    if (std::chrono::steady_clock::now() >= end) return false;
    std::this_thread::sleep_for(kPollInterval);
  }
  return true;
}

ChildProcess::~ChildProcess() { kill(); }

bool ChildProcess::start(const ChildCommand& command, const std::string& outputPath,
                         const std::string& errorPath) {
  kill();
  std::vector<std::string> arguments{command.program};
  arguments.insert(arguments.end(), command.arguments.begin(), command.arguments.end());
  std::vector<std::string> environment = environmentFor(command.environment);
  const std::vector<char*> argumentPointers = pointersTo(arguments);
  const std::vector<char*> environmentPointers = pointersTo(environment);
  const pid_t parent = getpid();

  status_.reset();
  identifier_ = fork();
  if (identifier_ == 0)
    become(argumentPointers.data(), environmentPointers.data(), command.input, outputPath, errorPath, parent);
  if (identifier_ < 0) {
    ADD_FAILURE() << "cannot start " << command.program << ": " << std::strerror(errno);
    return false;
  }
  setpgid(identifier_, identifier_);  // in the parent too, so that kill() finds the group at once
  return true;
}

bool ChildProcess::isRunning() { return identifier_ > 0 && !reap(); }

void ChildProcess::signal(int number) const {
  if (identifier_ > 0 && !status_) ::kill(identifier_, number);
}

std::optional<int> ChildProcess::wait(std::chrono::milliseconds timeout) {
  if (identifier_ <= 0) return std::nullopt;
  waitUntil([this] { return reap(); }, timeout);
  return status_;
}

void ChildProcess::kill() {
  if (identifier_ <= 0) return;
  ::kill(-identifier_, SIGKILL);
  waitUntil([this] { return reap(); });
  identifier_ = -1;
}

bool ChildProcess::reap() {
  if (status_) return true;
  int status = 0;
  const pid_t ended = waitpid(identifier_, &status, WNOHANG);
  if (ended != identifier_) return false;
  status_ = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  return true;
}

std::optional<std::string> outputOf(const ChildCommand& command) {
  const TemporaryDirectory directory;
  const std::string output = directory.path("output");
  ChildProcess process;
  if (!process.start(command, output, directory.path("error"))) return std::nullopt;
  if (process.wait() != 0) return std::nullopt;
  return textOfFile(output);
}

std::string textOfFile(const std::string& path) {
  const std::ifstream file(path);
  std::ostringstream text;
  text << file.rdbuf();
  return text.str();
}

}  // namespace tonewerk
