// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "platform/RequestHandler.h"
#include "platform/linux/threads/BatchScope.h"
#include "platform/linux/threads/IoWaker.h"
#include "values/Mutex.h"

namespace tonewerk {

// Sends a connection's replies. Lives on after its connection as long as a reply may still come; such replies
// are dropped.
//
//   reply() ... reply() -> unsent -> the socket     sent by the thread that replied, at the end of its batch;
//                             |                     after a full socket: by the listener's thread, later
//                             |
//                             +-> the listener's thread is woken when it has something to do
//
// The thread that replies also sends, because waking another thread would cost more than sending.
class ReplyOutbox final : public ReplySink,
                          public BatchScope::Deferred,
                          public std::enable_shared_from_this<ReplyOutbox> {
 public:
  enum class State {
    kOpen,
    kFull,     // the socket takes no more for now; only the listener's thread sends again
    kRefused,  // the peer does not take any more bytes
  };

  // While it lives, the replies of its thread are gathered without a lock. They are sent at the end of the
  // thread's batch, as always. A thread gathers for one outbox at a time, and an outbox on one thread.
  class Gathering {
   public:
    explicit Gathering(ReplyOutbox& outbox);
    Gathering(const Gathering&) = delete;
    Gathering& operator=(const Gathering&) = delete;
    ~Gathering();
  };

  // `socket` stays open, and `beforeSending` lives, until close(). The waker wakes the listener's thread for
  // `connection`. `beforeSending` is called on any thread before bytes are sent, unless it is empty: it does
  // what must have happened before a client reads an answer, and uses no outbox.
  ReplyOutbox(int socket, std::shared_ptr<IoWaker> waker, std::uint64_t connection,
              const std::function<void()>& beforeSending)
      : socket_(socket), waker_(std::move(waker)), connection_(connection), beforeSending_(beforeSending) {}

  // Any thread.
  void reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
             const std::optional<Value>& result) override;
  void endOfBatch() override;

  // The listener's thread. Sends what the socket did not take before.
  [[nodiscard]] State flush();
  // Any thread.
  std::size_t unsentBytes() const { return unsentBytes_.load(std::memory_order_relaxed); }
  // The listener's thread, before it closes the socket. Sends as much as the socket still takes.
  void close();

 private:
  // Moves what the calling thread has gathered to what is unsent.
  void takeGathered() REQUIRES(mutex_);
  void sendUnsent() REQUIRES(mutex_);

  const int socket_;
  const std::shared_ptr<IoWaker> waker_;
  const std::uint64_t connection_;
  const std::function<void()>& beforeSending_;
  std::atomic<std::size_t> unsentBytes_{0};
  std::string gathered_;  // used by the thread that gathers
  Mutex mutex_;
  std::string unsent_ GUARDED_BY(mutex_);
  std::size_t sent_ GUARDED_BY(mutex_) = 0;  // bytes of unsent_
  State state_ GUARDED_BY(mutex_) = State::kOpen;
  bool isClosed_ GUARDED_BY(mutex_) = false;
  bool isSendDeferred_ GUARDED_BY(mutex_) = false;  // to the end of a batch
};

}  // namespace tonewerk
