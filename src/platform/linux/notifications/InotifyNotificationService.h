// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/Log.h"
#include "platform/NotificationHandlers.h"
#include "platform/NotificationService.h"
#include "platform/linux/notifications/DirectoryWatcher.h"
#include "platform/linux/notifications/NotificationFiles.h"

namespace tonewerk {

// Named notifications over the files of one directory, watched with inotify.
//
// Where posts may have been missed (the kernel's event queue overflowed, or the directory was replaced or
// came anew) every registered handler is told, as if each name had been posted: a post too many costs a look
// at an unchanged state, one too few leaves a stale one standing. A removed file is no post; its state is 0
// from then on.
//
// A post just before a registration may still be told to it.
class InotifyNotificationService final : public NotificationService {
 public:
  // Makes the directory; where that fails it may come later. `log` outlives the service.
  InotifyNotificationService(const std::string& directory, const LogCategory& log);

  // Fails with kStatusInvalidName, and with kStatusFailed where the system has no inotify left.
  [[nodiscard]] Registration registerHandler(std::string_view name, SerialQueue& queue,
                                             std::function<void(Token)> handler) override;
  [[nodiscard]] std::optional<std::uint64_t> state(Token token) const override;
  void cancel(Token token) override;
  [[nodiscard]] std::error_code post(std::string_view name) override;

  // Makes the directory again, where it went with all around it.
  void makeDirectory();
  // Every registered handler is told.
  void tellEverything() { handlers_.tellAll(); }

 private:
  const NotificationFiles files_;
  NotificationHandlers handlers_;
  DirectoryWatcher watcher_;  // last: it tells the handlers
};

}  // namespace tonewerk
