// SPDX-License-Identifier: Apache-2.0
#include "protocol/EventTexts.h"

namespace tonewerk {

// A session's room may use the protocol's.
std::string permittedUse() { return TWReportingUtilityTypeString(kTypeStart); }

}  // namespace tonewerk
