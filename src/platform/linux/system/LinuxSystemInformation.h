// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <optional>
#include <string>

#include "platform/Clock.h"
#include "platform/SystemInformation.h"
#include "platform/linux/system/PowerProfileWatcher.h"
#include "values/Mutex.h"

namespace tonewerk {

// The device's state out of /sys, /proc and the power-profiles service.
//
// No caller waits for another process: the power profile is followed on a thread (see PowerProfileWatcher)
// and false until its first answer; what /sys says is read at most once a second.
class LinuxSystemInformation final : public SystemInformation {
 public:
  // How old what was read from /sys may be. Sessions often stop together, and reading a sensor can take
  // milliseconds.
  static constexpr std::chrono::seconds kMaxAge{1};

  // `clock` outlives this. `sysDirectory` and `busAddress` (empty for the system's bus) are where to look,
  // for tests.
  explicit LinuxSystemInformation(const Clock& clock, std::string sysDirectory = "/sys",
                                  std::string busAddress = {});

  // See thermalLevelOf().
  int thermalLevel() const override;

  // On when the power-profiles service says "power-saver", or the firmware's platform profile is "low-power"
  // (on firmware that has no such profile: "quiet").
  bool isLowPowerModeEnabled() const override;

  std::array<double, 3> loadAverages() const override;
  double uptimeSeconds() const override;

 private:
  struct Reading {
    std::chrono::nanoseconds at{0};
    int thermalLevel = 0;
    bool isPlatformProfileLow = false;
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
