// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Every worker class there is, in the order in which sessions make them.
std::vector<const TWReportingSessionWorkerClass*> allWorkerClasses();

}  // namespace tonewerk
