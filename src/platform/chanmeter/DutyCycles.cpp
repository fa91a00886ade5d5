// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/DutyCycles.h"

namespace tonewerk {

void computeDutyCycles(std::vector<ChanmeterState>& states) {
  double sum = 0;  // a double, because the sum may exceed 64 bits
  for (const ChanmeterState& state : states) sum += static_cast<double>(state.residency);
  for (ChanmeterState& state : states) {
    state.dutyCycle = sum > 0 ? static_cast<double>(state.residency) / sum : 0.0;
  }
}

}  // namespace tonewerk
