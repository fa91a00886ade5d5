// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// Where sd_journal_send() sends. The library's path is fixed, so where no journal runs, the process gets a
// /run of its own with a socket of ours in it.
struct JournalSocket {
  enum class Kind {
    kReal,  // a running journal's
    kOwn,   // nobody's yet: bind `path` and read it
    kNone,  // neither is to be had
  };

  static constexpr const char* kPath = "/run/systemd/journal/socket";

  // Call it before there are threads. `problem` says why there is none.
  [[nodiscard]] static Kind prepare(std::string& problem);
};

}  // namespace tonewerk
