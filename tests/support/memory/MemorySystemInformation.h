// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/SystemInformation.h"
#include "values/Mutex.h"

namespace tonewerk {

// A device in the state that the test sets; at first cool, on mains power and idle. Any thread.
class MemorySystemInformation final : public SystemInformation {
 public:
  int thermalLevel() const override { return get(&State::thermalLevel); }
  bool isLowPowerModeEnabled() const override { return get(&State::lowPowerMode); }
  std::array<double, 3> loadAverages() const override { return get(&State::loadAverages); }
  double uptimeSeconds() const override { return get(&State::uptimeSeconds); }

  void setThermalLevel(int level) { set(&State::thermalLevel, level); }
  void setLowPowerMode(bool enabled) { set(&State::lowPowerMode, enabled); }
  void setLoadAverages(std::array<double, 3> averages) { set(&State::loadAverages, averages); }
  void setUptime(double seconds) { set(&State::uptimeSeconds, seconds); }

 private:
  struct State {
    int thermalLevel = 0;
    bool lowPowerMode = false;
    std::array<double, 3> loadAverages{};
    double uptimeSeconds = 0.0;
  };

  template <typename T>
  T get(T State::*field) const {
    const MutexLock lock(mutex_);
    return state_.*field;
  }
  template <typename T>
  void set(T State::*field, T value) {
    const MutexLock lock(mutex_);
    state_.*field = value;
  }

  mutable Mutex mutex_;
  State state_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
