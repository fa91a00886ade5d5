// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string_view>

#include "bridges/pipewire/drivers/Histogram.h"
#include "bridges/pipewire/drivers/XrunWatch.h"
#include "bridges/pipewire/graph/ProfiledCycle.h"
#include "values/ValueArray.h"

namespace tonewerk {

// Adds up a driver's cycles since the bridge began to watch it.
class CycleStatistics {
 public:
  void count(const ProfiledCycle& cycle, const CycleXruns& xruns);

  // Appends one channel for each statistic, under `group` and, unless it is empty, `subgroup`.
  void describe(ValueArray& channels, std::string_view group, std::string_view subgroup) const;

 private:
  std::int64_t cycles_ = 0;
  std::int64_t incompleteCycles_ = 0;
  std::int64_t xruns_ = 0;
  Histogram periods_{0, 1'000, 2'000, 5'000, 10'000, 20'000, 30'000, 50'000, 100'000, 1'000'000};  // us
  Histogram processing_{0, 10, 20, 30, 40, 50, 60, 70, 80, 90, 100, 125, 150, 200, 1'000};  // % of the period
};

}  // namespace tonewerk
