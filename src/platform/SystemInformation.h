// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>

namespace tonewerk {

// Gives the state of the device. Any thread.
class SystemInformation {
 public:
  virtual ~SystemInformation() = default;

  // Returns 0 nominal, 1 fair, 2 serious or 3 critical.
  virtual int thermalLevel() const = 0;

  virtual bool isLowPowerModeEnabled() const = 0;

  // Returns the load over 1, 5 and 15 minutes, which may be a second old; zeros when it cannot be read.
  virtual std::array<double, 3> loadAverages() const = 0;

  // Returns the seconds since the device started, including sleep.
  virtual double uptimeSeconds() const = 0;
};

}  // namespace tonewerk
