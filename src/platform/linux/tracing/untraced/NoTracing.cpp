// SPDX-License-Identifier: Apache-2.0
//
// Defines makeTracing() for builds without LTTng.

#include "platform/linux/tracing/UnavailableTracing.h"

namespace tonewerk {
Tracing makeTracing(const TracingParts&) {
  return makeUnavailableTracing("performance tracing is not built in");
}

bool isTracingBuiltIn() { return false; }

}  // namespace tonewerk
