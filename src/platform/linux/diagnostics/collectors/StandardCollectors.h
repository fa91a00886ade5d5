// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <vector>

#include "platform/linux/diagnostics/collectors/DiagnosticCollector.h"

namespace tonewerk {

class RecentLines;

// The collectors that run for every item, quickest first: load, log, processes, sound devices, PipeWire's
// graph.
std::vector<std::shared_ptr<DiagnosticCollector>> makeStandardCollectors(
    std::shared_ptr<const RecentLines> logLines);

}  // namespace tonewerk
