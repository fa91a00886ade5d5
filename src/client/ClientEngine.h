// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "client/Backoff.h"
#include "client/ClientOutbox.h"
#include "client/ClientSocket.h"
#include "client/ClientThread.h"
#include "client/DecodedAnswer.h"
#include "platform/linux/descriptors/WakeEvent.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "tonewerk/reporting.h"

namespace tonewerk {

// What a client is made with.
struct ClientSettings {
  static constexpr std::size_t kDefaultQueueBytes = std::size_t{256} * 1024;

  std::vector<std::string> socketPaths;  // in the order in which to try them
  std::size_t queueBytes = kDefaultQueueBytes;
  bool isOnce = false;
  void (*stateChanged)(void* context, twr_state state) = nullptr;
  void* context = nullptr;

  // Between attempts to connect; see Backoff.
  std::chrono::milliseconds firstDelay{250};
  std::chrono::milliseconds mostDelay{30'000};
  // A connection that the daemon kept for so long was a good one, even if it never had to answer.
  std::chrono::milliseconds settledTime{5'000};
  // Between looks at the senders' rings: while messages come, and after a while without any.
  std::chrono::milliseconds busyPoll{10};
  std::chrono::milliseconds idlePoll{100};
};

// A client: its outbox, its connection, and the thread that carries the one through the other.
//
//   idle --- first request ---> connecting --- the daemon accepts ---> connected
//   connecting --- nobody there ---> waiting        connected --- the connection breaks ---> waiting
//   waiting --- after the back-off ---> connecting  with `isOnce`, instead of waiting: ended
//
// One mutex guards everything. The thread holds it but while it waits, while it is in a system call about the
// socket, and while it calls a caller's function; so whoever holds it (a fork) finds everything whole.
class ClientEngine {
 public:
  explicit ClientEngine(ClientSettings settings);
  ClientEngine(const ClientEngine&) = delete;
  ClientEngine& operator=(const ClientEngine&) = delete;
  // After end(), or in a child process.
  ~ClientEngine() = default;

  // Calls `ask` with the outbox and makes sure that what it put there goes out. TWR_FORKED, TWR_NOT_CONNECTED
  // when the client has ended, TWR_NO_MEMORY, or what `ask` returns.
  template <class Ask>
  twr_status request(Ask ask) {
    if (hasForked_.load(std::memory_order_relaxed)) return TWR_FORKED;
    const std::unique_lock lock(mutex_);
    if (state_ == TWR_STATE_ENDED) return TWR_NOT_CONNECTED;
    return ensureRunning() ? ask(outbox_) : TWR_NO_MEMORY;
  }
  // The same for what must be done whether the client has ended or not, or has forked away.
  template <class Do>
  auto withOutbox(Do function) {
    const std::unique_lock lock(mutex_);
    auto result = function(outbox_);
    if (state_ != TWR_STATE_ENDED) ensureRunning();
    return result;
  }

  // Not inside a callback, which would wait for itself: TWR_WOULD_WAIT.
  twr_status connect(std::chrono::milliseconds timeout);
  twr_status flush(std::chrono::milliseconds timeout);
  // Sends what is queued, within the time, and ends the thread. Nothing is called after it has returned.
  void end(std::chrono::milliseconds timeout);
  // The same inside one of this client's callbacks, where it cannot be waited for: answers still come, states
  // do not, and the registry buries the client later. False, with nothing done, anywhere else.
  bool endByItself(std::chrono::milliseconds timeout);

  twr_client_info info() const;
  const std::atomic<bool>& hasForked() const { return hasForked_; }

  // ---- for the registry ----

  // Under the registry's mutex. The owner is what this is a part of, and holds itself until it is removed.
  ClientEngine* nextClient = nullptr;
  std::shared_ptr<void> owner;
  void beforeFork() { mutex_.lock(); }
  void afterFork() { mutex_.unlock(); }
  // In the child, between the two.
  void becomeForked();
  // One that may be joined from here.
  bool hasThread() const;
  // Ended by itself, and nothing is left to be done but to join its thread.
  bool isReapable() const;
  // Ends the thread at once; nobody is told.
  void abandon();

 private:
  using Lock = std::unique_lock<std::mutex>;
  using Clock = std::chrono::steady_clock;

  // Under the mutex, callers'. False when there can be no thread.
  bool ensureRunning();
  void wake();
  twr_status await(Lock& lock, const std::shared_ptr<Waiter>& waiter, std::chrono::milliseconds timeout);
  void beginToEnd(std::chrono::milliseconds timeout);
  void joinThread(Lock& lock);

  // The thread's, under the mutex but where they say so by taking the lock.
  static void runThread(void* self);
  void run();
  void work(Lock& lock);
  bool isDone() const;
  void finish(Lock& lock);
  void attempt(Lock& lock);
  int connectTo(Lock& lock, const std::string& path);
  void connected(const std::string& path);
  void attemptFailed(int error);
  void transmit(Lock& lock);
  void receive(Lock& lock);
  bool decode(std::string_view bytes);
  void connectionLost(int error);
  // Why answers that are still to come will not.
  twr_status whyUnanswered() const { return hasEndedSending_ ? TWR_DESTROYED : TWR_NOT_CONNECTED; }
  void waitBeforeNextAttempt(int error);
  // False when there was nothing to call.
  bool deliver(Lock& lock);
  void sleep(Lock& lock);
  int pollTimeout();
  void setState(twr_state state);

  const ClientSettings settings_;
  std::atomic<bool> hasForked_{false};

  mutable std::mutex mutex_;  // guards all that follows
  Deliveries deliveries_;
  ClientOutbox outbox_;
  ClientThread thread_;
  WakeEvent event_;
  bool isSleeping_ = false;
  bool isWoken_ = false;

  twr_state state_ = TWR_STATE_IDLE;
  ClientSocket socket_;
  RpcStrings texts_{StringInterner(64, 64), StringInterner(64, 32)};
  std::optional<RpcFrameReader> reader_;
  bool isReadable_ = false;
  bool awaitsRoom_ = false;  // the kernel takes no more for now
  bool hasEndedSending_ = false;
  bool hasAnswered_ = false;
  Clock::time_point connectedAt_;

  Backoff backoff_;
  Clock::time_point nextAttempt_;
  std::vector<std::shared_ptr<Waiter>> connectWaiters_;

  bool isEnding_ = false;
  bool isAbandoned_ = false;
  bool isDetached_ = false;
  bool hasFinished_ = false;
  bool isBeingJoined_ = false;
  std::condition_variable joined_;
  bool isHopeless_ = false;  // ending, and nobody is there
  Clock::time_point endBy_;

  std::uint64_t seenRingMessages_ = 0;
  std::chrono::milliseconds ringPoll_;

  int lastError_ = 0;
  std::string socketPath_;
  std::uint64_t connections_ = 0;
};

}  // namespace tonewerk
