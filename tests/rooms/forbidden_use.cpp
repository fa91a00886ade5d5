// SPDX-License-Identifier: Apache-2.0
#include <memory>

#include "service/TWReportingService.h"

namespace tonewerk {

// The room `session` may not use the room `service`, which is above it.
std::shared_ptr<TWReportingService> forbiddenUse() {
  return TWReportingService::make([] {});
}

}  // namespace tonewerk
