// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/ToolLog.h"

namespace tonewerk {

void ToolLog::write(std::string_view /*subsystem*/, std::string_view /*category*/, LogLevel /*level*/,
                    std::string_view message) {
  // Leaves out the prefix with source file and line, which does not help people.
  const std::size_t prefix = logPrefix("", 0).size();
  // The command decides with which status the tool ends.
  (void)tool_.fail(kRefused, message.size() > prefix ? message.substr(prefix) : message);
}

}  // namespace tonewerk
