// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <iosfwd>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/directories/Directories.h"

namespace tonewerk {

class JsonService;

// The exit statuses of twctl.
enum ExitStatus : int {
  kDone = 0,
  kRefused = 1,     // refused, not valid, not found, or cannot be written
  kWrongUsage = 2,  // also a bad recording
  kNoDaemon = 3,    // no daemon answers
};

// Holds what every command needs: the output streams and the common options.
struct Tool {
  std::ostream& out;
  std::ostream& err;
  const JsonService& json;
  bool asJson = false;        // --json
  bool systemWide = false;    // --system
  bool isUtc = false;         // --utc; the process then has that time zone
  bool withoutPager = false;  // --no-pager
  bool outIsTerminal = false;
  std::istream* in = nullptr;  // standard input, for whole texts; null for none
  int inDescriptor = -1;       // the descriptor to read keys from; -1 for none
  int outDescriptor = -1;      // the descriptor of `out`; -1 when it is not a file
  int status = kDone;          // the exit status of the command that ran
  // The command line of another program that `twctl sandbox` is to run.
  std::vector<std::string> foreignWords = {};

  // Prints "twctl: <problem>" and returns `failure`. Escapes what the problem repeats of other programs' and
  // users' words.
  [[nodiscard]] int fail(ExitStatus failure, std::string_view problem) const;
  // Prints "twctl: warning: <problem>", for a problem that did not stop the command.
  void warn(std::string_view problem) const;

  // The caller's directories, or, with --system, those of the system's daemon.
  Directories directories() const;
  // Where to look for the daemon, in this order.
  std::vector<std::string> socketPaths() const;
};

}  // namespace tonewerk
