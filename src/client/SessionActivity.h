// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tonewerk/reporting.h"

namespace tonewerk {

// Says that the session neither plays nor records any more, if it did. For the end of a session. Any thread
// but a real-time one.
void endActivity(twr_session& session);

}  // namespace tonewerk
