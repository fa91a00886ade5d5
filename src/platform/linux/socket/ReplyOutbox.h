// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "platform/RequestHandler.h"
#include "platform/linux/threads/BatchScope.h"
#include "platform/linux/threads/IoWaker.h"
#include "values/Mutex.h"

namespace tonewerk {

// A connection's replies on their way out. Outlives its connection for as long as somebody can still reply;
// replies then go nowhere.
//
//   reply() ... reply() -> unsent -> the socket     sent by whoever replied, at the end of its batch of work
//                             |                     when the socket is full: by the I/O thread, when it is
//                             not
//                             +-> the I/O thread is woken when there is something for it to do
//
// The thread that replies sends, too, because waking another to do it would cost more than the sending.
class ReplyOutbox final : public ReplySink,
                          public BatchScope::Deferred,
                          public std::enable_shared_from_this<ReplyOutbox> {
 public:
  enum class State {
    kOpen,
    kFull,     // the socket takes no more for now; only the I/O thread tries again
    kRefused,  // the peer takes nothing any more
  };

  // `socket` is open until close(). The waker wakes the I/O thread for `connection`.
  ReplyOutbox(int socket, std::shared_ptr<IoWaker> waker, std::uint64_t connection)
      : socket_(socket), waker_(std::move(waker)), connection_(connection) {}

  // Any thread.
  void reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
             const std::optional<Value>& result) override;
  void endOfBatch() override;

  // The I/O thread: goes on with what the socket did not take.
  [[nodiscard]] State flush();
  // Any thread.
  std::size_t unsentBytes() const { return unsentBytes_.load(std::memory_order_relaxed); }
  // The I/O thread: the socket is about to be closed. Sends what it still takes.
  void close();

 private:
  void sendUnsent() REQUIRES(mutex_);

  const int socket_;
  const std::shared_ptr<IoWaker> waker_;
  const std::uint64_t connection_;
  std::atomic<std::size_t> unsentBytes_{0};
  Mutex mutex_;
  std::string unsent_ GUARDED_BY(mutex_);
  std::size_t sent_ GUARDED_BY(mutex_) = 0;  // of unsent_
  State state_ GUARDED_BY(mutex_) = State::kOpen;
  bool isClosed_ GUARDED_BY(mutex_) = false;
  bool isPutOff_ GUARDED_BY(mutex_) = false;  // the sending, to the end of a batch
};

}  // namespace tonewerk
