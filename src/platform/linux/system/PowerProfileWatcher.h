// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>
#include <thread>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Follows the power profile that the user has chosen. It gets the profile from the desktop's power-profiles
// service on the system's D-Bus (org.freedesktop.UPower.PowerProfiles, or its older name
// net.hadess.PowerProfiles).
//
// It runs on a thread of its own, so that no caller waits for the bus. It asks for the profile and then
// listens for signals. It does not start the service, but notices when it starts. Without a bus, it tries
// again every minute. When the system has no descriptor for its end, it does not run.
class PowerProfileWatcher {
 public:
  // Called on the watcher's thread when the profile becomes "power-saver" or stops being it. The initial
  // state is false.
  using ChangeHandler = std::function<void(bool isPowerSaver)>;

  // `busAddress` is a D-Bus address; empty stands for the system's bus.
  explicit PowerProfileWatcher(ChangeHandler handler, std::string busAddress = {});
  PowerProfileWatcher(const PowerProfileWatcher&) = delete;
  PowerProfileWatcher& operator=(const PowerProfileWatcher&) = delete;
  // When it returns, the handler is not running any more.
  ~PowerProfileWatcher();

 private:
  const FileDescriptor stop_;  // an eventfd; the destructor makes it readable
  std::thread thread_;
};

}  // namespace tonewerk
