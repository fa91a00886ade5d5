// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <iosfwd>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/directories/Directories.h"

namespace tonewerk {

class JsonService;

// How twctl ends.
enum ExitStatus : int {
  kDone = 0,
  kRefused = 1,     // refused, not valid, not there, or not to be written
  kWrongUsage = 2,  // a bad recording included
  kNoDaemon = 3,    // nobody answers
};

// What every command works with: where to print, and what the common options say.
struct Tool {
  std::ostream& out;
  std::ostream& err;
  const JsonService& json;
  bool asJson = false;      // --json
  bool systemWide = false;  // --system
  bool outIsTerminal = false;
  int inDescriptor = -1;   // where keys come from; -1 for nowhere
  int outDescriptor = -1;  // of `out`; -1 when it is no file
  int status = kDone;      // of the command that ran

  // Prints "twctl: <problem>" and returns `failure`.
  [[nodiscard]] int fail(ExitStatus failure, std::string_view problem) const;
  // Prints "twctl: warning: <problem>": it has been done all the same.
  void warn(std::string_view problem) const;

  // Of the caller, or of the system's daemon.
  Directories directories() const;
  // Where to look for the daemon, in this order.
  std::vector<std::string> socketPaths() const;
};

}  // namespace tonewerk
