// SPDX-License-Identifier: Apache-2.0
#include "ServerProcess.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace tonewerk {
namespace {

constexpr std::chrono::milliseconds kStep{20};
constexpr std::chrono::seconds kTimeout{60};

// Longer than the store waits to fill a batch.
constexpr int kIdleSteps = 15;
// The most processor time that an idle server uses in a step.
constexpr ServerProcess::Processor kIdleTime = std::chrono::microseconds(200);

std::string textOfFile(const std::string& path) {
  std::ifstream file(path);
  std::ostringstream text;
  text << file.rdbuf();
  return text.str();
}

std::optional<std::uint64_t> numberAfter(const std::string& text, std::string_view label) {
  const std::size_t at = text.find(label);
  if (at == std::string::npos) return std::nullopt;
  return std::strtoull(text.c_str() + at + label.size(), nullptr, 10);
}

// Runs in the child after fork(); only async-signal-safe calls are allowed.
[[noreturn]] void execute(const std::vector<char*>& command, int output) {
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);  // the child never outlives the benchmark
  ::dup2(output, STDOUT_FILENO);
  ::dup2(output, STDERR_FILENO);
  ::execv(command[0], command.data());
  ::_exit(127);
}

}  // namespace

ServerProcess::ServerProcess() {
  std::string name = std::filesystem::temp_directory_path() / "tonewerk-benchmark-XXXXXX";
  if (::mkdtemp(name.data()) == nullptr) throw std::runtime_error("cannot make a temporary directory");
  directory_ = name;
  for (const std::string& made : {stateDirectory(), logsDirectory(), configurationDirectory()}) {
    std::filesystem::create_directory(made);
  }
}

ServerProcess::~ServerProcess() {
  stop();
  std::error_code error;
  std::filesystem::remove_all(directory_, error);
  std::filesystem::remove(outputPath(), error);
}

void ServerProcess::start(const std::string& program, const std::vector<std::string>& arguments,
                          const std::string& socket) {
  run(program, arguments, socket);
  waitUntilIdle();
}

void ServerProcess::crash(const std::string& program) {
  ::kill(process_, SIGKILL);
  ::waitpid(process_, nullptr, 0);
  std::filesystem::remove(socketPath());
  run(program, {}, kSocket);
}

void ServerProcess::run(const std::string& program, const std::vector<std::string>& arguments,
                        const std::string& socket) {
  ::setenv("RUNTIME_DIRECTORY", directory_.c_str(), 1);
  ::setenv("STATE_DIRECTORY", stateDirectory().c_str(), 1);
  ::setenv("LOGS_DIRECTORY", logsDirectory().c_str(), 1);
  ::setenv("CONFIGURATION_DIRECTORY", configurationDirectory().c_str(), 1);
  std::vector<char*> command{const_cast<char*>(program.c_str())};
  for (const std::string& argument : arguments) command.push_back(const_cast<char*>(argument.c_str()));
  command.push_back(nullptr);
  const int output = ::open(outputPath().c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
  process_ = ::fork();
  if (process_ == 0) execute(command, output);
  ::close(output);
  if (process_ < 0) throw std::runtime_error("cannot start " + program);
  const auto deadline = std::chrono::steady_clock::now() + kTimeout;
  while (!std::filesystem::exists(directory_ + "/" + socket)) {
    if (hasEnded()) failWithOutput(program + " has ended");
    if (std::chrono::steady_clock::now() > deadline) failWithOutput(program + " does not listen");
    std::this_thread::sleep_for(kStep);
  }
}

ServerProcess::Processor ServerProcess::processorTime() const {
  clockid_t clock{};
  timespec time{};
  if (::clock_getcpuclockid(process_, &clock) != 0 || ::clock_gettime(clock, &time) != 0) {
    failWithOutput("the server has ended");
  }
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

std::map<std::string, ServerProcess::Processor> ServerProcess::processorTimeByThread() const {
  std::map<std::string, Processor> times;
  std::error_code error;
  for (const auto& thread :
       std::filesystem::directory_iterator("/proc/" + std::to_string(process_) + "/task", error)) {
    std::string name = textOfFile(thread.path() / "comm");
    if (!name.empty()) name.pop_back();
    // The first number is the processor time in nanoseconds.
    times[name] += Processor(std::atoll(textOfFile(thread.path() / "schedstat").c_str()));
  }
  return times;
}

std::size_t ServerProcess::peakMemory() const { return statusBytes("VmHWM:"); }
std::size_t ServerProcess::residentMemory() const { return statusBytes("VmRSS:"); }

std::map<std::string, std::uint64_t> ServerProcess::waitsByThread() const {
  std::map<std::string, std::uint64_t> waits;
  std::error_code error;
  for (const auto& thread :
       std::filesystem::directory_iterator("/proc/" + std::to_string(process_) + "/task", error)) {
    const auto number = numberAfter(textOfFile(thread.path() / "status"), "\nvoluntary_ctxt_switches:");
    if (number) waits[thread.path().filename()] = *number;
  }
  if (waits.empty()) failWithOutput("the server has ended");
  return waits;
}

std::string ServerProcess::output() const { return textOfFile(outputPath()); }

void ServerProcess::waitUntilIdle() const {
  const auto deadline = std::chrono::steady_clock::now() + kTimeout;
  Processor before = processorTime();
  for (int idle = 0; idle < kIdleSteps;) {
    std::this_thread::sleep_for(kStep);
    const Processor now = processorTime();
    idle = now - before < kIdleTime ? idle + 1 : 0;
    before = now;
    if (std::chrono::steady_clock::now() > deadline) failWithOutput("the server does not come to rest");
  }
}

std::size_t ServerProcess::statusBytes(std::string_view label) const {
  const auto kibibytes = numberAfter(textOfFile("/proc/" + std::to_string(process_) + "/status"), label);
  if (!kibibytes) failWithOutput("the server has ended");
  return static_cast<std::size_t>(*kibibytes) * 1024;
}

void ServerProcess::failWithOutput(const std::string& what) const {
  throw std::runtime_error(what + ". It said:\n" + output());
}

bool ServerProcess::hasEnded() {
  if (process_ > 0 && ::waitpid(process_, nullptr, WNOHANG) == process_) process_ = -1;
  return process_ < 0;
}

void ServerProcess::stop() {
  if (process_ < 0) return;
  ::kill(process_, SIGTERM);
  const auto deadline = std::chrono::steady_clock::now() + kTimeout;
  while (!hasEnded()) {
    if (std::chrono::steady_clock::now() > deadline) ::kill(process_, SIGKILL);
    std::this_thread::sleep_for(kStep);
  }
}

}  // namespace tonewerk
