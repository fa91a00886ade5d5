// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "platform/Heartbeat.h"
#include "platform/SerialQueue.h"
#include "platform/SinkStatus.h"
#include "values/Mutex.h"

namespace tonewerk {

class LogCategory;

// Runs a sink's slow work on a serial queue, and limits how much memory the queued work holds and how long a
// sink that hangs keeps others waiting.
//
//   submit() -> room        -> queued, true
//            -> no room     -> waits while the sink makes progress; the clients, whose sockets are not read
//                              meanwhile, wait too
//            -> no progress for the hold time, or no room for the longest wait -> dropped, counted, false
//
// A sink makes progress when a piece of work ends, and whenever the work beats (Heartbeat::beatHere()). After
// a hold time without progress submit() does not wait: until a piece ends, what does not fit is dropped at
// once. The beginning and the end of this are logged, the end with the number of dropped pieces.
class SinkQueue {
 public:
  struct Limits {
    std::size_t waitingBytes = std::size_t{64} << 20;
    std::chrono::milliseconds hold{2000};
    std::chrono::milliseconds longestWait{10'000};
  };

  // `name` is that of the status, such as "jsonFiles". `log` outlives the queue.
  SinkQueue(std::unique_ptr<SerialQueue> queue, std::string name, const LogCategory& log)
      : SinkQueue(std::move(queue), std::move(name), log, Limits()) {}
  SinkQueue(std::unique_ptr<SerialQueue> queue, std::string name, const LogCategory& log,
            const Limits& limits);
  SinkQueue(const SinkQueue&) = delete;
  SinkQueue& operator=(const SinkQueue&) = delete;
  // Runs what is still queued.
  ~SinkQueue();

  // Queues `work`, which holds `bytes`. Any thread but the queue's own. A piece larger than the bound fits
  // when the queue is empty. False when the piece is dropped.
  [[nodiscard]] bool submit(std::size_t bytes, Task work);

  // Queues `work` without waiting. Any thread. For work that holds few bytes and is bounded by other means. A
  // sink that hangs in it hangs, but no report waits.
  void post(Task work);

  // Any thread. Counts a piece that ran but could not write what it should have.
  void countLost();

  // Returns when everything submitted before has run.
  void drain();
  // The same, but returns false after `timeout`.
  [[nodiscard]] bool drain(std::chrono::milliseconds timeout);

  // Any thread; never waits for the sink.
  SinkStatus status() const;

  // As in SerialQueue.
  bool isCurrent() const;
  bool ownsThisThread() const;

 private:
  using Time = std::chrono::steady_clock::time_point;

  bool hasRoomFor(std::size_t bytes) const REQUIRES(mutex_);
  // Waits for room. False when the piece is to be dropped.
  [[nodiscard]] bool waitForRoom(MutexLock& lock, std::size_t bytes) REQUIRES(mutex_);
  // Brings movedAt_ up to date.
  void lookForProgress(Time now) const REQUIRES(mutex_);
  void beginWork() REQUIRES(mutex_);
  void learnHeartbeat();
  void finished(std::size_t bytes);
  void finishedPosted();
  // The end of a piece is progress. Returns how many were dropped before it and are still to be logged.
  [[nodiscard]] std::uint64_t noteEnd() REQUIRES(mutex_);
  void logDropped(std::uint64_t dropped) const;

  const std::string name_;
  const LogCategory& log_;
  const Limits limits_;
  mutable Mutex mutex_;
  Condition roomMade_;
  std::size_t waitingBytes_ GUARDED_BY(mutex_) = 0;
  std::uint64_t waiting_ GUARDED_BY(mutex_) = 0;
  std::uint64_t posted_ GUARDED_BY(mutex_) = 0;  // by post(), and not finished
  std::uint64_t finished_ GUARDED_BY(mutex_) = 0;
  std::uint64_t dropped_ GUARDED_BY(mutex_) = 0;
  std::uint64_t unsaid_ GUARDED_BY(mutex_) = 0;  // dropped, and not logged yet
  bool isDropping_ GUARDED_BY(mutex_) = false;   // what does not fit is dropped at once
  // The sink's progress as it was last seen, and when it was seen to change. Whoever looks notes it for all
  // others.
  mutable std::uint64_t seen_ GUARDED_BY(mutex_) = 0;
  mutable Time movedAt_ GUARDED_BY(mutex_);
  std::atomic<bool> knowsHeartbeat_ = false;
  std::shared_ptr<const Heartbeat> heartbeat_ GUARDED_BY(mutex_);  // of the queue's thread, if it has one
  std::unique_ptr<SerialQueue> queue_;
};

}  // namespace tonewerk
