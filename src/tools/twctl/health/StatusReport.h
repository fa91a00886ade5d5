// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/health/BridgeProcesses.h"
#include "tools/twctl/health/DaemonReport.h"
#include "tools/twctl/health/StoreFacts.h"

namespace tonewerk {

// How the daemon and what belongs to it stand at one moment: what `twctl status` shows.
struct StatusReport {
  DaemonReport daemon;
  StoreFacts store;
  double storeMegabytes = 0.0;  // the most that the store may take
  std::vector<BridgeProcess> bridges;
  double now = 0.0;        // seconds since 1970
  std::string ownVersion;  // of twctl

  // An error that the daemon logged longer ago does not count as wrong.
  static constexpr double kRecentSeconds = 3600.0;

  // What is wrong, a sentence each. A limit that a user met is shown, but is not wrong: it is there for that.
  std::vector<std::string> problems() const;

  // The same as one object, for programs.
  ValueMap forPrograms() const;

  // Prints it for people, in lines of at most `width` characters; none for no limit. A path or an address is
  // not broken.
  void print(std::ostream& out, std::optional<std::size_t> width) const;
};

// Whether a line of the daemon's log, as in its answer, is its own and of the last hour.
bool isRecentTrouble(const ValueMap& trouble, double now);

// "1.5 MiB"
std::string sizeText(double bytes);

// "3 d 4 h", "2 min"
std::string durationText(double seconds);

}  // namespace tonewerk
