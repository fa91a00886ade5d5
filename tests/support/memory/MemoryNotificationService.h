// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "platform/NotificationHandlers.h"
#include "platform/NotificationService.h"
#include "values/Mutex.h"

namespace tonewerk {

// Provides named notifications that live as long as the test. Any thread.
//
//   notifications.post("com.orvane.x", 1);   // queues the handlers
//   queues.runAll();                         // runs them
//   notifications.makeUnreadable("com.orvane.x");
//   notifications.failRegistrations(NotificationService::kStatusFailed);
class MemoryNotificationService final : public NotificationService {
 public:
  [[nodiscard]] Registration registerHandler(std::string_view name, SerialQueue& queue,
                                             std::function<void(Token)> handler) override;
  [[nodiscard]] std::optional<std::uint64_t> state(Token token) const override;
  void cancel(Token token) override;
  [[nodiscard]] std::error_code post(std::string_view name) override;

  // Posts `name` with a new state, as another process would.
  [[nodiscard]] std::error_code post(std::string_view name, std::uint64_t state);
  // From now on the state of `name` cannot be read, until somebody posts one.
  void makeUnreadable(std::string_view name);
  // From now on registrations fail with `status`; kStatusOk makes them succeed again.
  void failRegistrations(std::uint32_t status);
  // From now on posts fail with `error`; std::errc() makes them succeed again.
  void failPosts(std::errc error);

  // Returns the names that are registered now, in the order of their registrations.
  std::vector<std::string> registered() const;

 private:
  NotificationHandlers handlers_;
  mutable Mutex mutex_;
  std::map<std::string, std::uint64_t, std::less<>> states_ GUARDED_BY(mutex_);
  std::set<std::string, std::less<>> unreadable_ GUARDED_BY(mutex_);
  std::map<Token, std::string> registered_ GUARDED_BY(mutex_);
  std::uint32_t failure_ GUARDED_BY(mutex_) = kStatusOk;
  std::errc postFailure_ GUARDED_BY(mutex_){};
};

}  // namespace tonewerk
