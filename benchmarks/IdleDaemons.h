// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <string>
#include <vector>

namespace tonewerk {

struct IdleCost {
  double wakeUpsAnHour = 0.0;
  double mebibytes = 0.0;  // resident memory
};

// Runs the daemons side by side without clients for `duration`, and returns the cost of each.
std::vector<IdleCost> measureIdle(const std::vector<std::string>& daemons, std::chrono::seconds duration);

}  // namespace tonewerk
