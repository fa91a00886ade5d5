// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// Prepares the socket to which sd_journal_send() sends. The library's path is fixed. Where no journal runs,
// the process therefore gets a private /run, in which the benchmark makes the socket itself.
struct JournalSocket {
  enum class Kind {
    kReal,  // the socket of a running journal
    kOwn,   // no socket yet: the caller binds kPath and reads from it
    kNone,  // neither is possible
  };

  static constexpr const char* kPath = "/run/systemd/journal/socket";

  // Call it before any thread is started. `problem` gives the reason for kNone.
  [[nodiscard]] static Kind prepare(std::string& problem);
};

}  // namespace tonewerk
