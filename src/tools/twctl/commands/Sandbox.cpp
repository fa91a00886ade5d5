// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/Sandbox.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <deque>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <string_view>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <system_error>
#include <thread>
#include <unistd.h>
#include <utility>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;

constexpr std::array kSignals = {SIGINT, SIGQUIT, SIGTERM, SIGHUP};
constexpr std::array kDirectories = {"runtime", "state", "logs", "configuration"};

// Variables that would lead the daemon to a service manager, or to the bus of another daemon.
constexpr std::array<std::string_view, 10> kForeignVariables = {
    "LISTEN_FDS",   "LISTEN_PID",     "LISTEN_FDNAMES",           "NOTIFY_SOCKET",        "WATCHDOG_USEC",
    "WATCHDOG_PID", "JOURNAL_STREAM", "DBUS_SESSION_BUS_ADDRESS", "DBUS_STARTER_ADDRESS", "INVOCATION_ID"};
constexpr const char* kSystemBusVariable = "DBUS_SYSTEM_BUS_ADDRESS";

constexpr std::chrono::milliseconds kPoll{20};
// The daemon itself ends within a minute, whatever hangs.
constexpr std::chrono::seconds kLongestEnd{90};
constexpr std::chrono::seconds kLongestStart{60};
constexpr std::size_t kLastWords = 3;  // lines of the daemon's log that are shown

constexpr int kNotExecutable = 126;
constexpr int kNotFound = 127;
constexpr int kSignalled = 128;

// The handler uses these. The command is 0 when none runs.
volatile std::sig_atomic_t runningCommand = 0;
volatile std::sig_atomic_t seenSignal = 0;

std::array<struct sigaction, kSignals.size()>& previousActions() {
  static std::array<struct sigaction, kSignals.size()> actions;
  return actions;
}

extern "C" void onSignal(int number, siginfo_t* information, void* /*context*/) {
  const int error = errno;
  seenSignal = number;
  // The terminal sends its signals to the command, too.
  if (runningCommand > 0 && information->si_code != SI_KERNEL) ::kill(runningCommand, number);
  errno = error;
}

