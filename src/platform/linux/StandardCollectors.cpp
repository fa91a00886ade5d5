// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/StandardCollectors.h"

#include <utility>

#include "platform/linux/LoadCollector.h"
#include "platform/linux/LogTailCollector.h"
#include "platform/linux/PipeWireGraphCollector.h"
#include "platform/linux/ProcessTableCollector.h"
#include "platform/linux/SoundStatusCollector.h"

namespace tonewerk {

std::vector<std::shared_ptr<DiagnosticCollector>> makeStandardCollectors(
    std::shared_ptr<const RecentLines> logLines) {
  return {std::make_shared<LoadCollector>(), std::make_shared<LogTailCollector>(std::move(logLines)),
          std::make_shared<ProcessTableCollector>(), std::make_shared<SoundStatusCollector>(),
          std::make_shared<PipeWireGraphCollector>()};
}

}  // namespace tonewerk
