// SPDX-License-Identifier: Apache-2.0
#include <memory>

#include "service/TWReportingService.h"

namespace tonewerk {

// A session's room may not use the service's, which stands above it.
std::shared_ptr<TWReportingService> forbiddenUse() {
  return TWReportingService::make([] {});
}

}  // namespace tonewerk
