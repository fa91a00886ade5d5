// SPDX-License-Identifier: Apache-2.0
//
// Defines makeTracing() for builds with LTTng.

#include "platform/linux/tracing/Tracing.h"
#include "platform/linux/tracing/lttng/LttngRuntrace.h"
#include "platform/linux/tracing/lttng/TraceReaderKolvi.h"

namespace tonewerk {

Tracing makeTracing(const TracingParts& parts) {
  return {std::make_unique<LttngRuntrace>(parts), std::make_unique<TraceReaderKolvi>(parts.traceReader)};
}

bool isTracingBuiltIn() { return true; }

}  // namespace tonewerk
