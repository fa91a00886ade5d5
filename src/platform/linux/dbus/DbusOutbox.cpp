// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/DbusOutbox.h"

#include <utility>

namespace tonewerk {
namespace {

std::size_t bytesOf(const DbusOutcome& outcome) {
  return sizeof(outcome) + (outcome.result ? outcome.result->bytes() : 0) +
         (outcome.error ? outcome.error->domain.size() + outcome.error->message.size() : 0);
}

}  // namespace

void DbusOutbox::add(DbusOutcome outcome) {
  {
    const MutexLock lock(mutex_);
    if (isClosed_) return;
    unsentBytes_ += bytesOf(outcome);
    unsent_.push_back(std::move(outcome));
    if (isWakeDeferred_) return;
    isWakeDeferred_ = true;
  }
  if (!BatchScope::defer(shared_from_this())) endOfBatch();
}

void DbusOutbox::endOfBatch() {
  {
    const MutexLock lock(mutex_);
    isWakeDeferred_ = false;
    if (isClosed_) return;
  }
  waker_->wake(client_);
}

std::optional<DbusOutcome> DbusOutbox::next() {
  const MutexLock lock(mutex_);
  if (unsent_.empty()) return std::nullopt;
  DbusOutcome outcome = std::move(unsent_.front());
  unsent_.pop_front();
  unsentBytes_ -= bytesOf(outcome);
  return outcome;
}

void DbusOutbox::close() {
  const MutexLock lock(mutex_);
  isClosed_ = true;
  unsent_.clear();
  unsentBytes_ = 0;
}

DbusReply::~DbusReply() {
  if (!isAnswered_) outbox_->add({call_, false, std::nullopt, std::nullopt});
}

void DbusReply::reply(std::uint32_t call, const std::optional<ReplyError>& error,
                      const std::optional<Value>& result) {
  if (!isAnswered_.exchange(true)) outbox_->add({call, true, error, result});
}

}  // namespace tonewerk
