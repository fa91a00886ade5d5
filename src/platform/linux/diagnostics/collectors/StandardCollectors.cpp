// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/StandardCollectors.h"

#include <utility>

#include "platform/linux/diagnostics/collectors/LoadCollector.h"
#include "platform/linux/diagnostics/collectors/LogTailCollector.h"
#include "platform/linux/diagnostics/collectors/PipeWireGraphCollector.h"
#include "platform/linux/diagnostics/collectors/ProcessTableCollector.h"
#include "platform/linux/diagnostics/collectors/SoundStatusCollector.h"

namespace tonewerk {

std::vector<std::shared_ptr<DiagnosticCollector>> makeStandardCollectors(
    std::shared_ptr<const RecentLines> logLines) {
  return {std::make_shared<LoadCollector>(), std::make_shared<LogTailCollector>(std::move(logLines)),
          std::make_shared<ProcessTableCollector>(), std::make_shared<SoundStatusCollector>(),
          std::make_shared<PipeWireGraphCollector>()};
}

}  // namespace tonewerk
