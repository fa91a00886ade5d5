// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>

#include "platform/accounts/WorkingFor.h"
#include "platform/linux/store/StoreBatch.h"
#include "values/Mutex.h"

namespace tonewerk {

// The bounded queue between the threads that record and the one thread that writes.
//
//   add ... add ->  queued  -> take() -> being written -> committed()
//                                             |  ^
//                                     failed()v  |  after pause()
//                                          kept by the writer
//
// Rows wait in batches, as they will be written: a batch is full when it has the rows or bytes of one
// transaction. The writer takes whole batches, and their memory is used again for later rows.
//
// Rows count against the bounds until they are committed. While writing succeeds, add() waits for room. After
// failed(), or when the writer makes no progress for the hold time, add() does not wait until the next
// committed(): rows that do not fit are dropped and counted.
class StoreQueue {
 public:
  struct Limits {
    std::size_t rows = 8192;
    std::size_t bytes = 16 << 20;
    // The writer waits this long for more rows, or until `batchRows` rows or a quarter of `bytes` wait.
    std::chrono::milliseconds gather{80};
    std::size_t batchRows = 1000;
    // The most rows of one batch, and about the most bytes: the file exceeds its bounds by one batch at most.
    std::size_t batchBytes = 512 << 10;
    // The longest time that add() waits.
    std::chrono::milliseconds hold{2000};
  };

  explicit StoreQueue(const Limits& limits) : limits_(limits) {}

  // Any thread. `row` is of any type that StoreBatch takes, and belongs to the user for whom the thread works
  // (WorkingFor). True when this row waited for the whole hold time, so that from now on rows are dropped.
  template <typename Row>
  [[nodiscard]] bool add(const Row& row) {
    const Account* const account = WorkingFor::accountIfAny();
    const StoreRowOwner owner{account == nullptr ? kNoUser : account->user()};
    if (isShared(row, owner)) return false;
    const StoreRowText text(row);  // the JSON is made without the lock
    const std::size_t bytes = StoreBatch::bytesOf(row, text);
    MutexLock lock(mutex_);
    bool hasTimedOut = false;
    if (waitForRoom(lock, bytes, hasTimedOut)) {
      batchWithRoom().add(row, text, owner);
      countAdded(bytes);
    }
    return hasTimedOut;
  }

  // Any thread. Waits until everything added before is committed. False when the first try to write that
  // begins after the call fails, or after `timeout`.
  [[nodiscard]] bool flush(std::chrono::milliseconds timeout);

  // Any thread. The next take(), or one that waits now, returns without waiting for rows, perhaps with none.
  void wakeWriter();

  // Any thread. Ends take() when the queue is empty, and pause().
  void stop();

  // The functions from here to pause() are for the writer's thread. take() replaces `batch`, whose rows are
  // committed, by the next batch. Without `wait` it returns at once, maybe with none. False when stopped and
  // empty.
  [[nodiscard]] bool take(StoreBatch& batch, bool wait);
  // A try to write the batch begins.
  void beginAttempt();
  // The batch is in the file.
  void committed();
  // The batch is not in the file. The writer keeps it.
  void failed();
  // Returns after `time`, or earlier when flush() or stop() ask for another try. False when stopped: that try
  // is the last.
  [[nodiscard]] bool pause(std::chrono::nanoseconds time);

  // Any thread. The number of rows dropped since the last call.
  [[nodiscard]] std::uint64_t takeDropped();
  // Any thread. The rows that are not committed, and those dropped since the last takeDropped(). They are
  // lost when the writer has ended.
  std::uint64_t lost() const;

 private:
  // Whether the row has become part of one that is in the queue already, and so takes no room.
  [[nodiscard]] bool isShared(const RtcMessageRow& row, const StoreRowOwner& owner);
  template <typename Row>
  [[nodiscard]] bool isShared(const Row& /*row*/, const StoreRowOwner& /*owner*/) {
    return false;
  }
  // False when the row is dropped. `hasTimedOut` is set when it waited for the whole hold time.
  bool waitForRoom(MutexLock& lock, std::size_t bytes, bool& hasTimedOut) REQUIRES(mutex_);
  // The batch for the next row.
  StoreBatch& batchWithRoom() REQUIRES(mutex_);
  void countAdded(std::size_t bytes) REQUIRES(mutex_);
  bool fits(std::size_t bytes) const REQUIRES(mutex_);
  bool isUrgent() const REQUIRES(mutex_);

  const Limits limits_;
  mutable Mutex mutex_;
  Condition work_;      // the writer waits for work
  Condition room_;      // add() waits for room
  Condition progress_;  // flush() waits for commits

  std::deque<StoreBatch> full_ GUARDED_BY(mutex_);  // the oldest rows
  StoreBatch filling_ GUARDED_BY(mutex_);           // the rows after them
  StoreBatch spare_ GUARDED_BY(mutex_);             // empty, and perhaps with memory for later rows
  std::size_t queuedRows_ GUARDED_BY(mutex_) = 0;   // in full_ and filling_
  bool leftOver_ GUARDED_BY(mutex_) = false;        // rows that did not fit into the last batch
  std::size_t queuedBytes_ GUARDED_BY(mutex_) = 0;
  std::size_t takenRows_ GUARDED_BY(mutex_) = 0;
  std::size_t takenBytes_ GUARDED_BY(mutex_) = 0;
  bool waitsForRoom_ GUARDED_BY(mutex_) = true;  // whether add() waits for room
  bool stopped_ GUARDED_BY(mutex_) = false;
  bool isWoken_ GUARDED_BY(mutex_) = false;
  std::uint64_t added_ GUARDED_BY(mutex_) = 0;
  std::uint64_t committed_ GUARDED_BY(mutex_) = 0;
  std::uint64_t dropped_ GUARDED_BY(mutex_) = 0;
  // Flushes are numbered. When a try to write fails, the flushes fail that were asked for before it began.
  std::uint64_t lastFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t attemptedFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t failedFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t openFlushes_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
