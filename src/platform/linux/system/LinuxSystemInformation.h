// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <atomic>
#include <chrono>
#include <optional>
#include <string>

#include "platform/Clock.h"
#include "platform/SystemInformation.h"
#include "platform/linux/system/PowerProfileWatcher.h"
#include "values/Mutex.h"

namespace tonewerk {

// Reads the device's state from /sys, /proc and the power-profiles service.
//
// No call waits for another process: PowerProfileWatcher follows the power profile on its own thread, and
// power-saver mode counts as off until the first answer. /sys and the load are read at most once a second.
// Any thread.
class LinuxSystemInformation final : public SystemInformation {
 public:
  // The maximum age of values from /sys and of the load averages. Many sessions often stop at the same time,
  // and reading a sensor can take milliseconds. The kernel computes new load averages every five seconds.
  static constexpr std::chrono::seconds kMaxAge{1};

  // `clock` must outlive this object. Tests pass another `sysDirectory` and `busAddress`; an empty address
  // stands for the system's bus.
  explicit LinuxSystemInformation(const Clock& clock, std::string sysDirectory = "/sys",
                                  std::string busAddress = {});

  // See thermalLevelOf().
  int thermalLevel() const override;

  // True if the power-profiles service reports "power-saver", or the firmware's platform profile is
  // "low-power" ("quiet" on firmware without a low-power profile).
  bool isLowPowerModeEnabled() const override;

  std::array<double, 3> loadAverages() const override;
  double uptimeSeconds() const override;

 private:
  struct Reading {
    std::chrono::nanoseconds at{0};
    int thermalLevel = 0;
    bool isPlatformProfileLow = false;
    std::array<double, 3> loadAverages{};
  };
  Reading reading() const;

  const Clock& clock_;
  const std::string sysDirectory_;
  mutable Mutex mutex_;
  mutable std::optional<Reading> reading_ GUARDED_BY(mutex_);
  std::atomic<bool> isPowerSaver_{false};
  PowerProfileWatcher watcher_;  // last: it writes isPowerSaver_
};

}  // namespace tonewerk
