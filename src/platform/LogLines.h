// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace tonewerk {

// Says that the line feeds in what the calling thread logs are ends of lines, as long as it lives. Only for
// text of several lines that the daemon itself has collected, such as the output of a tool: without it a log
// escapes line feeds, so that no name or value from a client can look like a line of the log. Scopes nest.
class LogLines {
 public:
  LogLines();
  LogLines(const LogLines&) = delete;
  LogLines& operator=(const LogLines&) = delete;
  ~LogLines();

  static bool areKept();
};

}  // namespace tonewerk
