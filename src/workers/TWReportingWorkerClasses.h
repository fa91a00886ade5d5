// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// All worker classes, in the order in which a session makes its workers.
std::vector<const TWReportingSessionWorkerClass*> allWorkerClasses();

}  // namespace tonewerk
