// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/PipeWireGraphCollector.h"

#include <utility>

namespace tonewerk {

DiagnosticCollector::Result PipeWireGraphCollector::collect() {
  BoundedCommand::Result result = BoundedCommand(command_, limits_).run();
  if (!result.problem.empty()) return {std::move(result.output), command_.front() + ": " + result.problem};
  if (result.output.empty()) return {"", command_.front() + ": no output"};
  return {std::move(result.output), ""};
}

}  // namespace tonewerk
