// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>
#include <vector>

namespace tonewerk {

// Runs a program and collects its standard output, within a time limit and a size limit.
//
//   const BoundedCommand::Result result = BoundedCommand::shell("slabtop --once", {}).run();
//
// Whatever the program does, run() returns shortly after the time limit at the latest. By then
// - the program has ended and is no zombie,
// - everything that it started has ended, except processes that left its process group,
// - the pipe is closed, even if another process still has it open.
// The program gets an empty standard input, this process's environment and working directory, the default
// signal mask and actions, and no other file descriptor. Its standard error is discarded.
class BoundedCommand {
 public:
  struct Limits {
    std::chrono::milliseconds time{10'000};
    std::size_t bytes = std::size_t{4} << 20;
  };

  enum class End {
    kExited,         // by itself, with Result::status
    kSignalled,      // by the signal Result::status, which another process sent or the program caused
    kTimedOut,       // killed at the time limit
    kTooMuchOutput,  // killed at the first byte beyond the limit
    kNotStarted,     // there is no such program, or it may not be executed
  };

  struct Result {
    End end = End::kNotStarted;
    int status = 0;
    std::string output;   // all of it, or what came before the end
    std::string problem;  // for people; empty when it exited with status 0
  };

  // The first argument is the program. It is searched for in PATH when it has no slash.
  BoundedCommand(std::vector<std::string> arguments, const Limits& limits);

  // Runs a command line with /bin/sh. If the shell cannot start a command it exits with status 126 or 127.
  static BoundedCommand shell(std::string commandLine, const Limits& limits);

  // Any thread. Blocks until the program has ended.
  [[nodiscard]] Result run() const;

 private:
  const std::vector<std::string> arguments_;
  const Limits limits_;
};

}  // namespace tonewerk
