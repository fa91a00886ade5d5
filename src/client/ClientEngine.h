// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
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
#include "values/Mutex.h"

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
  [[nodiscard]] twr_status request(Ask ask) {
    if (hasForked_.load(std::memory_order_relaxed)) return TWR_FORKED;
    const MutexLock lock(mutex_);
    if (state_ == TWR_STATE_ENDED) return TWR_NOT_CONNECTED;
    return ensureRunning() ? ask(outbox_) : TWR_NO_MEMORY;
  }
  // The same for what must be done whether the client has ended or not, or has forked away.
  template <class Do>
  [[nodiscard]] auto withOutbox(Do function) {
    const MutexLock lock(mutex_);
    auto result = function(outbox_);
    // Without a thread the function has done its work all the same. The next call tries to start the thread
    // again.
    if (state_ != TWR_STATE_ENDED) (void)ensureRunning();
    return result;
  }

  // Not inside a callback, which would wait for itself: TWR_WOULD_WAIT.
  [[nodiscard]] twr_status connect(std::chrono::milliseconds timeout);
  [[nodiscard]] twr_status flush(std::chrono::milliseconds timeout);
  // Sends what is queued, within the time, and ends the thread. Nothing is called after it has returned.
  void end(std::chrono::milliseconds timeout);
  // The same inside one of this client's callbacks, where it cannot be waited for: answers still come, states
  // do not, and the registry buries the client later. False, with nothing done, anywhere else.
  [[nodiscard]] bool endByItself(std::chrono::milliseconds timeout);

  twr_client_info info() const;
  const std::atomic<bool>& hasForked() const { return hasForked_; }

  // ---- for the registry ----

  // Under the registry's mutex. The owner is what this is a part of, and holds itself until it is removed.
  ClientEngine* nextClient = nullptr;
  std::shared_ptr<void> owner;
  // A fork holds the mutexes of all clients at once. The analysis cannot follow one mutex for each object in
  // a list.
  void beforeFork() NO_THREAD_SAFETY_ANALYSIS { mutex_.lock(); }
  void afterForkInParent() NO_THREAD_SAFETY_ANALYSIS { mutex_.unlock(); }
  void afterForkInChild() NO_THREAD_SAFETY_ANALYSIS;
  // One that may be joined from here.
  bool hasThread() const;
  // Ended by itself, and nothing is left to be done but to join its thread.
  bool isReapable() const;
  // Ends the thread at once; nobody is told.
  void abandon();

 private:
  using Clock = std::chrono::steady_clock;

  // Called by callers. False when there can be no thread.
  [[nodiscard]] bool ensureRunning() REQUIRES(mutex_);
  void wake() REQUIRES(mutex_);
  [[nodiscard]] twr_status await(MutexLock& lock, const std::shared_ptr<Waiter>& waiter,
                                 std::chrono::milliseconds timeout) REQUIRES(mutex_);
  void beginToEnd(std::chrono::milliseconds timeout) REQUIRES(mutex_);
  void joinThread(MutexLock& lock) REQUIRES(mutex_);

  void becomeForked() REQUIRES(mutex_);

  // Called on the thread.
  static void runThread(void* self);
  void run();
  bool isDone() const REQUIRES(mutex_);
  void connected(const std::string& path) REQUIRES(mutex_);
  void attemptFailed(int error) REQUIRES(mutex_);
  [[nodiscard]] bool decode(std::string_view bytes) REQUIRES(mutex_);
  void connectionLost(int error) REQUIRES(mutex_);
  // Why answers that are still to come will not.
  twr_status whyUnanswered() const REQUIRES(mutex_) {
    return hasEndedSending_ ? TWR_DESTROYED : TWR_NOT_CONNECTED;
  }
  void waitBeforeNextAttempt(int error) REQUIRES(mutex_);
  int pollTimeout() REQUIRES(mutex_);
  void setState(twr_state state) REQUIRES(mutex_);

  // Called on the thread. These release the mutex for a while and hold it again when they return.
  void work() REQUIRES(mutex_);
  void finish() REQUIRES(mutex_);
  void attempt() REQUIRES(mutex_);
  [[nodiscard]] int connectTo(const std::string& path) REQUIRES(mutex_);
  void transmit() REQUIRES(mutex_);
  void receive() REQUIRES(mutex_);
  // False when there was nothing to call.
  bool deliver() REQUIRES(mutex_);
  void sleep() REQUIRES(mutex_);

  const ClientSettings settings_;
  std::atomic<bool> hasForked_{false};

  mutable Mutex mutex_;
  Deliveries deliveries_ GUARDED_BY(mutex_);
  ClientOutbox outbox_ GUARDED_BY(mutex_);
  ClientThread thread_ GUARDED_BY(mutex_);
  WakeEvent event_ GUARDED_BY(mutex_);
  bool isSleeping_ GUARDED_BY(mutex_) = false;
  bool isWoken_ GUARDED_BY(mutex_) = false;

  twr_state state_ GUARDED_BY(mutex_) = TWR_STATE_IDLE;
  // Only the thread uses the socket, so it reads it without the mutex. It opens and closes it with the mutex
  // held, so that a fork finds either a whole descriptor or none.
  ClientSocket socket_;
  RpcStrings texts_ GUARDED_BY(mutex_){StringInterner(64, 64), StringInterner(64, 32)};
  std::optional<RpcFrameReader> reader_ GUARDED_BY(mutex_);
  bool isReadable_ GUARDED_BY(mutex_) = false;
  bool awaitsRoom_ GUARDED_BY(mutex_) = false;  // the kernel takes no more for now
  bool hasEndedSending_ GUARDED_BY(mutex_) = false;
  bool hasAnswered_ GUARDED_BY(mutex_) = false;
  Clock::time_point connectedAt_ GUARDED_BY(mutex_);

  Backoff backoff_ GUARDED_BY(mutex_);
  Clock::time_point nextAttempt_ GUARDED_BY(mutex_);
  std::vector<std::shared_ptr<Waiter>> connectWaiters_ GUARDED_BY(mutex_);

  bool isEnding_ GUARDED_BY(mutex_) = false;
  bool isAbandoned_ GUARDED_BY(mutex_) = false;
  bool isDetached_ GUARDED_BY(mutex_) = false;
  bool hasFinished_ GUARDED_BY(mutex_) = false;
  bool isBeingJoined_ GUARDED_BY(mutex_) = false;
  Condition joined_;
  bool isHopeless_ GUARDED_BY(mutex_) = false;  // ending, and nobody is there
  Clock::time_point endBy_ GUARDED_BY(mutex_);

  std::uint64_t seenRingMessages_ GUARDED_BY(mutex_) = 0;
  std::chrono::milliseconds ringPoll_ GUARDED_BY(mutex_);

  int lastError_ GUARDED_BY(mutex_) = 0;
  std::string socketPath_ GUARDED_BY(mutex_);
  std::uint64_t connections_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
