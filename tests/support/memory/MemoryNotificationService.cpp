// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryNotificationService.h"

#include <utility>

namespace tonewerk {

NotificationService::Registration MemoryNotificationService::registerHandler(
    std::string_view name, SerialQueue& queue, std::function<void(Token)> handler) {
  if (!NotificationHandlers::isName(name)) return {kStatusInvalidName, kNoToken};
  const MutexLock lock(mutex_);
  if (failure_ != kStatusOk) return {failure_, kNoToken};
  const Token token = handlers_.add(name, queue, std::move(handler));
  registered_.emplace(token, name);
  return {kStatusOk, token};
}

std::optional<std::uint64_t> MemoryNotificationService::state(Token token) const {
  const MutexLock lock(mutex_);
  const auto name = registered_.find(token);
  if (name == registered_.end() || unreadable_.count(name->second) != 0) return std::nullopt;
  const auto state = states_.find(name->second);
  return state == states_.end() ? 0 : state->second;
}

void MemoryNotificationService::cancel(Token token) {
  {
    const MutexLock lock(mutex_);
    registered_.erase(token);
  }
  handlers_.remove(token);
}

std::error_code MemoryNotificationService::post(std::string_view name) {
  if (!NotificationHandlers::isName(name)) return std::make_error_code(std::errc::invalid_argument);
  {
    const MutexLock lock(mutex_);
    if (postFailure_ != std::errc()) return std::make_error_code(postFailure_);
    states_.try_emplace(std::string(name), 0);
  }
  handlers_.tell(name);
  return {};
}

std::error_code MemoryNotificationService::post(std::string_view name, std::uint64_t state) {
  if (!NotificationHandlers::isName(name)) return std::make_error_code(std::errc::invalid_argument);
  {
    const MutexLock lock(mutex_);
    states_.insert_or_assign(std::string(name), state);
    if (const auto found = unreadable_.find(name); found != unreadable_.end()) unreadable_.erase(found);
  }
  handlers_.tell(name);
  return {};
}

void MemoryNotificationService::makeUnreadable(std::string_view name) {
  const MutexLock lock(mutex_);
  unreadable_.emplace(name);
}

void MemoryNotificationService::failPosts(std::errc error) {
  const MutexLock lock(mutex_);
  postFailure_ = error;
}

void MemoryNotificationService::failRegistrations(std::uint32_t status) {
  const MutexLock lock(mutex_);
  failure_ = status;
}

std::vector<std::string> MemoryNotificationService::registered() const {
  const MutexLock lock(mutex_);
  std::vector<std::string> names;
  for (const auto& [token, name] : registered_) names.push_back(name);
  return names;
}

}  // namespace tonewerk
