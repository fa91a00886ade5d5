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

// Who is registered with a notification service, for implementations of it: they know when a name was posted,
// this tells its handlers.
//
// A handler that is already queued is not queued again, so a name that is posted without end costs a queue
// one piece of work at a time. Any thread.
class NotificationHandlers {
 public:
  using Token = NotificationService::Token;
  using Handler = std::function<void(Token)>;

  static constexpr std::size_t kMaxNameBytes = 255;
  // Whether it can name a notification, which is a file.
  static bool isName(std::string_view name);

  NotificationHandlers() = default;
  NotificationHandlers(const NotificationHandlers&) = delete;
  NotificationHandlers& operator=(const NotificationHandlers&) = delete;
  // What is still queued then does nothing.
  ~NotificationHandlers();

  // `queue` outlives the registration, or this.
  [[nodiscard]] Token add(std::string_view name, SerialQueue& queue, Handler handler);
  // None for a token that is not registered.
  [[nodiscard]] std::optional<std::string> nameOf(Token token) const;
  // See NotificationService::cancel().
  void remove(Token token);

  // Queues the handlers of a name, in the order in which they were added.
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
