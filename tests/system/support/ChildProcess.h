// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace tonewerk {

// Long enough for the slowest machine under a sanitizer. Only a failing test waits this long.
inline constexpr std::chrono::seconds kSystemTimeout{30};

// Evaluates `condition` every few milliseconds. False when it did not become true in time.
bool waitUntil(const std::function<bool()>& condition, std::chrono::milliseconds timeout = kSystemTimeout);

// Describes a process to start. Its environment is that of this process, changed by `environment`. Variables
// that systemd or a test runner set for this process are removed, and so is the machine's D-Bus.
struct ChildCommand {
  std::string program;  // searched in PATH when it has no slash
  std::vector<std::string> arguments;
  std::map<std::string, std::string> environment;
  std::string input = "/dev/null";
};

// Runs a process for a test. The process never outlives the test: it is killed with its whole group when the
// object is destroyed, and by the kernel when the test's own process dies.
class ChildProcess {
 public:
  ChildProcess() = default;
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;
  ~ChildProcess();

  // Its standard output and standard error are appended to `outputPath` and `errorPath`. False, and a test
  // failure, when it cannot be started.
  bool start(const ChildCommand& command, const std::string& outputPath, const std::string& errorPath);

  pid_t identifier() const { return identifier_; }
  bool isRunning();
  void signal(int number) const;
  // Its exit status, or 128 plus the signal that ended it; none when it did not end in time.
  std::optional<int> wait(std::chrono::milliseconds timeout = kSystemTimeout);
  void kill();

 private:
  bool reap();

  pid_t identifier_ = -1;
  std::optional<int> status_;
};

// Runs a command to its end. Returns its standard output when it exited with 0, else nothing.
std::optional<std::string> outputOf(const ChildCommand& command);

std::string textOfFile(const std::string& path);

}  // namespace tonewerk
