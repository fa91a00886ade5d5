// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/NotificationService.h"
#include "values/Mutex.h"

namespace tonewerk {

// Holds the registrations of a notification service, for its implementations: they learn that a name was
// posted, and this runs the handlers of the name.
//
// A handler that is already queued is not queued again, so that a name that is posted all the time costs a
// queue one piece of work at a time. Any thread.
class NotificationHandlers {
 public:
  using Token = NotificationService::Token;
  using Handler = std::function<void(Token)>;

  static constexpr std::size_t kMaxNameBytes = 255;
  // Returns whether `name` is valid as the name of a notification, which is a file name.
  static bool isName(std::string_view name);

  NotificationHandlers() = default;
  NotificationHandlers(const NotificationHandlers&) = delete;
  NotificationHandlers& operator=(const NotificationHandlers&) = delete;
  // Handlers that are still queued then do nothing.
  ~NotificationHandlers();

  // `queue` outlives the registration or this object.
  [[nodiscard]] Token add(std::string_view name, SerialQueue& queue, Handler handler);
  // Returns none for a token that is not registered.
  [[nodiscard]] std::optional<std::string> nameOf(Token token) const;
  // See NotificationService::cancel().
  void remove(Token token);

  // Queues the handlers of a name, or of all names, in the order in which they were added.
  void tell(std::string_view name);
  void tellAll();

 private:
  struct Registration;
  void queue(Token token, const std::shared_ptr<Registration>& registration) REQUIRES(mutex_);

  mutable Mutex mutex_;  // held while a handler is queued, never while one runs
  Token lastToken_ GUARDED_BY(mutex_) = 0;
  std::map<Token, std::shared_ptr<Registration>> registrations_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
