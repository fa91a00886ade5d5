// SPDX-License-Identifier: Apache-2.0
#include "platform/NotificationHandlers.h"

#include <algorithm>
#include <atomic>
#include <limits>
#include <utility>

#include "platform/SerialQueue.h"
#include "values/ControlCharacters.h"

namespace tonewerk {

struct NotificationHandlers::Registration {
  Registration(std::string_view n, SerialQueue& q, Handler h) : name(n), queue(q), handler(std::move(h)) {}

  const std::string name;
  SerialQueue& queue;
  const Handler handler;
  std::atomic<bool> isQueued = false;
  std::atomic<bool> isCancelled = false;
};

bool NotificationHandlers::isName(std::string_view name) {
  return !name.empty() && name.size() <= kMaxNameBytes && name != "." && name != ".." &&
         name.find('/') == std::string_view::npos &&
         std::none_of(name.begin(), name.end(), isControlCharacter);
}

NotificationHandlers::~NotificationHandlers() {
  const MutexLock lock(mutex_);
  for (const auto& [token, registration] : registrations_) registration->isCancelled = true;
}

NotificationHandlers::Token NotificationHandlers::add(std::string_view name, SerialQueue& queue,
                                                      Handler handler) {
  auto registration = std::make_shared<Registration>(name, queue, std::move(handler));
  const MutexLock lock(mutex_);
  do {
    lastToken_ = lastToken_ == std::numeric_limits<Token>::max() ? 1 : lastToken_ + 1;
  } while (registrations_.count(lastToken_) != 0);
  registrations_.emplace(lastToken_, std::move(registration));
  return lastToken_;
}

std::optional<std::string> NotificationHandlers::nameOf(Token token) const {
  const MutexLock lock(mutex_);
  const auto found = registrations_.find(token);
  return found == registrations_.end() ? std::nullopt : std::optional(found->second->name);
}

void NotificationHandlers::remove(Token token) {
  std::shared_ptr<Registration>
      removed;  // destroyed after the lock is released: its handler may own something that uses this object
  const MutexLock lock(mutex_);
  const auto found = registrations_.find(token);
  if (found == registrations_.end()) return;
  removed = std::move(found->second);
  removed->isCancelled = true;
  registrations_.erase(found);
}

void NotificationHandlers::tell(std::string_view name) {
  const MutexLock lock(mutex_);
  for (const auto& [token, registration] : registrations_) {
    if (registration->name == name) queue(token, registration);
  }
}

void NotificationHandlers::tellAll() {
  const MutexLock lock(mutex_);
  for (const auto& [token, registration] : registrations_) queue(token, registration);
}

// The lock is held, so that no handler reaches a queue after remove() has returned.
void NotificationHandlers::queue(Token token, const std::shared_ptr<Registration>& registration) {
  if (registration->isQueued.exchange(true)) return;
  registration->queue.async([token, registration] {
    // Cleared first: a post during the handler, which may already have read the state, queues the handler
    // again.
    registration->isQueued = false;
    if (!registration->isCancelled) registration->handler(token);
  });
}

}  // namespace tonewerk
