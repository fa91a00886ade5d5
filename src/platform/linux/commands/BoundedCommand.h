// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>
#include <vector>

namespace tonewerk {

// Runs a program and takes what it writes to its standard output, within bounds of time and bytes.
//
//   const BoundedCommand::Result result = BoundedCommand::shell("slabtop --once", {}).run();
//
// Whatever the program does, run() returns at most a moment after its time is over, and then
// - the program has ended and is no zombie,
// - so has everything that it started, except what left its process group,
// - nobody waits for the pipe, even if somebody still has it open.
// The program gets an empty standard input, this process's environment and working directory, the default
// signal mask and actions, and no other file descriptor. What it writes to its standard error is lost.
class BoundedCommand {
 public:
  struct Limits {
    std::chrono::milliseconds time{10'000};
    std::size_t bytes = std::size_t{4} << 20;
  };

  enum class End {
    kExited,         // of its own accord, with Result::status
    kSignalled,      // by the signal Result::status, which was not ours
    kTimedOut,       // ended by us
    kTooMuchOutput,  // ended by us at the first byte beyond the bound
    kNotStarted,     // there is no such program, or it may not be run
  };

  struct Result {
    End end = End::kNotStarted;
    int status = 0;
    std::string output;   // all of it, or as much as came before the end
    std::string problem;  // in words; empty when it exited with status 0
  };

  // The first argument is the program, looked for in PATH when it has no slash.
  BoundedCommand(std::vector<std::string> arguments, const Limits& limits);

  // A command line for /bin/sh. One that the shell cannot start exits with status 126 or 127.
  static BoundedCommand shell(std::string commandLine, const Limits& limits);

  // Any thread. Waits for the program.
  [[nodiscard]] Result run() const;

 private:
  const std::vector<std::string> arguments_;
  const Limits limits_;
};

}  // namespace tonewerk