std::vector<std::string> environmentWith(const std::map<std::string, std::string>& changes,
                                         const std::vector<std::string_view>& without) {
  std::vector<std::string> result;
  for (char** entry = environ; *entry != nullptr; ++entry) {
    const std::string_view text(*entry);
    const std::string name(text.substr(0, text.find('=')));
    bool isLeftOut = changes.contains(name);
    for (const std::string_view left : without) isLeftOut = isLeftOut || name == left;
    if (!isLeftOut) result.emplace_back(text);
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

void restoreSignals() {
  for (std::size_t at = 0; at < kSignals.size(); ++at)
    ::sigaction(kSignals[at], &previousActions()[at], nullptr);
}

// Runs in the child after the fork. The daemon is in a group of its own, so that keys such as Ctrl-C do not
// reach it, and ends with this tool.
[[noreturn]] void becomeDaemon(char* const* arguments, char* const* environment, const char* log,
                               pid_t parent) {
  ::setpgid(0, 0);
  ::prctl(PR_SET_PDEATHSIG, SIGTERM);
  restoreSignals();
  const int input = ::open("/dev/null", O_RDONLY);
  const int output = ::open(log, O_WRONLY | O_CREAT | O_APPEND, 0600);
  const bool isReady = ::getppid() == parent && ::dup2(input, STDIN_FILENO) >= 0 &&
                       ::dup2(output, STDOUT_FILENO) >= 0 && ::dup2(output, STDERR_FILENO) >= 0;
  if (isReady) ::execve(arguments[0], arguments, environment);
  ::_exit(kNotFound);
}

[[noreturn]] void becomeCommand(char* const* arguments, char* const* environment) {
  restoreSignals();
  ::execvpe(arguments[0], arguments, environment);
  const int error = errno;
  const std::string problem =
      std::string("twctl: ") + arguments[0] + ": " + std::generic_category().message(error) + "\n";
  if (::write(STDERR_FILENO, problem.data(), problem.size()) < 0) ::_exit(kNotFound);
  ::_exit(error == ENOENT ? kNotFound : kNotExecutable);
}

// Waits for the process; interruptions by signals do not end the waiting.
int statusOf(pid_t process) {
  int status = 0;
  while (::waitpid(process, &status, 0) < 0 && errno == EINTR) {
  }
  return WIFSIGNALED(status) ? kSignalled + WTERMSIG(status) : WEXITSTATUS(status);
}

}  // namespace

Sandbox::Sandbox(std::string daemonProgram) : program_(std::move(daemonProgram)) {
  seenSignal = 0;
  runningCommand = 0;
  struct sigaction action {};
  action.sa_sigaction = onSignal;
  action.sa_flags = SA_SIGINFO;
  sigfillset(&action.sa_mask);
  for (std::size_t at = 0; at < kSignals.size(); ++at)
    ::sigaction(kSignals[at], &action, &previousActions()[at]);
}

Sandbox::~Sandbox() {
  if (daemon_ > 0) {
    ::kill(daemon_, SIGKILL);
    statusOf(daemon_);
  }
  std::error_code ignored;
  if (!isKept_ && !directory_.empty()) std::filesystem::remove_all(directory_, ignored);
  restoreSignals();
}

std::string Sandbox::stateDirectory() const { return directory_ + "/state"; }

std::map<std::string, std::string> Sandbox::environment() const {
  return {{"RUNTIME_DIRECTORY", directory_ + "/runtime"},
          {"STATE_DIRECTORY", stateDirectory()},
          {"LOGS_DIRECTORY", directory_ + "/logs"},
          {"CONFIGURATION_DIRECTORY", directory_ + "/configuration"},
          {"TONEWERK_REPORTING_SOCKET", directory_ + "/runtime/reporting.sock"}};
}

std::string Sandbox::makeDirectories() {
  std::error_code error;
  std::string path = std::filesystem::temp_directory_path(error);
  if (error) return "cannot find a directory for temporary files (TMPDIR): " + error.message();
  path += "/tonewerk-sandbox-XXXXXX";
  if (::mkdtemp(path.data()) == nullptr) return path + ": " + std::generic_category().message(errno);
  directory_ = path;
  for (const char* name : kDirectories) {
    const std::string below = directory_ + "/" + name;
    if (::mkdir(below.c_str(), 0700) != 0) return below + ": " + std::generic_category().message(errno);
  }
  return {};
}

std::string Sandbox::start() {
  if (std::string problem = makeDirectories(); !problem.empty()) return problem;
  if (::access(program_.c_str(), X_OK) != 0) return program_ + ": " + std::generic_category().message(errno);
  std::map<std::string, std::string> variables = environment();
  variables[kSystemBusVariable] = "unix:path=" + directory_ + "/no-bus";
  std::vector<std::string> words{program_};
  std::vector<std::string> texts =
      environmentWith(variables, {kForeignVariables.begin(), kForeignVariables.end()});
  const std::vector<char*> arguments = pointersTo(words);
  const std::vector<char*> entries = pointersTo(texts);
  const std::string log = logPath();
  const pid_t self = ::getpid();
  daemon_ = ::fork();
  if (daemon_ == 0) becomeDaemon(arguments.data(), entries.data(), log.c_str(), self);
  if (daemon_ < 0) return "cannot start a process: " + std::generic_category().message(errno);

  const auto until = std::chrono::steady_clock::now() + kLongestStart;
  while (!accepts()) {
    if (hasEnded(kPoll)) return "the daemon cannot start" + lastWords();
    if (seenSignal != 0) return "interrupted while the daemon started";
    if (std::chrono::steady_clock::now() >= until) return "the daemon does not answer" + lastWords();
  }
  return {};
}

int Sandbox::run(const std::vector<std::string>& command) {
  std::vector<std::string> words = command;
  std::vector<std::string> texts = environmentWith(environment(), {});
  const std::vector<char*> arguments = pointersTo(words);
  const std::vector<char*> entries = pointersTo(texts);
  // A signal must not come between the fork and the knowledge of whom to send it to.
  sigset_t all;
  sigset_t before;
  sigfillset(&all);
  ::sigprocmask(SIG_SETMASK, &all, &before);
  const pid_t process = seenSignal == 0 ? ::fork() : -1;
  if (process == 0) {
    ::sigprocmask(SIG_SETMASK, &before, nullptr);
    becomeCommand(arguments.data(), entries.data());
  }
  runningCommand = process;
  ::sigprocmask(SIG_SETMASK, &before, nullptr);
  if (process < 0) return seenSignal == 0 ? kNotExecutable : kSignalled + seenSignal;
  const int status = statusOf(process);
  runningCommand = 0;
  return status;
}

std::string Sandbox::stop() {
  if (daemon_ <= 0) return {};
  if (hasEnded(0ms)) return {};  // the command has ended it
  ::kill(daemon_, SIGTERM);
  if (hasEnded(kLongestEnd)) return {};
  return "the daemon did not end, so that reports may be missing" + lastWords();
}

bool Sandbox::accepts() const {
  const FileDescriptor probe(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const std::optional<sockaddr_un> address = unixAddressOf(directory_ + "/runtime/reporting.sock");
  return address && ::connect(probe.get(), generic(*address), sizeof(*address)) == 0;
}

bool Sandbox::hasEnded(std::chrono::milliseconds patience) {
  const auto until = std::chrono::steady_clock::now() + patience;
  while (true) {
    int status = 0;
    if (::waitpid(daemon_, &status, WNOHANG) == daemon_) {
      daemon_ = 0;
      return true;
    }
    if (std::chrono::steady_clock::now() >= until) return false;
    std::this_thread::sleep_for(std::min<std::chrono::steady_clock::duration>(patience, kPoll));
  }
}

std::string Sandbox::lastWords() const {
  std::ifstream log(logPath());
  std::deque<std::string> lines;
  for (std::string line; std::getline(log, line);) {
    lines.push_back(line);
    if (lines.size() > kLastWords) lines.pop_front();
  }
  std::string words;
  for (const std::string& line : lines) words += (words.empty() ? ": " : "; ") + line;
  return words;
}

}  // namespace tonewerk
