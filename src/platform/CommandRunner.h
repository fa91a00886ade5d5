// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>

namespace tonewerk {

// Runs the device's command-line tools. Any thread.
class CommandRunner {
 public:
  // The limits of a command. A command that exceeds one of them is killed.
  struct Limits {
    std::size_t bytes = 0;  // of output
    std::chrono::milliseconds time{0};
  };

  enum class End {
    kExited,      // `number` is its status
    kSignalled,   // `number` is the signal that ended it
    kTooMuch,     // its output exceeded Limits::bytes
    kTooLong,     // it ran longer than Limits::time
    kNotStarted,  // it does not exist, may not be run, or the system has no resources to run it
  };

  struct Result {
    std::string output;  // what was read of it, at most Limits::bytes
    End end = End::kExited;
    int number = 0;
  };

  virtual ~CommandRunner() = default;

  // Runs `command` in a shell without input; its standard error is discarded. Blocks until the shell has
  // ended, and then ends all processes that the shell left running.
  [[nodiscard]] virtual Result run(const std::string& command, const Limits& limits) = 0;
};

}  // namespace tonewerk
