// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/CommandRunner.h"

namespace tonewerk {

// Commands of /bin/sh; what happens to one that does not end is said at BoundedCommand. In PATH, the
// directory of this process's executable comes first, so that the tools that lie beside it are found.
//
// A status of 126 or 127 without any output is the shell's word for a command that could not be started.
class LinuxCommandRunner final : public CommandRunner {
 public:
  LinuxCommandRunner();

  [[nodiscard]] Result run(const std::string& command, const Limits& limits) override;

 private:
  const std::string ownDirectory_;
};

}  // namespace tonewerk
