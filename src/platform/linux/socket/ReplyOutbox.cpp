// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/ReplyOutbox.h"

#include <cassert>
#include <cerrno>
#include <sys/socket.h>
#include <utility>

#include "platform/linux/messagepack/RpcWriter.h"

namespace tonewerk {
namespace {

// A larger buffer is freed once it is empty.
constexpr std::size_t kMaxKeptBytes = std::size_t{64} * 1024;
constexpr std::size_t kMaxGatheredBytes = 4096;
// With this much unsent the connection may have stopped reading requests, so it is woken when the bytes have
// been sent.
constexpr std::size_t kNotableBytes = std::size_t{64} * 1024;

thread_local ReplyOutbox* gatheringOutbox = nullptr;

}  // namespace

ReplyOutbox::Gathering::Gathering(ReplyOutbox& outbox) {
  assert(gatheringOutbox == nullptr);
  gatheringOutbox = &outbox;
}

ReplyOutbox::Gathering::~Gathering() {
  ReplyOutbox& outbox = *gatheringOutbox;
  {
    const MutexLock lock(outbox.mutex_);
    outbox.takeGathered();
  }
  gatheringOutbox = nullptr;
}

void ReplyOutbox::reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
                        const std::optional<Value>& result) {
  if (gatheringOutbox == this && (!gathered_.empty() || BatchScope::defer(shared_from_this()))) {
    RpcWriter(gathered_).response(requestIdentifier, error, result);
    return;
  }
  {
    const MutexLock lock(mutex_);
    if (isClosed_ || state_ == State::kRefused) return;
    RpcWriter(unsent_).response(requestIdentifier, error, result);
    unsentBytes_ = unsent_.size() - sent_;
    if (isSendDeferred_ || state_ == State::kFull)
      return;  // sending is already deferred, or waits for the socket
    isSendDeferred_ = true;
  }
  if (!BatchScope::defer(shared_from_this())) endOfBatch();
}

void ReplyOutbox::endOfBatch() {
  bool mustWake = false;
  {
    const MutexLock lock(mutex_);
    isSendDeferred_ = false;
    takeGathered();
    if (isClosed_ || state_ != State::kOpen) return;
    const std::size_t before = unsent_.size();
    sendUnsent();
    mustWake = state_ != State::kOpen || before >= kNotableBytes;
  }
  if (mustWake) waker_->wake(connection_);
}

ReplyOutbox::State ReplyOutbox::flush() {
  const MutexLock lock(mutex_);
  if (!isClosed_ && state_ == State::kFull) sendUnsent();
  return state_;
}

void ReplyOutbox::close() {
  const MutexLock lock(mutex_);
  if (isClosed_) return;
  takeGathered();
  if (state_ != State::kRefused) sendUnsent();
  isClosed_ = true;
  unsent_ = {};
  sent_ = 0;
}

void ReplyOutbox::takeGathered() {
  if (gatheringOutbox != this) return;
  if (!isClosed_ && state_ != State::kRefused) {
    unsent_ += gathered_;
    unsentBytes_ = unsent_.size() - sent_;
  }
  gathered_.clear();
  if (gathered_.capacity() > kMaxGatheredBytes) gathered_ = {};
}

void ReplyOutbox::sendUnsent() {
  state_ = State::kOpen;
  if (beforeSending_ && sent_ < unsent_.size()) beforeSending_();
  while (sent_ < unsent_.size() && state_ == State::kOpen) {
    const ssize_t count =
        ::send(socket_, unsent_.data() + sent_, unsent_.size() - sent_, MSG_DONTWAIT | MSG_NOSIGNAL);
    if (count >= 0) {
      sent_ += static_cast<std::size_t>(count);
    } else if (errno != EINTR) {
      state_ = errno == EAGAIN ? State::kFull : State::kRefused;
    }
  }
  if (state_ != State::kFull) {
    sent_ = 0;
    unsent_.clear();
    if (unsent_.capacity() > kMaxKeptBytes) unsent_ = {};
  }
  unsentBytes_ = unsent_.size() - sent_;
}

}  // namespace tonewerk
