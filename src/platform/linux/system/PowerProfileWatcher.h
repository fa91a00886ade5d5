// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>
#include <thread>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Follows the power profile that the user chose, as the desktop's power-profiles service tells it on the
// system's D-Bus (org.freedesktop.UPower.PowerProfiles, and its older name net.hadess.PowerProfiles).
//
// Asks once and then listens, on a thread of its own, so that nobody ever waits for the bus. The service is
// not started for it; one that starts later is noticed. Without a bus it is looked for again every minute.
class PowerProfileWatcher {
 public:
  // Told on the watcher's thread whenever it changed whether the profile is "power-saver"; it starts as
  // false.
  using ChangeHandler = std::function<void(bool isPowerSaver)>;

  // `busAddress` is a D-Bus address; empty for the system's bus.
  explicit PowerProfileWatcher(ChangeHandler handler, std::string busAddress = {});
  PowerProfileWatcher(const PowerProfileWatcher&) = delete;
  PowerProfileWatcher& operator=(const PowerProfileWatcher&) = delete;
  // The handler is not running any more when it returns.
  ~PowerProfileWatcher();

 private:
  const FileDescriptor stop_;  // an eventfd that becomes readable at the end
  std::thread thread_;
};

}  // namespace tonewerk
