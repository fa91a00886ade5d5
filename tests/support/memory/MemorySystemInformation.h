// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <mutex>

#include "platform/SystemInformation.h"

namespace tonewerk {

// A device in the state that the test gives it; at first cool, mains powered and idle. Any thread.
class MemorySystemInformation final : public SystemInformation {
 public:
  int thermalLevel() const override { return get(thermalLevel_); }
  bool isLowPowerModeEnabled() const override { return get(lowPowerMode_); }
  std::array<double, 3> loadAverages() const override { return get(loadAverages_); }
  double uptimeSeconds() const override { return get(uptimeSeconds_); }

  void setThermalLevel(int level) { set(thermalLevel_, level); }
  void setLowPowerMode(bool enabled) { set(lowPowerMode_, enabled); }
  void setLoadAverages(std::array<double, 3> averages) { set(loadAverages_, averages); }
  void setUptime(double seconds) { set(uptimeSeconds_, seconds); }

 private:
  template <typename T>
  T get(const T& field) const {
    const std::lock_guard lock(mutex_);
    return field;
  }
  template <typename T>
  void set(T& field, T value) {
    const std::lock_guard lock(mutex_);
    field = value;
  }

  mutable std::mutex mutex_;  // guards all below
  int thermalLevel_ = 0;
  bool lowPowerMode_ = false;
  std::array<double, 3> loadAverages_{};
  double uptimeSeconds_ = 0.0;
};

}  // namespace tonewerk
