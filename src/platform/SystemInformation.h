// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>

namespace tonewerk {

// The state of the device. Any thread.
class SystemInformation {
 public:
  virtual ~SystemInformation() = default;

  // 0 nominal, 1 fair, 2 serious, 3 critical.
  virtual int thermalLevel() const = 0;

  virtual bool isLowPowerModeEnabled() const = 0;

  // Over 1, 5 and 15 minutes; zeros when they cannot be read.
  virtual std::array<double, 3> loadAverages() const = 0;

  // Seconds since the device started, sleep included.
  virtual double uptimeSeconds() const = 0;
};

}  // namespace tonewerk
