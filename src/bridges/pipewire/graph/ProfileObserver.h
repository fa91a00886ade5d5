// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "bridges/pipewire/graph/ProfiledCycle.h"

namespace tonewerk {

// Gets the reports of the graph's profiler.
class ProfileObserver {
 public:
  virtual ~ProfileObserver() = default;
  // Cycles of any drivers, in order for each driver. They arrive about a second after they took place.
  virtual void profiled(const std::vector<ProfiledCycle>& cycles) = 0;
};

}  // namespace tonewerk
