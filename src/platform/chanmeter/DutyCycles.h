// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// Sets each state's duty cycle to its share of the sum of all residencies; 0 when that sum is 0.
void computeDutyCycles(std::vector<ChanmeterState>& states);

}  // namespace tonewerk
