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

// The settings of a client.
struct ClientSettings {
  static constexpr std::size_t kDefaultQueueBytes = std::size_t{256} * 1024;

  std::vector<std::string> socketPaths;  // in the order in which to try them
  std::size_t queueBytes = kDefaultQueueBytes;
  bool isOnce = false;
  void (*stateChanged)(void* context, twr_state state) = nullptr;
  void* context = nullptr;

  // The first and the longest delay between attempts to connect; see Backoff.
  std::chrono::milliseconds firstDelay{250};
  std::chrono::milliseconds maxDelay{30'000};
  // A connection that lasted this long counts as a good one, even if the daemon answered nothing.
  std::chrono::milliseconds settledTime{5'000};
  // How often the thread reads the senders' rings: while messages arrive, and at most after a pause.
  std::chrono::milliseconds busyPoll{10};
  std::chrono::milliseconds idlePoll{100};
};

// Runs a client: owns its outbox, its connection, and the thread that sends what is in the outbox.
//
//   idle --- first request ---> connecting --- the daemon accepts ---> connected
//   connecting --- no daemon ---> waiting           connected --- the connection breaks ---> waiting
//   waiting --- after the back-off ---> connecting  with `isOnce`, instead of waiting: ended
//
// One mutex guards all members. The thread releases it only while it waits, during a system call on the
// socket, and while it calls a caller's function. A fork, which takes the mutex, therefore finds all members
// consistent.
class ClientEngine {
 public:
  explicit ClientEngine(ClientSettings settings);
  ClientEngine(const ClientEngine&) = delete;
  ClientEngine& operator=(const ClientEngine&) = delete;
  // Only after end(), or in a forked child process.
  ~ClientEngine() = default;

  // Calls `ask` with the outbox, and makes sure that the thread runs and sends what `ask` has put there.
  // Returns TWR_FORKED, TWR_NOT_CONNECTED when the client has ended, TWR_NO_MEMORY, or the result of `ask`.
  template <class Ask>
  [[nodiscard]] twr_status request(Ask ask) {
    if (hasForked_.load(std::memory_order_relaxed)) return TWR_FORKED;
    const MutexLock lock(mutex_);
    if (state_ == TWR_STATE_ENDED) return TWR_NOT_CONNECTED;
    return ensureRunning() ? ask(outbox_) : TWR_NO_MEMORY;
  }
  // The same for calls that must be made even if the client has ended or the process has forked.
  template <class Do>
  [[nodiscard]] auto withOutbox(Do function) {
    const MutexLock lock(mutex_);
    auto result = function(outbox_);
    // Without a thread the function has done its work all the same. The next call tries to start the thread
    // again.
    if (state_ != TWR_STATE_ENDED) (void)ensureRunning();
    return result;
  }

  // Return TWR_WOULD_WAIT inside a callback, which would wait for itself.
  [[nodiscard]] twr_status connect(std::chrono::milliseconds timeout);
  [[nodiscard]] twr_status flush(std::chrono::milliseconds timeout);
  // Sends what is queued, for up to `timeout`, and ends the thread. No callback runs after it has returned.
  void end(std::chrono::milliseconds timeout);
  // Does the same inside one of this client's callbacks, without waiting: answers are still delivered, states
  // are not, and the registry destroys the client later. Anywhere else it does nothing and returns false.
  [[nodiscard]] bool endByItself(std::chrono::milliseconds timeout);

  twr_client_info info() const;
  const std::atomic<bool>& hasForked() const { return hasForked_; }

  // ---- for the registry ----

  // The registry's mutex guards these two. The owner is the object that this engine is a part of. It keeps
  // itself alive through this pointer until the registry removes it, and while the client's thread runs.
  ClientEngine* nextClient = nullptr;
  std::shared_ptr<void> owner;
  // A fork holds the mutexes of all clients at once. The analysis cannot follow one mutex for each object in
  // a list.
  void beforeFork() NO_THREAD_SAFETY_ANALYSIS { mutex_.lock(); }
  void afterForkInParent() NO_THREAD_SAFETY_ANALYSIS { mutex_.unlock(); }
  void afterForkInChild() NO_THREAD_SAFETY_ANALYSIS;
  // True when there is a thread and the caller may join it.
  bool hasThread() const;
  // True after endByItself(), once the thread only has to be joined.
  bool isReapable() const;
  // Ends the thread at once. No callback runs.
  void abandon();

 private:
  using Clock = std::chrono::steady_clock;

  // These run on callers' threads. False when no thread can be started.
  [[nodiscard]] bool ensureRunning() REQUIRES(mutex_);
  void wake() REQUIRES(mutex_);
  [[nodiscard]] twr_status await(MutexLock& lock, const std::shared_ptr<Waiter>& waiter,
                                 std::chrono::milliseconds timeout) REQUIRES(mutex_);
  void beginToEnd(std::chrono::milliseconds timeout) REQUIRES(mutex_);
  void joinThread(MutexLock& lock) REQUIRES(mutex_);

  void becomeForked() REQUIRES(mutex_);

  // These run on the client's thread.
  static void runThread(void* self);
  void run();
  bool isDone() const REQUIRES(mutex_);
  void connected(const std::string& path) REQUIRES(mutex_);
  void attemptFailed(int error) REQUIRES(mutex_);
  [[nodiscard]] bool decode(std::string_view bytes) REQUIRES(mutex_);
  void connectionLost(int error) REQUIRES(mutex_);
  // The status for requests whose answers will not come any more.
  twr_status whyUnanswered() const REQUIRES(mutex_) {
    return hasEndedSending_ ? TWR_DESTROYED : TWR_NOT_CONNECTED;
  }
  void waitBeforeNextAttempt(int error) REQUIRES(mutex_);
  int pollTimeout() REQUIRES(mutex_);
  void setState(twr_state state) REQUIRES(mutex_);

  // These run on the client's thread, release the mutex for a while and hold it again when they return.
  void work() REQUIRES(mutex_);
  void finish() REQUIRES(mutex_);
  void attempt() REQUIRES(mutex_);
  [[nodiscard]] int connectTo(const std::string& path) REQUIRES(mutex_);
  void transmit() REQUIRES(mutex_);
  void receive() REQUIRES(mutex_);
  // False when there was no callback to run.
  bool deliver() REQUIRES(mutex_);
  void sleep() REQUIRES(mutex_);

  const ClientSettings settings_;
  // Real-time threads read this for each message, so it has a cache line without anything that changes.
  alignas(kCacheLineBytes) std::atomic<bool> hasForked_{false};

  alignas(kCacheLineBytes) mutable Mutex mutex_;
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
  bool awaitsRoom_ GUARDED_BY(mutex_) = false;  // the kernel's buffer is full
  bool hasEndedSending_ GUARDED_BY(mutex_) = false;
  bool hasAnswered_ GUARDED_BY(mutex_) = false;
  Clock::time_point connectedAt_ GUARDED_BY(mutex_);

  Backoff backoff_ GUARDED_BY(mutex_);
  Clock::time_point nextAttempt_ GUARDED_BY(mutex_);
  std::vector<std::shared_ptr<Waiter>> connectWaiters_ GUARDED_BY(mutex_);

  bool isEnding_ GUARDED_BY(mutex_) = false;
  bool isAbandoned_ GUARDED_BY(mutex_) = false;
  // Set in a callback, and so on the client's thread, which reads it between callbacks without the mutex.
  std::atomic<bool> isDetached_{false};
  bool hasFinished_ GUARDED_BY(mutex_) = false;
  bool isBeingJoined_ GUARDED_BY(mutex_) = false;
  Condition joined_;
  bool foundNoDaemon_ GUARDED_BY(mutex_) = false;  // the client is ending and no daemon listens
  Clock::time_point endBy_ GUARDED_BY(mutex_);

  std::uint64_t seenRingMessages_ GUARDED_BY(mutex_) = 0;
  std::chrono::milliseconds ringPoll_ GUARDED_BY(mutex_);

  int lastError_ GUARDED_BY(mutex_) = 0;
  std::string socketPath_ GUARDED_BY(mutex_);
  std::uint64_t connections_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
