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

// Long enough for the slowest machine under a sanitizer; nothing waits so long unless it fails.
inline constexpr std::chrono::seconds kSystemPatience{30};

// Asks `condition` every few milliseconds. False when it did not come true in time.
bool waitUntil(const std::function<bool()>& condition, std::chrono::milliseconds timeout = kSystemPatience);

// What a process is started with. The environment is this process's, without what systemd or a test runner
// put there for itself and without the machine's D-Bus, changed by `environment`.
struct ChildCommand {
  std::string program;  // looked for in PATH when it has no slash
  std::vector<std::string> arguments;
  std::map<std::string, std::string> environment;
  std::string input = "/dev/null";
};

// A process of a test. Dies with the test, however that ends: it is killed when the object is destroyed, with
// all of its group, and by the kernel when the test's own process dies.
class ChildProcess {
 public:
  ChildProcess() = default;
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;
  ~ChildProcess();

  // Its standard output and standard error go, appended, to `outputPath` and `errorPath`. False, and a test
  // failure, when it cannot be started.
  bool start(const ChildCommand& command, const std::string& outputPath, const std::string& errorPath);

  pid_t identifier() const { return identifier_; }
  bool isRunning();
  void signal(int number) const;
  // Its exit status, or 128 and the signal that ended it; none when it did not end in time.
  std::optional<int> wait(std::chrono::milliseconds timeout = kSystemPatience);
  void kill();

 private:
  bool reap();

  pid_t identifier_ = -1;
  std::optional<int> status_;
};

// Runs a command to its end. Its standard output when it exited with 0, else nothing.
std::optional<std::string> outputOf(const ChildCommand& command);

std::string textOfFile(const std::string& path);

}  // namespace tonewerk
