// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/LoadCollector.h"

#include "platform/linux/files/TextFile.h"

namespace tonewerk {

DiagnosticCollector::Result LoadCollector::collect() {
  Result result;
  for (const char* name : {"loadavg", "pressure/cpu", "pressure/io", "pressure/memory"}) {
    const std::string path = procDirectory_ + "/" + name;
    std::string text;
    if (const std::error_code error = readTextFile(path, text)) {
      // Some kernels are built without /proc/pressure.
      result.problem += (result.problem.empty() ? "" : "; ") + path + ": " + error.message();
      continue;
    }
    result.text.append("== ").append(path).append("\n").append(text);
  }
  return result;
}

}  // namespace tonewerk
