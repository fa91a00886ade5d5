// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/CommandRunner.h"

namespace tonewerk {

// Runs commands with /bin/sh. BoundedCommand describes what happens to a command that does not end. The
// directory of this process's executable is first in PATH, so that the tools beside it are found.
//
// A status of 126 or 127 without output means that the shell could not start the command.
class LinuxCommandRunner final : public CommandRunner {
 public:
  LinuxCommandRunner();

  [[nodiscard]] Result run(const std::string& command, const Limits& limits) override;

 private:
  const std::string ownDirectory_;
};

}  // namespace tonewerk
