// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// Gives each state its share of all states' residencies; 0 where these sum to 0.
void computeDutyCycles(std::vector<ChanmeterState>& states);

}  // namespace tonewerk
