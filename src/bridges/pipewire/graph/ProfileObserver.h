// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "bridges/pipewire/graph/ProfiledCycle.h"

namespace tonewerk {

// Hears what the graph's profiler tells.
class ProfileObserver {
 public:
  virtual ~ProfileObserver() = default;
  // Of any drivers, each driver's cycles in their order; some time after they were.
  virtual void profiled(const std::vector<ProfiledCycle>& cycles) = 0;
};

}  // namespace tonewerk
