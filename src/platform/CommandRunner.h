// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>

namespace tonewerk {

// Runs the device's command-line tools. Any thread.
class CommandRunner {
 public:
  // What a command may take; past it, it is killed.
  struct Limits {
    std::size_t bytes = 0;  // of output
    std::chrono::milliseconds time{0};
  };

  enum class End {
    kExited,      // `number` is its status
    kSignalled,   // `number` is the signal that it died of
    kTooMuch,     // it had more to say than it may
    kTooLong,     // it took longer than it may
    kNotStarted,  // there is no such command, it may not be run, or there is nothing left to run it with
  };

  struct Result {
    std::string output;  // as far as it came, at most Limits::bytes
    End end = End::kExited;
    int number = 0;
  };

  virtual ~CommandRunner() = default;

  // Runs `command` in a shell, with nothing to read and what it writes to standard error thrown away. Blocks
  // until the shell has ended, and ends with it what it left running.
  [[nodiscard]] virtual Result run(const std::string& command, const Limits& limits) = 0;
};

}  // namespace tonewerk
