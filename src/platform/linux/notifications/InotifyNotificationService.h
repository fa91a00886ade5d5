// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/Log.h"
#include "platform/NotificationHandlers.h"
#include "platform/NotificationService.h"
#include "platform/linux/notifications/DirectoryWatcher.h"
#include "platform/linux/notifications/NotificationFiles.h"
#include "platform/linux/notifications/NotificationPace.h"

namespace tonewerk {

class TimerService;

// Delivers named notifications through the files of one directory, which it watches with inotify.
//
// A name that is posted all the time is told ten times a second (NotificationPace.h).
//
// When posts may have been missed (the kernel's event queue overflowed, or the directory was replaced or
// created again), every registered handler is called as if each name had been posted. An unnecessary call
// costs one read of an unchanged state; a missing call would leave an old state in use. Removing a file is
// not a post; the state is 0 from then on.
//
// A handler may also be called for a post from just before its registration.
class InotifyNotificationService final : public NotificationService {
 public:
  // Creates the directory. If that fails, it may be created later. `timers` and `log` must outlive the
  // service.
  InotifyNotificationService(const std::string& directory, TimerService& timers, const LogCategory& log);

  // Fails with kStatusInvalidName, or with kStatusFailed if the system has no inotify instance left.
  [[nodiscard]] Registration registerHandler(std::string_view name, SerialQueue& queue,
                                             std::function<void(Token)> handler) override;
  [[nodiscard]] std::optional<std::uint64_t> state(Token token) const override;
  void cancel(Token token) override;
  [[nodiscard]] std::error_code post(std::string_view name) override;

  // Creates the directory again, with the directories above it, after they were removed.
  void makeDirectory();
  // Calls every registered handler.
  void callAllHandlers() { pace_.postAll(); }

 private:
  const NotificationFiles files_;
  NotificationHandlers handlers_;
  NotificationPace pace_;     // calls the handlers
  DirectoryWatcher watcher_;  // last: it uses the pace
};

}  // namespace tonewerk
